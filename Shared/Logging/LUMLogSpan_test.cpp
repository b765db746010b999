#include "Shared/Logging/LUMLogSpan.h"

#include <gtest/gtest.h>

#include <atomic>
#include <ctime>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Base/Private/WallClock.h"
#include "Runtime/Queues/Queue.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "tests/support/ClockHook.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Ref;

rt::String stringOf(const LUMLogMessage& message, const char* key) {
  const Ref<LUMLogMetadata>& metadata = message.logMetadata();
  return metadata ? metadata->properties()->stringForKey(rt::String::fromUTF8(key)) : nullptr;
}

Ref<rt::Object> propertyOf(const LUMLogMessage& message, const char* key) {
  return message.logMetadata()->propertyForKey(rt::String::fromUTF8(key));
}

class LUMLogSpanTest : public testing::Test {
 protected:
  LUMLogSpanTest() { LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger_); }
  ~LUMLogSpanTest() override { LUMLogMultiplexer::sharedInstance()->removeSyncLogger(logger_); }

  std::vector<Ref<LUMLogMessage>> messages_;
  const Ref<TestSyncLogger> logger_ =
      rt::make<TestSyncLogger>([this](const Ref<LUMLogMessage>& message) { messages_.push_back(message); });
};

TEST_F(LUMLogSpanTest, LogsOnceAtItsEnd) {
  const std::int64_t before = rt::WallClock::nanoseconds();
  std::uint64_t line = 0;
  rt::String identifier;
  {
    line = __LINE__ + 1;
    const LUMLogSpan span(LUMLogLevelInfo, "import"_s, LUMLogField("path", "a.csv"_s));
    identifier = span.identifier();
    EXPECT_TRUE(messages_.empty());
  }
  ASSERT_EQ(messages_.size(), 1U);
  const LUMLogMessage& message = *messages_[0];
  EXPECT_EQ(message.level(), LUMLogLevelInfo);
  EXPECT_EQ(message.format(), "%@ took %@");
  EXPECT_TRUE(message.formattedString().view().starts_with("import took "))
      << message.formattedString().view();
  EXPECT_EQ(message.line(), line);
  EXPECT_TRUE(message.file().view().ends_with("LUMLogSpan_test.cpp"));
  EXPECT_EQ(stringOf(message, "span"), "import");
  EXPECT_EQ(stringOf(message, "path"), "a.csv");
  EXPECT_EQ(stringOf(message, "span.id"), identifier);
  EXPECT_EQ(identifier.view().size(), 16U);
  EXPECT_EQ(stringOf(message, "trace.id").view().size(), 32U);
  EXPECT_FALSE(propertyOf(message, "span.parent"));
  EXPECT_FALSE(propertyOf(message, "span.failed"));
  const auto* begin = rt::cast<rt::Number>(propertyOf(message, "span.begin").get());
  ASSERT_NE(begin, nullptr);
  EXPECT_GE(begin->integerValue(), before);
  EXPECT_LE(begin->integerValue(), message.time());
  EXPECT_NE(rt::cast<rt::Number>(propertyOf(message, "span.duration").get()), nullptr);
}

TEST_F(LUMLogSpanTest, IsAScope) {
  {
    const LUMLogSpan span(LUMLogLevelInfo, "import"_s, LUMLogField("path", "a.csv"_s));
    LUMLogAt(LUMLogLevelInfo, "reading"_s);
    EXPECT_EQ(stringOf(*messages_[0], "span.id"), span.identifier());
    EXPECT_EQ(stringOf(*messages_[0], "path"), "a.csv");
    EXPECT_FALSE(propertyOf(*messages_[0], "span.duration"));
  }
  EXPECT_FALSE(LUMLogAt(LUMLogLevelInfo, "after"_s)->logMetadata());
}

TEST_F(LUMLogSpanTest, KnowsTheSpanAroundIt) {
  const LUMLogSpan outer(LUMLogLevelInfo, "outer"_s);
  {
    const LUMLogSpan inner(LUMLogLevelInfo, "inner"_s);
  }
  const LUMLogMessage& message = *messages_.at(0);
  EXPECT_EQ(stringOf(message, "span"), "inner");
  EXPECT_EQ(stringOf(message, "span.parent"), outer.identifier());
  EXPECT_NE(stringOf(message, "span.id"), outer.identifier());
  LUMLogAt(LUMLogLevelInfo, "text"_s);
  EXPECT_EQ(stringOf(*messages_.at(1), "trace.id"), stringOf(message, "trace.id"));
  EXPECT_EQ(stringOf(*messages_.at(1), "span.id"), outer.identifier());
}

TEST_F(LUMLogSpanTest, GoesAlongToTasks) {
  const Ref<rt::Queue> queue = rt::make<rt::Queue>("LUMLogSpan_test"_s);
  const LUMLogSpan span(LUMLogLevelInfo, "outer"_s);
  queue->async([] { const LUMLogSpan inner(LUMLogLevelInfo, "inner"_s); });
  queue->barrierSync();
  EXPECT_EQ(stringOf(*messages_.at(0), "span.parent"), span.identifier());
}

TEST_F(LUMLogSpanTest, EndsOnce) {
  LUMLogSpan span(LUMLogLevelInfo, "import"_s);
  span.end();
  span.end();
  EXPECT_EQ(messages_.size(), 1U);
}

TEST_F(LUMLogSpanTest, SaysThatAnExceptionHasEndedIt) {
  try {
    const LUMLogSpan span(LUMLogLevelInfo, "import"_s);
    throw std::runtime_error("no");
  } catch (const std::runtime_error&) {
    // In a handler, but not ended by an exception.
    const LUMLogSpan span(LUMLogLevelInfo, "cleaning"_s);
  }
  ASSERT_EQ(messages_.size(), 2U);
  EXPECT_TRUE(messages_[0]->formattedString().view().starts_with("import failed after "));
  EXPECT_TRUE(rt::isEqual(propertyOf(*messages_[0], "span.failed"), rt::Number::of(true)));
  EXPECT_TRUE(messages_[1]->formattedString().view().starts_with("cleaning took "));
}

TEST_F(LUMLogSpanTest, DropsWhatLoggingThrowsAtItsEnd) {
  const Ref<TestSyncLogger> thrower =
      rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) { throw std::runtime_error("logger"); });
  const Ref<LUMLogMultiplexer>& multiplexer = LUMLogMultiplexer::sharedInstance();
  multiplexer->addSyncLogger(thrower);
  {
    const LUMLogSpan span(LUMLogLevelInfo, "import"_s);
  }
  {
    LUMLogSpan span(LUMLogLevelInfo, "import"_s);
    EXPECT_THROW(span.end(), std::runtime_error);
  }
  multiplexer->removeSyncLogger(thrower);
}

TEST_F(LUMLogSpanTest, IsOnlyAScopeIfNobodyWantsIt) {
  const Ref<LUMLogFilter> filter = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError);
  LUMLogMultiplexer::sharedInstance()->addLogFilter(filter);
  {
    const LUMLogSpan span(LUMLogLevelInfo, "import"_s, LUMLogField("path", "a.csv"_s));
    EXPECT_FALSE(span.identifier());
    LUMLogMultiplexer::sharedInstance()->removeLogFilter(filter);
    LUMLogAt(LUMLogLevelInfo, "reading"_s);
  }
  ASSERT_EQ(messages_.size(), 1U);
  EXPECT_EQ(stringOf(*messages_[0], "path"), "a.csv");
  EXPECT_FALSE(propertyOf(*messages_[0], "span.id"));
}

// Spans differ though threads begin them at the same time.
TEST_F(LUMLogSpanTest, HasAnIdentifierOfItsOwn) {
  constexpr int kThreads = 4;
  constexpr int kSpans = 1000;
  std::vector<std::vector<std::string>> lists(kThreads);
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  LUMLogMultiplexer::sharedInstance()->removeSyncLogger(logger_);
  for (std::vector<std::string>& list : lists) {
    threads.emplace_back([&list] {
      for (int i = 0; i < kSpans; ++i)
        list.emplace_back(LUMLogSpan(LUMLogLevelError, "span"_s).identifier().view());
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::set<std::string> all;
  for (const std::vector<std::string>& list : lists) all.insert(list.begin(), list.end());
  EXPECT_EQ(all.size(), std::size_t{kThreads} * kSpans);
}

// What the monotonic clock reports while a test sets it.
constinit std::atomic<std::uint64_t> now = 0;

// The text of a span that takes so long.
std::string textOf(std::uint64_t nanoseconds, const std::vector<Ref<LUMLogMessage>>& messages) {
  constexpr std::uint64_t kSecond = 1'000'000'000;
  now = 5 * kSecond;
  clockHook = [](clockid_t clock, timespec& time) {
    if (clock != CLOCK_MONOTONIC_RAW) return;
    time.tv_sec = static_cast<std::time_t>(now / kSecond);
    time.tv_nsec = static_cast<long>(now % kSecond);
  };
  {
    const LUMLogSpan span(LUMLogLevelInfo, "it"_s);
    now += nanoseconds;
  }
  clockHook = nullptr;
  EXPECT_TRUE(rt::isEqual(propertyOf(*messages.back(), "span.duration"), rt::Number::of(nanoseconds)));
  return std::string(messages.back()->formattedString().view());
}

TEST_F(LUMLogSpanTest, SaysHowLongItTook) {
  EXPECT_EQ(textOf(0, messages_), "it took 0 ns");
  EXPECT_EQ(textOf(999, messages_), "it took 999 ns");
  EXPECT_EQ(textOf(1000, messages_), "it took 1 us");
  EXPECT_EQ(textOf(12'345, messages_), "it took 12.3 us");
  EXPECT_EQ(textOf(999'499, messages_), "it took 999 us");
  EXPECT_EQ(textOf(999'500, messages_), "it took 1 ms");
  EXPECT_EQ(textOf(12'400'000, messages_), "it took 12.4 ms");
  EXPECT_EQ(textOf(999'499'999, messages_), "it took 999 ms");
  EXPECT_EQ(textOf(999'500'000, messages_), "it took 1.00 s");
  EXPECT_EQ(textOf(75'250'000'000, messages_), "it took 75.25 s");
}

}  // namespace
