// Tests what is delivered to which logger, when and in which order, one message at a time.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <latch>
#include <limits>
#include <string>
#include <thread>
#include <vector>

#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "tests/support/LUMLogMultiplexerTest.h"

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

// The multiplexer's filters.

TEST_F(LUMLogMultiplexerTest, DeliversTheSameMessageObject) {
  const Ref<LUMLogMessage> message = messageWith(LUMLogLevelInfo, "x"_s);
  std::atomic<int> count = 0;
  const auto check = [&](const Ref<LUMLogMessage>& received) {
    EXPECT_EQ(received, message);
    ++count;
  };
  const auto ask = [&](const LUMLogMessage& asked) {
    EXPECT_EQ(&asked, message.get());
    return true;
  };
  multiplexer_->addLogFilter(rt::make<TestFilter>(ask));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>(check, rt::make<TestFilter>(ask)));
  for (const LUMLogDispatchMode mode : {0U, LUMLogDispatchModeSynchronous}) {
    const auto logger = rt::make<TestAsyncLogger>(queue_, check);
    logger->filter_ = rt::make<TestFilter>(ask);
    logger->dispatchMode_ = [=](const LUMLogMessage& asked) {
      EXPECT_EQ(&asked, message.get());
      return mode;
    };
    multiplexer_->addAsyncLogger(logger);
  }
  multiplexer_->logWithMessage(message);
  drain();
  EXPECT_EQ(count, 3);
}

TEST_F(LUMLogMultiplexerTest, DropsWhatAFilterRefuses) {
  const auto refusing = filter("refusing", false);
  multiplexer_->addLogFilter(refusing);
  multiplexer_->addSyncLogger(sync("sync", filter("sync's filter", true)));
  const auto asyncLogger = async("async", filter("async's filter", true));
  asyncLogger->operationQueue_ = [&] {
    trace_.add("queue");
    return queue_;
  };
  asyncLogger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add("mode");
    return LUMLogDispatchMode{0};
  };
  multiplexer_->addAsyncLogger(asyncLogger);
  multiplexer_->addAsyncLogger(blocking("blocking", filter("blocking's filter", true)));
  EXPECT_THAT(logAndDrain(), ElementsAre("refusing"));
  multiplexer_->removeLogFilter(refusing);
  log();
  drain();
  EXPECT_THAT(trace_.events(), testing::IsSupersetOf({"sync's filter", "sync", "async's filter", "async",
                                                      "queue", "mode", "blocking's filter", "blocking"}));
}

TEST_F(LUMLogMultiplexerTest, DeliversWhatAllFiltersLetPass) {
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addLogFilter(filter("a", true));
  multiplexer_->addLogFilter(filter("b", true));
  multiplexer_->addLogFilter(filter("c", true));
  const std::vector<std::string> events = logAndDrain();
  EXPECT_THAT(events, UnorderedElementsAre("a", "b", "c", "sync"));
  EXPECT_EQ(events.back(), "sync");
}

TEST_F(LUMLogMultiplexerTest, AsksNoFilterAfterARefusal) {
  for (const char* const name : {"a", "b", "c", "d"}) multiplexer_->addLogFilter(filter(name, false));
  multiplexer_->addSyncLogger(sync("sync"));
  EXPECT_EQ(logAndDrain().size(), 1U);
}

TEST_F(LUMLogMultiplexerTest, OneRefusalAmongManyFiltersIsEnough) {
  for (const char* const name : {"a", "b", "c", "d"}) multiplexer_->addLogFilter(filter(name, true));
  multiplexer_->addLogFilter(LUMLogDropAllFilter::init());
  multiplexer_->addSyncLogger(sync("sync"));
  EXPECT_THAT(logAndDrain(), testing::Not(testing::Contains("sync")));
}

TEST_F(LUMLogMultiplexerTest, PassesOnMessagesOfAllLevels) {
  std::vector<LUMLogLevel> levels;
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>(
      [&](const Ref<LUMLogMessage>& message) { levels.push_back(message->level()); }));
  for (LUMLogLevel level = 0; level <= 5; ++level) log("x"_s, level);
  log("x"_s, std::numeric_limits<LUMLogLevel>::max());
  EXPECT_THAT(levels, ElementsAre(0, 1, 2, 3, 4, 5, std::numeric_limits<LUMLogLevel>::max()));
}

// Synchronous loggers.

TEST_F(LUMLogMultiplexerTest, CallsSyncLoggersOnTheCallersThread) {
  std::thread::id runner;
  multiplexer_->addSyncLogger(
      rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) { runner = std::this_thread::get_id(); }));
  log();
  EXPECT_EQ(runner, std::this_thread::get_id());
  inAnotherThread([&] {
    log();
    EXPECT_EQ(runner, std::this_thread::get_id());
  });
}

TEST_F(LUMLogMultiplexerTest, AsksTheFilterOfASyncLoggerOnce) {
  multiplexer_->addSyncLogger(sync("a", filter("filter of a", false)));
  multiplexer_->addSyncLogger(sync("b", filter("filter of b", true)));
  multiplexer_->addSyncLogger(sync("c"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("filter of a", "filter of b", "b", "c"));
}

// Asynchronous loggers.

TEST_F(LUMLogMultiplexerTest, CallsAsyncLoggersOnTheirQueues) {
  const auto other = rt::make<Queue>("other"_s);
  bool isOnQueue = false;
  bool isOnOther = false;
  multiplexer_->addAsyncLogger(
      rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>&) { isOnQueue = queue_->isCurrent(); }));
  multiplexer_->addAsyncLogger(
      rt::make<TestAsyncLogger>(other, [&](const Ref<LUMLogMessage>&) { isOnOther = other->isCurrent(); }));
  log();
  drain();
  other->barrierSync();
  EXPECT_TRUE(isOnQueue);
  EXPECT_TRUE(isOnOther);
}

TEST_F(LUMLogMultiplexerTest, AsksAsyncLoggersOnTheDocumentedThreads) {
  const auto logger = rt::make<TestAsyncLogger>(queue_, tracing("logged"));
  const auto here = std::this_thread::get_id();
  const auto whereAmI = [=, this] {
    if (queue_->isCurrent()) return "on its queue";
    if (multiplexer_->loggingQueue()->isCurrent()) return "on the logging queue";
    return std::this_thread::get_id() == here ? "here" : "elsewhere";
  };
  logger->filter_ = rt::make<TestFilter>([&](const LUMLogMessage&) {
    trace_.add(std::string("filter ") + whereAmI());
    return true;
  });
  logger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add(std::string("mode ") + whereAmI());
    return LUMLogDispatchMode{0};
  };
  logger->operationQueue_ = [&] {
    trace_.add(std::string("queue ") + whereAmI());
    return queue_;
  };
  multiplexer_->addAsyncLogger(logger);
  EXPECT_THAT(logAndDrain(), ElementsAre("filter here", "mode here", "queue on the logging queue",
                                         "filter on its queue", "logged"));
  logger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add(std::string("mode ") + whereAmI());
    return LUMLogDispatchModeSynchronous;
  };
  EXPECT_THAT(logAndDrain(),
              ElementsAre("filter here", "mode here", "queue here", "filter on its queue", "logged"));
}

// The second answer decides whether the logger runs. A refusal at the first question only skips the question
// for the mode.
TEST_F(LUMLogMultiplexerTest, AsksTheFilterOfAnAsyncLoggerAgainOnItsQueue) {
  std::vector<bool> answers;
  const auto asking = rt::make<TestFilter>([&](const LUMLogMessage&) {
    const bool answer = answers.back();
    answers.pop_back();
    trace_.add(answer ? "yes" : "no");
    return answer;
  });
  const auto logger = blocking("logged", asking);
  logger->dispatchMode_ = [&](const LUMLogMessage&) {
    trace_.add("mode");
    return LUMLogDispatchModeSynchronous;
  };
  multiplexer_->addAsyncLogger(logger);
  answers = {true, false};
  EXPECT_THAT(logAndDrain(), ElementsAre("no", "yes", "logged"));
  answers = {false, true};
  EXPECT_THAT(logAndDrain(), ElementsAre("yes", "mode", "no"));
  logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchMode{0}; };
  answers = {false, true};
  EXPECT_THAT(logAndDrain(), ElementsAre("yes", "no"));
  answers = {false, false};
  EXPECT_THAT(logAndDrain(), ElementsAre("no", "no"));
}

TEST_F(LUMLogMultiplexerTest, GivesNothingToAnAsyncLoggerWithoutAQueue) {
  for (const LUMLogDispatchMode mode : {0U, 1U, LUMLogDispatchModeSynchronous}) {
    const auto logger = rt::make<TestAsyncLogger>(nullptr, tracing("logged"));
    logger->dispatchMode_ = [=](const LUMLogMessage&) { return mode; };
    multiplexer_->addAsyncLogger(logger);
  }
  multiplexer_->addAsyncLogger(async("with a queue"));
  multiplexer_->addAsyncLogger(blocking("with a queue, blocking"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("with a queue", "with a queue, blocking"));
}

TEST_F(LUMLogMultiplexerTest, TreatsEveryOtherModeAsAsynchronous) {
  EXPECT_EQ(LUMLogDispatchModeSynchronous, 2U);
  for (const LUMLogDispatchMode mode : {0U, 1U, 3U, 0x8000'0002U, 0xffff'ffffU}) {
    const auto logger = async("logged");
    logger->dispatchMode_ = [=](const LUMLogMessage&) { return mode; };
    multiplexer_->addAsyncLogger(logger);
    std::latch mayGoOn(1);
    queue_->async([&] { mayGoOn.wait(); });
    log();  // This would not return if it waited for the queue.
    EXPECT_THAT(trace_.events(), IsEmpty());
    mayGoOn.count_down();
    drain();
    EXPECT_THAT(trace_.events(), ElementsAre("logged"));
    multiplexer_->removeAsyncLogger(logger);
  }
}

TEST_F(LUMLogMultiplexerTest, CallsABlockingLoggerOnceBeforeItReturns) {
  bool isOnQueue = false;
  const auto logger = rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>&) {
    isOnQueue = queue_->isCurrent();
    trace_.add("logged");
  });
  logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
  multiplexer_->addAsyncLogger(logger);
  log();
  EXPECT_TRUE(isOnQueue);
  EXPECT_THAT(trace_.events(), ElementsAre("logged"));
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
}

// A mode applies to one message.
TEST_F(LUMLogMultiplexerTest, AsksForTheModeForEachMessage) {
  const auto logger = rt::make<TestAsyncLogger>(queue_, tracing("logged", true));
  logger->dispatchMode_ = [](const LUMLogMessage& message) {
    return message.level() == LUMLogLevelFault ? LUMLogDispatchModeSynchronous : LUMLogDispatchMode{0};
  };
  multiplexer_->addAsyncLogger(logger);
  std::latch mayFanOut(1);
  multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
  log("later"_s);
  log("now"_s, LUMLogLevelFault);
  EXPECT_THAT(trace_.events(), ElementsAre("logged now"));
  mayFanOut.count_down();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("logged later"));
}

TEST_F(LUMLogMultiplexerTest, DeliversMessagesToAnAsyncLoggerInOrder) {
  constexpr int kMessages = 1000;
  std::vector<std::string> expected;
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(
      queue_, [&](const Ref<LUMLogMessage>& message) { trace_.add(text(*message)); }));
  for (int i = 0; i < kMessages; ++i) {
    expected.push_back(std::to_string(i));
    log(rt::String::fromUTF8(expected.back()));
  }
  drain();
  EXPECT_EQ(trace_.events(), expected);
}

// The order of the kinds of loggers.

// The message is queued first, so the synchronous logger can wait for its delivery. Blocking loggers come
// last.
TEST_F(LUMLogMultiplexerTest, QueuesThenCallsSyncLoggersThenBlocks) {
  const auto other = rt::make<Queue>("other"_s);
  multiplexer_->addAsyncLogger(async("async"));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) {
    drain();
    trace_.add("sync");
  }));
  const auto logger = rt::make<TestAsyncLogger>(other, tracing("blocking"));
  logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
  multiplexer_->addAsyncLogger(logger);
  log();
  EXPECT_THAT(trace_.events(), ElementsAre("async", "sync", "blocking"));
}

TEST_F(LUMLogMultiplexerTest, CallsBlockingLoggersOneAfterAnother) {
  std::vector<Ref<Queue>> queues;
  for (int i = 0; i < 4; ++i) {
    queues.push_back(rt::make<Queue>("blocking"_s));
    const auto logger = rt::make<TestAsyncLogger>(queues.back(), [this](const Ref<LUMLogMessage>&) {
      trace_.add("begins");
      std::this_thread::yield();
      trace_.add("ends");
    });
    logger->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
    multiplexer_->addAsyncLogger(logger);
  }
  log();
  EXPECT_THAT(trace_.events(),
              ElementsAre("begins", "ends", "begins", "ends", "begins", "ends", "begins", "ends"));
}

TEST_F(LUMLogMultiplexerTest, WaitsForNoQueueWithoutABlockingLogger) {
  multiplexer_->addAsyncLogger(async("async"));
  std::latch mayFanOut(1);
  std::latch mayLog(1);
  multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
  queue_->async([&] { mayLog.wait(); });
  log();
  EXPECT_THAT(trace_.events(), IsEmpty());
  mayFanOut.count_down();
  multiplexer_->waitForLogging();  // This does not wait for the logger's queue either.
  EXPECT_THAT(trace_.events(), IsEmpty());
  mayLog.count_down();
  queue_->barrierSync();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
}

TEST_F(LUMLogMultiplexerTest, WaitForLoggingReturnsWhenMessagesAreOnTheLoggersQueues) {
  std::latch isWaiting(1);
  const auto logger = async("async");
  logger->operationQueue_ = [&] {
    trace_.add("fanned out");
    return queue_;
  };
  multiplexer_->addAsyncLogger(logger);
  multiplexer_->loggingQueue()->async([&] {
    isWaiting.wait();
    for (int i = 0; i < 1000; ++i) std::this_thread::yield();
  });
  std::latch mayLog(1);
  queue_->async([&] { mayLog.wait(); });
  log();
  log();
  isWaiting.count_down();
  multiplexer_->waitForLogging();
  EXPECT_THAT(trace_.events(), ElementsAre("fanned out", "fanned out"));
  mayLog.count_down();
  queue_->barrierSync();
  EXPECT_THAT(trace_.events(), ElementsAre("async", "async"));
}

TEST_F(LUMLogMultiplexerTest, WaitForLoggingReturnsIfNothingWasLogged) {
  multiplexer_->waitForLogging();
  log();
  multiplexer_->waitForLogging();
}

}  // namespace
