#include "Shared/Logging/Loggers/LUMRingLogger.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <deque>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/Loggers/LUMBoundedLogger.h"
#include "tests/support/ForkTest.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;
using testing::IsEmpty;

class LUMRingLoggerTest : public testing::Test {
 protected:
  rt::Ref<LUMRingLogger> ring(LUMRingLoggerOptions options = {}, rt::Ref<LUMLogFilter> filter = nullptr) {
    return LUMRingLogger::initWithLogger(
        rt::make<TestSyncLogger>(
            [this](const rt::Ref<LUMLogMessage>& message) { trace_.add(text(*message)); }, std::move(filter)),
        options);
  }

  static void log(const rt::Ref<LUMRingLogger>& ring, const std::string& text,
                  LUMLogLevel level = LUMLogLevelDebug) {
    ring->logWithMessage(messageWith(level, rt::String::fromUTF8Repaired(text)));
  }

  static std::vector<std::string> kept(const rt::Ref<LUMRingLogger>& ring) {
    std::vector<std::string> texts;
    for (const rt::Ref<LUMLogMessage>& message : ring->messages()) texts.push_back(text(*message));
    return texts;
  }

  Trace trace_;
};

TEST_F(LUMRingLoggerTest, KeepsTheLastMessages) {
  const auto ring = this->ring({.capacity = 3});
  EXPECT_THAT(kept(ring), IsEmpty());
  for (const char* text : {"a", "b", "c", "d"}) log(ring, text, LUMLogLevelInfo);
  EXPECT_THAT(kept(ring), ElementsAre("b", "c", "d"));
  EXPECT_THAT(trace_.events(), IsEmpty());
}

TEST_F(LUMRingLoggerTest, HandsThemOnBeforeAnError) {
  const auto ring = this->ring();
  log(ring, "a");
  log(ring, "b", LUMLogLevelInfo);
  log(ring, "error", LUMLogLevelError);
  EXPECT_THAT(trace_.events(), ElementsAre("a", "b", "error"));
  EXPECT_THAT(kept(ring), IsEmpty());
  log(ring, "fault", LUMLogLevelFault);
  EXPECT_THAT(trace_.events(), ElementsAre("fault"));
}

TEST_F(LUMRingLoggerTest, MayHandOnAtAnotherLevel) {
  const auto ring = this->ring({.handOnLevel = LUMLogLevelFault});
  log(ring, "error", LUMLogLevelError);
  EXPECT_THAT(trace_.events(), IsEmpty());
  log(ring, "fault", LUMLogLevelFault);
  EXPECT_THAT(trace_.events(), ElementsAre("error", "fault"));
}

TEST_F(LUMRingLoggerTest, HandsOnWhenAsked) {
  const auto ring = this->ring();
  log(ring, "a");
  ring->handOn();
  EXPECT_THAT(trace_.events(), ElementsAre("a"));
  ring->handOn();
  EXPECT_THAT(trace_.events(), IsEmpty());
}

TEST_F(LUMRingLoggerTest, WantsAllLevelsAndAsksTheTargetsFilterLater) {
  const auto ring = this->ring({}, LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelInfo));
  EXPECT_EQ(ring->filter(), nullptr);
  EXPECT_EQ(ring->lowestLevel(nullptr), 0U);
  log(ring, "debug");
  log(ring, "info", LUMLogLevelInfo);
  log(ring, "error", LUMLogLevelError);
  EXPECT_THAT(trace_.events(), ElementsAre("info", "error"));
}

TEST_F(LUMRingLoggerTest, HandsOnTheRestIfTheTargetThrows) {
  const auto ring =
      LUMRingLogger::initWithLogger(rt::make<TestSyncLogger>([&](const rt::Ref<LUMLogMessage>& message) {
        if (text(*message) == "a") throw std::runtime_error("no");
        trace_.add(text(*message));
      }));
  log(ring, "a");
  log(ring, "b");
  EXPECT_THROW(log(ring, "error", LUMLogLevelError), std::runtime_error);
  EXPECT_THAT(trace_.events(), ElementsAre("b", "error"));
}

TEST_F(LUMRingLoggerTest, RefusesWrongOptions) {
  EXPECT_THROW(LUMRingLogger::initWithLogger(nullptr), std::invalid_argument);
  EXPECT_THROW(this->ring({.capacity = 0}), std::invalid_argument);
  EXPECT_THROW(this->ring({.capacity = LUMRingLogger::kMaximumCapacity + 1}), std::invalid_argument);
}

TEST_F(LUMRingLoggerTest, FlushesItsTarget) {
  class Flushed final : public rt::Implements<Flushed, LUMLogOutput> {
   public:
    Flushed() : Implements(nullptr) {}
    void logWithMessage(const rt::Ref<LUMLogMessage>& /*message*/) override {}
    bool flush(std::uint32_t milliseconds) override { return milliseconds == 7; }
  };
  EXPECT_TRUE(LUMRingLogger::initWithLogger(rt::make<Flushed>())->flush(7));
  EXPECT_FALSE(LUMRingLogger::initWithLogger(rt::make<Flushed>())->flush(8));
  EXPECT_TRUE(ring()->flush(8));
}

TEST_F(LUMRingLoggerTest, DoesAsAModelDoes) {
  std::mt19937 random(17);  // NOLINT(bugprone-random-generator-seed): the same run each time
  for (std::size_t capacity = 1; capacity < 6; ++capacity) {
    const auto ring = this->ring({.capacity = capacity});
    std::deque<std::string> model;
    for (int i = 0; i < 2000; ++i) {
      const std::string text = std::to_string(i);
      const auto choice = random() % 8;
      std::vector<std::string> expected;
      if (choice < 2) {
        expected.assign(model.begin(), model.end());
        model.clear();
        if (choice == 0) {
          log(ring, text, LUMLogLevelError);
          expected.push_back(text);
        } else {
          ring->handOn();
        }
      } else {
        log(ring, text);
        model.push_back(text);
        if (model.size() > capacity) model.pop_front();
      }
      ASSERT_EQ(trace_.events(), expected);
      ASSERT_EQ(kept(ring), std::vector(model.begin(), model.end()));
    }
  }
}

// Invariant: each message of each thread is handed on at most once, and each error exactly once.
TEST_F(LUMRingLoggerTest, HandsOnEachMessageOnce) {
  constexpr int kMessages = 3000;
  const auto ring = this->ring({.capacity = 8});
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([&, thread] {
      for (int i = 0; i < kMessages; ++i) {
        log(ring, std::to_string(thread) + "." + std::to_string(i),
            i % 10 == 0 ? LUMLogLevelError : LUMLogLevelDebug);
        if (i % 100 == 0) ring->messages();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::vector<std::string> events = trace_.events();
  const auto errors =
      std::ranges::count_if(events, [](const std::string& event) { return event.ends_with('0'); });
  EXPECT_EQ(errors, 4 * kMessages / 10);
  std::ranges::sort(events);
  EXPECT_EQ(std::ranges::adjacent_find(events), events.end());
}

TEST_F(LUMRingLoggerTest, TheChildOfAForkHasTheKeptMessages) {
  const auto ring = this->ring();
  log(ring, "parent");
  EXPECT_EQ(statusOfChild([&] {
              log(ring, "child");
              return kept(ring) == std::vector<std::string>{"parent", "child"} ? 0 : 1;
            }),
            0);
  EXPECT_THAT(kept(ring), ElementsAre("parent"));
}

TEST_F(LUMRingLoggerTest, MayHandOnToABoundedLogger) {
  const auto target =
      rt::make<TestSyncLogger>([this](const rt::Ref<LUMLogMessage>& message) { trace_.add(text(*message)); });
  const auto ring = LUMRingLogger::initWithLogger(LUMBoundedLogger::initWithLogger(target));
  log(ring, "a");
  log(ring, "error", LUMLogLevelError);
  EXPECT_TRUE(ring->flush(60'000));
  EXPECT_THAT(trace_.events(), ElementsAre("a", "error"));
}

}  // namespace
