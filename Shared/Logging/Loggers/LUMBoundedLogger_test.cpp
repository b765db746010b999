// Each message that is logged is written, dropped or failed, and counted as such. Most tests rest on that
// sum.

#include "Shared/Logging/Loggers/LUMBoundedLogger.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <charconv>
#include <cstdlib>
#include <deque>
#include <functional>
#include <latch>
#include <mutex>
#include <random>
#include <semaphore>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogScope.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/AllocationFailure.h"
#include "tests/support/ForkTest.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::uint32_t kLong = 60'000;

rt::String string(const std::string& text) {
  return rt::String::fromUTF8Repaired(text);
}

// Keeps what it writes. While it is closed, a thread that writes waits.
class Gate final : public rt::Implements<Gate, LUMLogOutput> {
 public:
  static constexpr std::string_view kClassName = "Gate";

  explicit Gate(rt::Ref<LUMLogFilter> filter = nullptr) : Implements(std::move(filter)) {}

  void close() {
    isWriting_ = false;
    isOpen_ = false;
  }
  void open() {
    isOpen_ = true;
    isOpen_.notify_all();
  }
  // Returns when a thread waits in front of the gate.
  void waitForWriter() const { isWriting_.wait(false); }

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    isWriting_ = true;
    isWriting_.notify_all();
    isOpen_.wait(false);
    const std::scoped_lock guard(mutex_);
    lines_.push_back(text(*message));
    last_ = message;
  }

  bool flush(std::uint32_t /*milliseconds*/) override {
    ++flushes_;
    return canFlush_;
  }

  std::vector<std::string> lines() {
    const std::scoped_lock guard(mutex_);
    return std::exchange(lines_, {});
  }
  rt::Ref<LUMLogMessage> last() {
    const std::scoped_lock guard(mutex_);
    return last_;
  }

  std::atomic<int> flushes_ = 0;
  std::atomic<bool> canFlush_ = true;

 private:
  std::mutex mutex_;
  std::vector<std::string> lines_;
  rt::Ref<LUMLogMessage> last_;
  std::atomic<bool> isOpen_ = true;
  std::atomic<bool> isWriting_ = false;
};

class Bounded {
 public:
  explicit Bounded(LUMBoundedLoggerOptions options = {})
      : logger_(LUMBoundedLogger::initWithLogger(target_, options)) {}

  void log(const std::string& text) const {
    logger_->logWithMessage(messageWith(LUMLogLevelInfo, string(text)));
  }

  // Makes the task wait while it writes a message, so that later ones stay in the queue.
  void hold() const {
    target_->close();
    log("held");
    target_->waitForWriter();
  }

  // Lets the task go on and returns what it writes.
  std::vector<std::string> written() const {
    target_->open();
    EXPECT_TRUE(logger_->flush(kLong));
    return target_->lines();
  }

  const rt::Ref<Gate> target_ = rt::make<Gate>();
  const rt::Ref<LUMBoundedLogger> logger_;
};

TEST(LUMBoundedLogger, WritesInOrder) {
  const Bounded bounded;
  std::vector<std::string> expected;
  for (int i = 0; i < 20'000; ++i) {
    expected.push_back(std::to_string(i));
    bounded.log(expected.back());
  }
  EXPECT_EQ(bounded.written(), expected);
  EXPECT_EQ(bounded.logger_->droppedCount(), 0U);
}

TEST(LUMBoundedLogger, WritesOnAnotherThread) {
  std::atomic<std::thread::id> thread;
  const auto target = rt::make<TestSyncLogger>([&](const auto&) { thread = std::this_thread::get_id(); });
  const auto logger = LUMBoundedLogger::initWithLogger(target);
  logger->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_NE(thread.load(), std::thread::id());
  EXPECT_NE(thread.load(), std::this_thread::get_id());
}

// The task has ended by then, so that the message starts the next one.
TEST(LUMBoundedLogger, WritesAgainAfterItsTaskHasEnded) {
  const Bounded bounded;
  for (int i = 0; i < 3; ++i) {
    bounded.log("a");
    EXPECT_THAT(bounded.written(), ElementsAre("a"));
    while (bounded.logger_->isAwake()) std::this_thread::yield();
  }
}

TEST(LUMBoundedLogger, RefusesWrongOptions) {
  const rt::Ref<Gate> target = rt::make<Gate>();
  EXPECT_THROW(LUMBoundedLogger::initWithLogger(nullptr), std::invalid_argument);
  EXPECT_THROW(LUMBoundedLogger::initWithLogger(target, {.capacity = 0}), std::invalid_argument);
  EXPECT_THROW(LUMBoundedLogger::initWithLogger(target, {.capacity = LUMBoundedLogger::kMaximumCapacity + 1}),
               std::invalid_argument);
  EXPECT_EQ(LUMBoundedLogger::initWithLogger(target, {.capacity = 5})->capacity(), 8U);
  EXPECT_EQ(LUMBoundedLogger::initWithLogger(target)->capacity(), 8192U);
}

TEST(LUMBoundedLogger, HasTheFilterOfItsTarget) {
  const auto filter = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError);
  const rt::Ref<Gate> target = rt::make<Gate>(filter);
  const auto logger = LUMBoundedLogger::initWithLogger(target);
  EXPECT_EQ(logger->filter(), filter);
  EXPECT_EQ(logger->lowestLevel(nullptr), LUMLogLevelError);
  const auto other = rt::make<TestSyncLogger>([](const auto&) {}, LUMLogDropAllFilter::init());
  EXPECT_EQ(LUMBoundedLogger::initWithLogger(other)->lowestLevel(nullptr), 0U);
}

TEST(LUMBoundedLogger, ReportsTheNewestThatItDropped) {
  const Bounded bounded({.capacity = 2, .whenFull = LUMLogWhenFull::kDropNewest});
  bounded.hold();
  for (const char* text : {"a", "b", "c", "d", "e"}) bounded.log(text);
  EXPECT_EQ(bounded.logger_->droppedCount(), 3U);
  EXPECT_THAT(bounded.written(),
              ElementsAre("held", "a", "b", "3 messages were dropped: the queue of Gate was full"));
  bounded.log("f");
  EXPECT_THAT(bounded.written(), ElementsAre("f"));
  EXPECT_EQ(bounded.logger_->droppedCount(), 3U);
}

TEST(LUMBoundedLogger, ReportsTheOldestThatItDropped) {
  const Bounded bounded({.capacity = 2, .whenFull = LUMLogWhenFull::kDropOldest});
  bounded.hold();
  for (const char* text : {"a", "b", "c"}) bounded.log(text);
  EXPECT_EQ(bounded.logger_->droppedCount(), 1U);
  EXPECT_THAT(bounded.written(),
              ElementsAre("held", "1 message was dropped: the queue of Gate was full", "b", "c"));
}

// The message after the dropped ones carries their number.
TEST(LUMBoundedLogger, ReportsBeforeTheNextMessage) {
  class Steps final : public rt::Implements<Steps, LUMLogOutput> {
   public:
    Steps() : Implements(nullptr) {}
    void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
      lines.push_back(text(*message));
      if (lines.size() > 2) return;
      arrived.release();
      mayGoOn.acquire();
    }
    std::vector<std::string> lines;
    std::counting_semaphore<> arrived{0};
    std::counting_semaphore<> mayGoOn{0};
  };
  const auto target = rt::make<Steps>();
  const auto logger =
      LUMBoundedLogger::initWithLogger(target, {.capacity = 2, .whenFull = LUMLogWhenFull::kDropNewest});
  const auto log = [&](const char* text) {
    logger->logWithMessage(messageWith(LUMLogLevelInfo, string(text)));
  };
  log("a");
  target->arrived.acquire();
  for (const char* text : {"b", "c", "d"}) log(text);
  target->mayGoOn.release();
  target->arrived.acquire();
  log("e");  // There is room: "b" is being written.
  target->mayGoOn.release();
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_THAT(target->lines,
              ElementsAre("a", "b", "c", "1 message was dropped: the queue of Steps was full", "e"));
}

TEST(LUMBoundedLogger, ReportsAsAnError) {
  const Bounded bounded({.capacity = 1, .whenFull = LUMLogWhenFull::kDropNewest});
  bounded.hold();
  for (int i = 0; i < 2; ++i) bounded.log("a");
  EXPECT_EQ(bounded.written().size(), 3U);
  const rt::Ref<LUMLogMessage> report = bounded.target_->last();
  EXPECT_EQ(report->level(), LUMLogLevelError);
  EXPECT_EQ(report->logMetadata()->component(), "LUMBoundedLogger");
}

TEST(LUMBoundedLogger, BlocksUntilThereIsRoom) {
  const Bounded bounded({.capacity = 1});
  bounded.hold();
  std::thread other([&] {
    for (int i = 0; i < 1000; ++i) bounded.log(std::to_string(i));
  });
  bounded.target_->open();
  other.join();
  EXPECT_EQ(bounded.written().size(), 1001U);
  EXPECT_EQ(bounded.logger_->droppedCount(), 0U);
}

TEST(LUMBoundedLogger, NeverBlocksTheThreadThatWrites) {
  rt::Ref<LUMBoundedLogger> logger;
  std::atomic<int> written = 0;
  const auto target = rt::make<TestSyncLogger>([&](const rt::Ref<LUMLogMessage>& message) {
    ++written;
    if (text(*message) != "first") return;
    for (int i = 0; i < 5; ++i) logger->logWithMessage(messageWith(LUMLogLevelInfo, "inner"_s));
  });
  logger = LUMBoundedLogger::initWithLogger(target, {.capacity = 2});
  logger->logWithMessage(messageWith(LUMLogLevelInfo, "first"_s));
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_EQ(logger->droppedCount(), 3U);
  EXPECT_EQ(written, 4);  // With the report.
}

// Two loggers that write to each other would wait for each other.
TEST(LUMBoundedLogger, TwoThatWriteToEachOtherDoNotDeadlock) {
  rt::Ref<LUMBoundedLogger> first;
  rt::Ref<LUMBoundedLogger> second;
  std::atomic<int> left = 2000;
  const auto to = [&](rt::Ref<LUMBoundedLogger>& other) {
    return rt::make<TestSyncLogger>([&](const rt::Ref<LUMLogMessage>& message) {
      if (--left > 0) other->logWithMessage(message);
    });
  };
  first = LUMBoundedLogger::initWithLogger(to(second), {.capacity = 1});
  second = LUMBoundedLogger::initWithLogger(to(first), {.capacity = 1});
  while (left > 0) first->logWithMessage(messageWith(LUMLogLevelInfo, "a"_s));
  for (const auto& each : {first, second, first}) EXPECT_TRUE(each->flush(kLong));
}

TEST(LUMBoundedLogger, FlushesItsTarget) {
  const Bounded bounded;
  bounded.log("a");
  EXPECT_TRUE(bounded.logger_->flush(kLong));
  EXPECT_EQ(bounded.target_->flushes_, 1);
  bounded.target_->canFlush_ = false;
  EXPECT_FALSE(bounded.logger_->flush(kLong));
}

TEST(LUMBoundedLogger, FlushGivesUpAtTheDeadline) {
  const Bounded bounded;
  bounded.hold();
  EXPECT_FALSE(bounded.logger_->flush(0));
  EXPECT_FALSE(bounded.logger_->flush(1));
  EXPECT_EQ(bounded.target_->flushes_, 0);
  EXPECT_THAT(bounded.written(), ElementsAre("held"));
}

TEST(LUMBoundedLogger, FlushOnTheThreadThatWritesReturnsAtOnce) {
  rt::Ref<LUMBoundedLogger> logger;
  std::atomic<bool> isFlushed = true;
  logger = LUMBoundedLogger::initWithLogger(
      rt::make<TestSyncLogger>([&](const auto&) { isFlushed = logger->flush(kLong); }));
  logger->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_FALSE(isFlushed);
}

TEST(LUMBoundedLogger, CountsMessagesForWhichTheTargetThrows) {
  std::atomic<int> calls = 0;
  const auto logger = LUMBoundedLogger::initWithLogger(rt::make<TestSyncLogger>([&](const auto&) {
    if (++calls % 2 == 0) throw std::runtime_error("full");
  }));
  for (int i = 0; i < 10; ++i) logger->logWithMessage(messageWith(LUMLogLevelInfo));
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_EQ(calls, 10);
  EXPECT_EQ(logger->failedCount(), 5U);
  EXPECT_EQ(logger->droppedCount(), 0U);
}

// Asynchronous targets.

TEST(LUMBoundedLogger, WritesOnTheQueueOfAnAsynchronousTarget) {
  const auto queue = rt::make<rt::Queue>("target"_s);
  Trace trace;
  const auto target = rt::make<TestAsyncLogger>(queue, [&](const rt::Ref<LUMLogMessage>& message) {
    trace.add(text(*message) + " on " + std::string(rt::Queue::currentLabel().view()));
  });
  const auto logger = LUMBoundedLogger::initWithLogger(target);
  logger->logWithMessage(messageWith(LUMLogLevelInfo, "a"_s));
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_THAT(trace.events(), ElementsAre("a on target"));
  queue->barrierSync();  // The queue is free again.
}

TEST(LUMBoundedLogger, WritesAtOnceWhatAnAsynchronousTargetWantsAtOnce) {
  const auto queue = rt::make<rt::Queue>("target"_s);
  Trace trace;
  const auto target = rt::make<TestAsyncLogger>(
      queue, [&](const rt::Ref<LUMLogMessage>& message) { trace.add(text(*message)); });
  target->dispatchMode_ = [](const LUMLogMessage& message) {
    return message.level() == LUMLogLevelFault ? LUMLogDispatchModeSynchronous : 0;
  };
  const auto logger = LUMBoundedLogger::initWithLogger(target);
  logger->logWithMessage(messageWith(LUMLogLevelFault, "fault"_s));
  EXPECT_THAT(trace.events(), ElementsAre("fault"));
  // On that queue it would wait for itself.
  queue->sync([&] {
    logger->logWithMessage(messageWith(LUMLogLevelFault, "inner"_s));
    EXPECT_THAT(trace.events(), IsEmpty());
  });
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_THAT(trace.events(), ElementsAre("inner"));
}

// Regression: a task of the target's queue waited for room, which only that queue could make.
TEST(LUMBoundedLogger, DropsWhatATaskOfTheTargetsQueueHasNoRoomFor) {
  const auto queue = rt::make<rt::Queue>("target"_s);
  std::atomic<std::uint64_t> written = 0;
  const auto target = rt::make<TestAsyncLogger>(queue, [&](const rt::Ref<LUMLogMessage>& message) {
    if (message->level() == LUMLogLevelInfo) ++written;
  });
  const auto logger = LUMBoundedLogger::initWithLogger(target, {.capacity = 1});
  constexpr std::uint64_t kCount = 10;
  queue->sync([&] {
    for (std::uint64_t i = 0; i < kCount; ++i) logger->logWithMessage(messageWith(LUMLogLevelInfo));
  });
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_EQ(written + logger->droppedCount(), kCount);
  EXPECT_GT(logger->droppedCount(), 0U);
}

// Regression: what a target logged had the metadata of the thread that had started the task.
TEST(LUMBoundedLogger, WritesOutsideOfTheScopesOfThreads) {
  rt::Ref<LUMLogMetadata> metadata = LUMLogMetadata::init();
  const auto logger = LUMBoundedLogger::initWithLogger(
      rt::make<TestSyncLogger>([&](const auto&) { metadata = LUMLogScope::current(); }));
  {
    const LUMLogScope scope(LUMLogField("request", 7));
    logger->logWithMessage(messageWith(LUMLogLevelInfo));
  }
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_FALSE(metadata);
}

TEST(LUMBoundedLogger, CountsMessagesForATargetWithoutAQueue) {
  const auto queue = rt::make<rt::Queue>("target"_s);
  std::latch isAsked(1);
  std::latch mayAnswer(1);
  const auto target = rt::make<TestAsyncLogger>(queue, [](const auto&) { FAIL(); });
  target->operationQueue_ = [&]() -> rt::Ref<rt::Queue> {
    if (!isAsked.try_wait()) isAsked.count_down();
    mayAnswer.wait();
    return nullptr;
  };
  const auto logger =
      LUMBoundedLogger::initWithLogger(target, {.capacity = 1, .whenFull = LUMLogWhenFull::kDropNewest});
  logger->logWithMessage(messageWith(LUMLogLevelInfo));
  isAsked.wait();
  logger->logWithMessage(messageWith(LUMLogLevelInfo));
  mayAnswer.count_down();
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_EQ(logger->failedCount(), 1U);
  EXPECT_EQ(logger->droppedCount(), 1U);  // The target gets no report either.
}

// Regression: the destructor asked the target for its queue, and used it, although nothing waited.
TEST(LUMBoundedLogger, IsDestroyedWithoutItsTarget) {
  const auto target = rt::make<TestAsyncLogger>(nullptr, [](const auto&) {});
  bool isAsked = false;
  target->operationQueue_ = [&]() -> rt::Ref<rt::Queue> {
    isAsked = true;
    return nullptr;
  };
  static_cast<void>(LUMBoundedLogger::initWithLogger(target));
  EXPECT_FALSE(isAsked);
}

// Against a model: one thread, a task that writes when the test lets it.

class LUMBoundedLoggerModel : public testing::TestWithParam<LUMLogWhenFull> {};

TEST_P(LUMBoundedLoggerModel, DropsAndReportsAsTheModelDoes) {
  constexpr std::size_t kCapacity = 4;
  std::mt19937 random(17);  // NOLINT(bugprone-random-generator-seed): the same run each time
  const Bounded bounded({.capacity = kCapacity, .whenFull = GetParam()});
  std::uint64_t dropped = 0;
  for (int round = 0; round < 200; ++round) {
    bounded.hold();
    std::deque<std::string> waiting;
    std::uint64_t here = 0;
    const int count = std::uniform_int_distribution(0, GetParam() == LUMLogWhenFull::kBlock ? 4 : 12)(random);
    for (int i = 0; i < count; ++i) {
      const std::string text = std::to_string(round) + "." + std::to_string(i);
      bounded.log(text);
      if (waiting.size() == kCapacity) {
        ++here;
        if (GetParam() == LUMLogWhenFull::kDropNewest) continue;
        waiting.pop_front();
      }
      waiting.push_back(text);
    }
    if (here > 0) {
      const std::string report = std::to_string(here) + (here == 1 ? " message was" : " messages were") +
                                 " dropped: the queue of Gate was full";
      GetParam() == LUMLogWhenFull::kDropNewest ? waiting.push_back(report) : waiting.push_front(report);
    }
    waiting.emplace_front("held");
    EXPECT_EQ(bounded.written(), std::vector(waiting.begin(), waiting.end()));
    dropped += here;
    EXPECT_EQ(bounded.logger_->droppedCount(), dropped);
  }
}

// Invariant: the messages of each thread arrive in order and at most once. Written and dropped ones add up to
// those that were logged, and the reports to those that were dropped.
TEST_P(LUMBoundedLoggerModel, AccountsForEachMessageOfManyThreads) {
  constexpr int kThreads = 6;
  constexpr int kMessages = 4000;
  for (const std::size_t capacity : {1U, 4U, 64U}) {
    const Bounded bounded({.capacity = capacity, .whenFull = GetParam()});
    std::vector<std::thread> threads;
    std::latch start(kThreads);
    for (int thread = 0; thread < kThreads; ++thread) {
      threads.emplace_back([&, thread] {
        std::mt19937 random(static_cast<unsigned>(thread));
        start.arrive_and_wait();
        for (int i = 0; i < kMessages; ++i) {
          bounded.log(std::to_string(thread) + " " + std::to_string(i));
          if (random() % 64 == 0) std::this_thread::yield();
          if (random() % 1024 == 0) bounded.logger_->flush(random() % 2);
        }
      });
    }
    for (std::thread& thread : threads) thread.join();
    std::uint64_t written = 0;
    std::uint64_t reported = 0;
    std::vector<int> next(kThreads, 0);
    for (const std::string& line : bounded.written()) {
      const auto space = line.find(' ');
      if (line.ends_with("full")) {
        reported += std::stoull(line.substr(0, space));
        continue;
      }
      int& expected = next.at(std::stoul(line.substr(0, space)));
      const int number = std::stoi(line.substr(space));
      ASSERT_GE(number, expected) << line;
      expected = number + 1;
      ++written;
    }
    EXPECT_EQ(written + bounded.logger_->droppedCount(), std::uint64_t{kThreads} * kMessages);
    EXPECT_EQ(reported, bounded.logger_->droppedCount());
    if (GetParam() == LUMLogWhenFull::kBlock) {
      EXPECT_EQ(reported, 0U);
    }
  }
}

INSTANTIATE_TEST_SUITE_P(All, LUMBoundedLoggerModel,
                         testing::Values(LUMLogWhenFull::kBlock, LUMLogWhenFull::kDropOldest,
                                         LUMLogWhenFull::kDropNewest));

// Messages are released when they are written or dropped.
TEST(LUMBoundedLogger, ReleasesItsMessages) {
  for (const auto policy : {LUMLogWhenFull::kDropOldest, LUMLogWhenFull::kDropNewest}) {
    class Counted final : public rt::Implements<Counted, LUMLogMetadata> {
     public:
      explicit Counted(std::atomic<int>& count) : Implements(nullptr), count_(count) { ++count_; }
      ~Counted() override { --count_; }

     private:
      std::atomic<int>& count_;
    };
    std::atomic<int> count = 0;
    {
      const Bounded bounded({.capacity = 2, .whenFull = policy});
      bounded.hold();
      for (int i = 0; i < 10; ++i)
        bounded.logger_->logWithMessage(messageWith(LUMLogLevelInfo, "a"_s, rt::make<Counted>(count)));
      EXPECT_EQ(count, 2);
      bounded.log("last");
      EXPECT_FALSE(bounded.written().empty());
    }
    EXPECT_EQ(count, 0);
  }
}

// Memory.

TEST(LUMBoundedLogger, AllocatesNothingWhileItsTaskIsAwake) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const Bounded bounded;
  bounded.hold();
  const rt::Ref<LUMLogMessage> message = messageWith(LUMLogLevelInfo, "a"_s);
  {
    const AllocationCount count;
    for (int i = 0; i < 100; ++i) bounded.logger_->logWithMessage(message);
    EXPECT_EQ(count.allocations(), 0);
  }
  EXPECT_EQ(bounded.written().size(), 101U);
}

TEST(LUMBoundedLogger, WritesOnTheCallersThreadWithoutMemoryForATask) {
  if (!AllocationFailure::isSupported()) GTEST_SKIP() << "no way to make allocations fail here";
  std::atomic<std::thread::id> thread;
  const auto target = rt::make<TestSyncLogger>([&](const auto&) { thread = std::this_thread::get_id(); });
  const auto logger = LUMBoundedLogger::initWithLogger(target);
  const rt::Ref<LUMLogMessage> message = messageWith(LUMLogLevelInfo, "a"_s);
  {
    const AllocationFailure failure(1);
    logger->logWithMessage(message);
    EXPECT_TRUE(failure.hasHappened());
  }
  EXPECT_EQ(thread.load(), std::this_thread::get_id());
  logger->logWithMessage(message);
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_NE(thread.load(), std::this_thread::get_id());
}

// Exit and fork. The target writes to standard error, which the parent of a death test reads.

class LUMBoundedLoggerDeathTest : public testing::Test {
 protected:
  LUMBoundedLoggerDeathTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  static rt::Ref<LUMBoundedLogger> toStandardError() {
    return LUMBoundedLogger::initWithLogger(rt::make<TestSyncLogger>(
        [](const rt::Ref<LUMLogMessage>& message) { std::fprintf(stderr, "%s;", text(*message).c_str()); }));
  }
};

TEST_F(LUMBoundedLoggerDeathTest, WritesAtExitWhatWaits) {
  EXPECT_EXIT(
      {
        const auto logger = toStandardError();
        for (int i = 0; i < 100; ++i)
          logger->logWithMessage(messageWith(LUMLogLevelInfo, string(std::to_string(i))));
        std::exit(0);
      },
      testing::ExitedWithCode(0), "97;98;99;$");
}

TEST_F(LUMBoundedLoggerDeathTest, WritesWhatStaticDestructorsLog) {
  EXPECT_EXIT(
      {
        static const rt::Ref<LUMBoundedLogger>& logger = *new rt::Ref<LUMBoundedLogger>(toStandardError());
        struct Static {
          ~Static() { logger->logWithMessage(messageWith(LUMLogLevelInfo, "last words"_s)); }
        };
        static const Static object;
        logger->logWithMessage(messageWith(LUMLogLevelInfo, "first words"_s));
        std::exit(0);
      },
      testing::ExitedWithCode(0), "first words;last words;$");
}

constexpr const char* kNoThreadsAfterFork = "the sanitizer allows no new threads in the child";

TEST(LUMBoundedLogger, TheChildOfAForkStartsEmpty) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
  for (const auto policy :
       {LUMLogWhenFull::kBlock, LUMLogWhenFull::kDropOldest, LUMLogWhenFull::kDropNewest}) {
    const Bounded bounded({.capacity = 4, .whenFull = policy});
    bounded.hold();
    for (const char* text : {"a", "b", "c"}) bounded.log(text);
    const int status = statusOfChild([&] {
      bounded.target_->open();
      for (int i = 0; i < 3; ++i) bounded.log("child");
      const std::vector<std::string> lines = bounded.written();
      return lines == std::vector<std::string>(3, "child") && bounded.logger_->droppedCount() == 0 ? 0 : 1;
    });
    EXPECT_EQ(status, 0);
    EXPECT_THAT(bounded.written(), ElementsAre("held", "a", "b", "c"));
  }
}

TEST(LUMBoundedLogger, ATargetMayFork) {
  Trace trace;
  rt::Ref<LUMBoundedLogger> logger;
  std::atomic<int> status = -1;
  const auto target = rt::make<TestSyncLogger>([&](const rt::Ref<LUMLogMessage>& message) {
    trace.add(text(*message));
    if (text(*message) != "fork") return;
    status = statusOfChild([&] {
      logger->logWithMessage(messageWith(LUMLogLevelInfo, "child"_s));
      return logger->flush(0) ? 1 : 0;  // The thread that forked writes, so this would wait for itself.
    });
  });
  logger = LUMBoundedLogger::initWithLogger(target);
  for (const char* text : {"fork", "a"}) logger->logWithMessage(messageWith(LUMLogLevelInfo, string(text)));
  EXPECT_TRUE(logger->flush(kLong));
  EXPECT_EQ(status, 0);
  EXPECT_THAT(trace.events(), ElementsAre("fork", "a"));
}

// Invariant: whatever the other threads were doing, the child logs at once, and the parent loses nothing.
TEST(LUMBoundedLogger, ForksWhileThreadsLog) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
  const Bounded bounded({.capacity = 8});
  std::atomic<bool> isOver = false;
  std::vector<std::thread> threads;
  std::atomic<std::uint64_t> logged = 0;
  for (int i = 0; i < 2; ++i) {
    threads.emplace_back([&] {
      while (!isOver) {
        bounded.log("parent");
        ++logged;
      }
    });
  }
  for (int i = 0; i < 20; ++i) {
    const int status = statusOfChild([&] {
      // The target's mutex may be held in the child, so the child only logs.
      for (int k = 0; k < 4; ++k) bounded.log("child");
      return bounded.logger_->droppedCount() == 0 ? 0 : 1;
    });
    EXPECT_EQ(status, 0);
  }
  isOver = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(bounded.written(), std::vector<std::string>(logged, "parent"));
}

}  // namespace
