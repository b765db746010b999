// A process reads the environment once, so each answer needs a process of its own. Every death test here is a
// new process that has not read it.

#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <latch>
#include <limits>
#include <string>
#include <thread>
#include <vector>

#include "tests/support/TestLoggers.h"

namespace {

using rt::Ref;

class LUMDefaultMinimumLogLevelFilterDeathTest : public testing::Test {
 protected:
  LUMDefaultMinimumLogLevelFilterDeathTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  static void setMode(const char* mode) {
    if (mode != nullptr) {
      setenv("OS_ACTIVITY_MODE", mode, 1);
    } else {
      unsetenv("OS_ACTIVITY_MODE");
    }
  }

  // Returns the lowest level that passes, if all levels above it pass too. Otherwise returns which levels
  // pass.
  static std::string threshold() {
    const Ref<LUMDefaultMinimumLogLevelFilter> filter = LUMDefaultMinimumLogLevelFilter::init();
    std::string passed;
    for (LUMLogLevel level = 0; level < 7; ++level) {
      passed += filter->allowLogMessage(*messageWith(level)) ? 'y' : 'n';
    }
    passed += filter->allowLogMessage(*messageWith(std::numeric_limits<std::uint64_t>::max())) ? 'y' : 'n';
    const std::size_t lowest = passed.find('y');
    return passed.find('n', lowest) == std::string::npos ? std::to_string(lowest) : passed;
  }

  // Prints the threshold of this process, which must not have read another mode before, and exits.
  [[noreturn]] static void tellThreshold(const char* mode) {
    setMode(mode);
    std::fprintf(stderr, "threshold %s.\n", threshold().c_str());
    std::exit(0);
  }
};

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, LetsDebugPassIfTheModeIsDebug) {
  EXPECT_EXIT(tellThreshold("debug"), testing::ExitedWithCode(0), "threshold 1\\.");
}

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, LetsInfoPassIfTheModeIsInfo) {
  EXPECT_EXIT(tellThreshold("info"), testing::ExitedWithCode(0), "threshold 2\\.");
}

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, LetsErrorPassIfTheModeIsNotSet) {
  EXPECT_EXIT(tellThreshold(nullptr), testing::ExitedWithCode(0), "threshold 3\\.");
}

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, LetsErrorPassInEveryOtherMode) {
  EXPECT_EXIT(tellThreshold(""), testing::ExitedWithCode(0), "threshold 3\\.");
  EXPECT_EXIT(tellThreshold("disable"), testing::ExitedWithCode(0), "threshold 3\\.");
  EXPECT_EXIT(tellThreshold("DEBUG"), testing::ExitedWithCode(0), "threshold 3\\.");
  EXPECT_EXIT(tellThreshold("debug "), testing::ExitedWithCode(0), "threshold 3\\.");
  EXPECT_EXIT(tellThreshold("1"), testing::ExitedWithCode(0), "threshold 3\\.");
}

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, ReadsTheEnvironmentOncePerProcess) {
  const auto body = [] {
    setMode("info");
    const std::string first = threshold();
    setMode("debug");
    std::fprintf(stderr, "threshold %s, then %s.\n", first.c_str(), threshold().c_str());
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "threshold 2, then 2\\.");
}

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, ReadsTheEnvironmentAtTheFirstMessage) {
  const auto body = [] {
    setMode("info");
    const Ref<LUMDefaultMinimumLogLevelFilter> filter = LUMDefaultMinimumLogLevelFilter::init();
    tellThreshold("debug");
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "threshold 1\\.");
}

TEST_F(LUMDefaultMinimumLogLevelFilterDeathTest, GivesTheSameAnswerOnAllThreads) {
  const auto body = [] {
    setMode("debug");
    constexpr int kThreads = 8;
    std::latch mayStart(kThreads);
    std::vector<std::string> thresholds(kThreads);
    std::vector<std::thread> threads;
    for (std::string& found : thresholds) {
      threads.emplace_back([&] {
        mayStart.arrive_and_wait();
        found = threshold();
      });
    }
    for (std::thread& thread : threads) thread.join();
    for (const std::string& found : thresholds) std::fprintf(stderr, "%s.", found.c_str());
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "1\\.1\\.1\\.1\\.1\\.1\\.1\\.1\\.");
}

}  // namespace
