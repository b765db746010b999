#include "Shared/Logging/LUMLogLimit.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <ctime>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/ClockHook.h"

namespace {

// The clock that limits use, in seconds.
constinit std::atomic<std::int64_t> time = 1000;

class LUMLogLimitTest : public testing::Test {
 protected:
  LUMLogLimitTest() {
    time = 1000;
    clockHook = [](clockid_t clock, timespec& told) {
      if (clock == CLOCK_MONOTONIC_RAW) told = {.tv_sec = time, .tv_nsec = 0};
    };
  }
  ~LUMLogLimitTest() override { clockHook = nullptr; }

  // Calls the limit `count` times.
  static std::string answers(LUMLogLimit& limit, int count) {
    std::string all;
    for (int i = 0; i < count; ++i) all += limit.allows() ? 'y' : 'n';
    return all;
  }

  // Calls the limit on eight threads, and returns how often it has allowed.
  static int allowedByThreads(LUMLogLimit& limit, int callsOfEach) {
    std::atomic<int> allowed = 0;
    std::vector<std::thread> threads;
    threads.reserve(8);
    for (int i = 0; i < 8; ++i) {
      threads.emplace_back([&] {
        for (int call = 0; call < callsOfEach; ++call) allowed += limit.allows() ? 1 : 0;
      });
    }
    for (std::thread& thread : threads) thread.join();
    return allowed;
  }
};

TEST_F(LUMLogLimitTest, OnceAllowsTheFirstTime) {
  static constinit LUMLogLimit limit = LUMLogLimit::once();
  EXPECT_EQ(answers(limit, 4), "ynnn");
}

TEST_F(LUMLogLimitTest, EveryNthAllowsTheFirstTimeAndEachNthAfterIt) {
  static constinit LUMLogLimit limit = LUMLogLimit::everyNth(3);
  EXPECT_EQ(answers(limit, 8), "ynnynnyn");
  static constinit LUMLogLimit always = LUMLogLimit::everyNth(1);
  EXPECT_EQ(answers(always, 3), "yyy");
  static constinit LUMLogLimit none = LUMLogLimit::everyNth(0);
  EXPECT_EQ(answers(none, 3), "yyy");
}

TEST_F(LUMLogLimitTest, OnePerPeriodAllowsAgainWhenThePeriodIsOver) {
  static constinit LUMLogLimit limit = LUMLogLimit::onePer(60);
  EXPECT_EQ(answers(limit, 3), "ynn");
  time += 59;
  EXPECT_EQ(answers(limit, 2), "nn");
  time += 1;
  EXPECT_EQ(answers(limit, 2), "yn");
  // The period starts with the line and not with a clock's minute.
  time += 90;
  EXPECT_EQ(answers(limit, 2), "yn");
  time += 59;
  EXPECT_EQ(answers(limit, 1), "n");
}

TEST_F(LUMLogLimitTest, OnePerPeriodTakesAnyNumberOfSeconds) {
  static constinit LUMLogLimit half = LUMLogLimit::onePer(0.5);
  EXPECT_EQ(answers(half, 2), "yn");
  time += 1;
  EXPECT_EQ(answers(half, 2), "yn");
  static constinit LUMLogLimit zero = LUMLogLimit::onePer(0);
  EXPECT_EQ(answers(zero, 2), "yy");
  static constinit LUMLogLimit negative = LUMLogLimit::onePer(-1);
  EXPECT_EQ(answers(negative, 2), "yy");
  static constinit LUMLogLimit endless = LUMLogLimit::onePer(1e300);
  EXPECT_EQ(answers(endless, 2), "yn");
  time += 1'000'000'000;
  EXPECT_EQ(answers(endless, 2), "nn");
}

TEST_F(LUMLogLimitTest, CountsWhatItHasRefused) {
  static constinit LUMLogLimit limit = LUMLogLimit::onePer(60);
  EXPECT_EQ(limit.skipped(), 0U);
  EXPECT_EQ(answers(limit, 3), "ynn");
  EXPECT_EQ(limit.skipped(), 0U);
  time += 60;
  EXPECT_TRUE(limit.allows());
  EXPECT_EQ(limit.skipped(), 2U);
  time += 60;
  EXPECT_TRUE(limit.allows());
  EXPECT_EQ(limit.skipped(), 0U);
}

TEST_F(LUMLogLimitTest, CountsExactlyOnManyThreads) {
  static constinit LUMLogLimit once = LUMLogLimit::once();
  EXPECT_EQ(allowedByThreads(once, 1000), 1);
  static constinit LUMLogLimit tenth = LUMLogLimit::everyNth(10);
  EXPECT_EQ(allowedByThreads(tenth, 1000), 800);
  static constinit LUMLogLimit minute = LUMLogLimit::onePer(60);
  EXPECT_EQ(allowedByThreads(minute, 1000), 1);
}

}  // namespace
