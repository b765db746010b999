// Tests what filters and loggers may do during a delivery: be added and removed, log, wait and throw.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <latch>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "tests/support/LUMLogMultiplexerTest.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

// Snapshots.

TEST_F(LUMLogMultiplexerTest, DeliversToThosePresentWhenTheMessageWasLogged) {
  const auto first = filter("first", true);
  const auto added = sync("added");
  const auto addedAsync = async("added async");
  const auto addedFilter = filter("added filter", true);
  multiplexer_->addLogFilter(rt::make<TestFilter>([&](const LUMLogMessage&) {
    multiplexer_->addSyncLogger(added);
    multiplexer_->addAsyncLogger(addedAsync);
    multiplexer_->addLogFilter(addedFilter);
    return true;
  }));
  EXPECT_THAT(logAndDrain(), IsEmpty());
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("added filter", "added", "added async"));
}

TEST_F(LUMLogMultiplexerTest, DeliversToLoggersRemovedMeanwhile) {
  const auto asyncLogger = async("async");
  const auto blockingLogger = blocking("blocking");
  std::vector<Ref<LUMSyncLogger>> syncLoggers;
  const auto removeAll = [&](const Ref<LUMLogMessage>&) {
    trace_.add("sync");
    for (const Ref<LUMSyncLogger>& logger : syncLoggers) multiplexer_->removeSyncLogger(logger);
    multiplexer_->removeAsyncLogger(asyncLogger);
    multiplexer_->removeAsyncLogger(blockingLogger);
  };
  std::latch mayFanOut(1);
  multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
  multiplexer_->addAsyncLogger(asyncLogger);
  multiplexer_->addAsyncLogger(blockingLogger);
  for (int i = 0; i < 3; ++i) {
    syncLoggers.emplace_back(rt::make<TestSyncLogger>(removeAll));
    multiplexer_->addSyncLogger(syncLoggers.back());
  }
  log();
  EXPECT_THAT(trace_.events(), ElementsAre("sync", "sync", "sync", "blocking"));
  mayFanOut.count_down();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

TEST_F(LUMLogMultiplexerTest, AsksAllFiltersEvenIfTheyRemoveEachOther) {
  std::vector<Ref<LUMLogFilter>> filters;
  filters.reserve(3);
  for (int i = 0; i < 3; ++i) {
    filters.emplace_back(rt::make<TestFilter>([&](const LUMLogMessage&) {
      trace_.add("filter");
      for (const Ref<LUMLogFilter>& other : filters) multiplexer_->removeLogFilter(other);
      return true;
    }));
  }
  for (const Ref<LUMLogFilter>& filter : filters) multiplexer_->addLogFilter(filter);
  EXPECT_THAT(logAndDrain(), ElementsAre("filter", "filter", "filter"));
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

TEST_F(LUMLogMultiplexerTest, RetainsARemovedLoggerUntilItHasTheMessage) {
  rt::Weak<TestAsyncLogger> weak;
  std::latch mayFanOut(1);
  {
    const auto logger = async("async");
    weak = logger;
    multiplexer_->addAsyncLogger(logger);
    multiplexer_->loggingQueue()->async([&] { mayFanOut.wait(); });
    log();
    multiplexer_->removeAsyncLogger(logger);
  }
  mayFanOut.count_down();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
  // The second run of the queues shows that the delivering tasks are gone.
  drain();
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST_F(LUMLogMultiplexerTest, ASyncLoggerMayLog) {
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    trace_.add(text(*message));
    if (text(*message) == "x") log("from within"_s);
    trace_.add("end of " + text(*message));
  }));
  log();
  EXPECT_THAT(trace_.events(), ElementsAre("x", "from within", "end of from within", "end of x"));
}

TEST_F(LUMLogMultiplexerTest, AnAsyncLoggerMayLog) {
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) {
    trace_.add(text(*message));
    if (text(*message) == "x") log("from within"_s);
  }));
  log();
  drain();
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("x", "from within"));
}

// No lock is held while the user's code runs, so another thread can use the multiplexer meanwhile.

TEST_F(LUMLogMultiplexerTest, HoldsNoLockWhileFiltersAndLoggersRun) {
  std::atomic<int> count = 0;
  const auto another = sync("another");
  const auto useMeanwhile = [&] {
    ++count;
    inAnotherThread([&] {
      multiplexer_->addSyncLogger(another);
      multiplexer_->removeSyncLogger(another);
      multiplexer_->addAsyncLogger(nullptr);
    });
  };
  const auto ask = [&](const LUMLogMessage&) {
    useMeanwhile();
    return true;
  };
  const auto hear = [&](const Ref<LUMLogMessage>&) { useMeanwhile(); };
  multiplexer_->addLogFilter(rt::make<TestFilter>(ask));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>(hear, rt::make<TestFilter>(ask)));
  for (const LUMLogDispatchMode mode : {0U, LUMLogDispatchModeSynchronous}) {
    const auto logger = rt::make<TestAsyncLogger>(queue_, hear);
    logger->filter_ = rt::make<TestFilter>(ask);
    logger->dispatchMode_ = [&, mode](const LUMLogMessage&) {
      useMeanwhile();
      return mode;
    };
    logger->operationQueue_ = [&] {
      useMeanwhile();
      return queue_;
    };
    multiplexer_->addAsyncLogger(logger);
    log();
    drain();
    multiplexer_->removeAsyncLogger(logger);
  }
  EXPECT_EQ(count, 2 * (1 + 2 + 5));
}

// Exceptions.

TEST_F(LUMLogMultiplexerTest, ThrowsWhatAFilterThrowsAndDeliversNothing) {
  const auto throwing = rt::make<TestFilter>([](const LUMLogMessage&) -> bool { throw Thrown(); });
  multiplexer_->addLogFilter(throwing);
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
  multiplexer_->removeLogFilter(throwing);
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("sync", "async"));
}

TEST_F(LUMLogMultiplexerTest, ThrowsWhatAnAsyncLoggerThrowsWhenAskedAndDeliversNothing) {
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  const auto throwing = async("throwing");
  throwing->dispatchMode_ = [](const LUMLogMessage&) -> LUMLogDispatchMode { throw Thrown(); };
  multiplexer_->addAsyncLogger(throwing);
  EXPECT_THROW(log(), Thrown);
  throwing->filter_ = rt::make<TestFilter>([](const LUMLogMessage&) -> bool { throw Thrown(); });
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
  multiplexer_->removeAsyncLogger(throwing);
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("sync", "async"));
}

// Messages queued before the exception are delivered. Later steps are not done.
TEST_F(LUMLogMultiplexerTest, ThrowsWhatASyncLoggerThrows) {
  multiplexer_->addAsyncLogger(async("async"));
  multiplexer_->addAsyncLogger(blocking("blocking"));
  const auto throwing = rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) { throw Thrown(); });
  multiplexer_->addSyncLogger(throwing);
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), ElementsAre("async"));
  inAnotherThread([&] { multiplexer_->removeSyncLogger(throwing); });
  multiplexer_->addSyncLogger(sync("sync"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("async", "sync", "blocking"));
}

TEST_F(LUMLogMultiplexerTest, ThrowsWhatABlockingLoggerThrows) {
  multiplexer_->addSyncLogger(sync("sync"));
  multiplexer_->addAsyncLogger(async("async"));
  const auto throwing = rt::make<TestAsyncLogger>(queue_, [](const Ref<LUMLogMessage>&) { throw Thrown(); });
  throwing->dispatchMode_ = [](const LUMLogMessage&) { return LUMLogDispatchModeSynchronous; };
  multiplexer_->addAsyncLogger(throwing);
  EXPECT_THROW(log(), Thrown);
  drain();
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("sync", "async"));
  multiplexer_->removeAsyncLogger(throwing);
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("sync", "async"));
}

// An exception in a later call has no caller to reach.

TEST_F(LUMLogMultiplexerDeathTest, EndsTheProgramIfAnAsyncLoggerThrowsLater) {
  const auto logTo = [&](const Ref<TestAsyncLogger>& logger) {
    multiplexer_->addAsyncLogger(logger);
    log();
    drain();
  };
  const std::string line = "rt: an exception has left a task of the queue ";
  EXPECT_DEATH(logTo(rt::make<TestAsyncLogger>(
                   queue_, [](const Ref<LUMLogMessage>&) { throw std::runtime_error("by the logger"); })),
               line + "\"logger\": by the logger");
  const auto withFilter = async("async", rt::make<TestFilter>([&](const LUMLogMessage&) {
                                  if (queue_->isCurrent()) throw std::runtime_error("by its filter");
                                  return true;
                                }));
  EXPECT_DEATH(logTo(withFilter), line + "\"logger\": by its filter");
  const auto withoutQueue = async("async");
  withoutQueue->operationQueue_ = []() -> Ref<rt::Queue> { throw std::runtime_error("by its queue"); };
  EXPECT_DEATH(logTo(withoutQueue), line + "\"LUMLogMultiplexer\": by its queue");
}

// The labels of the queues in which a task threw.
Trace uncaught;

class LUMLogMultiplexerUncaughtTest : public LUMLogMultiplexerTest {
 protected:
  LUMLogMultiplexerUncaughtTest() {
    rt::Queue::setUncaughtExceptionHandler(
        [](const rt::Queue& queue) { uncaught.add(std::string(queue.label().view())); });
  }
  ~LUMLogMultiplexerUncaughtTest() override { rt::Queue::setUncaughtExceptionHandler(nullptr); }
};

TEST_F(LUMLogMultiplexerUncaughtTest, GoesOnAfterAnAsyncLoggerThrowsLater) {
  bool throws = true;  // Used by tasks of the queue only.
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) {
    if (std::exchange(throws, false)) throw Thrown();
    trace_.add(text(*message));
  }));
  multiplexer_->addAsyncLogger(async("other"));
  EXPECT_NO_THROW(log("thrown at"_s));
  log("next"_s);
  drain();
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("other", "next", "other"));
  EXPECT_THAT(uncaught.events(), ElementsAre("logger"));
}

TEST_F(LUMLogMultiplexerUncaughtTest, GoesOnAfterTheFilterOfAnAsyncLoggerThrowsLater) {
  bool throws = true;  // Used by tasks of the queue only.
  multiplexer_->addAsyncLogger(async("async", rt::make<TestFilter>([&](const LUMLogMessage&) {
                                       if (queue_->isCurrent() && std::exchange(throws, false)) {
                                         throw Thrown();
                                       }
                                       return true;
                                     })));
  EXPECT_NO_THROW(log());
  drain();
  EXPECT_THAT(trace_.events(), IsEmpty());
  EXPECT_THAT(uncaught.events(), ElementsAre("logger"));
  EXPECT_THAT(logAndDrain(), ElementsAre("async"));
  EXPECT_THAT(uncaught.events(), IsEmpty());
}

// The loggers that come after it miss the message. Their order is unspecified.
TEST_F(LUMLogMultiplexerUncaughtTest, GoesOnAfterAnAsyncLoggerThrowsInOperationQueue) {
  Trace asked;
  bool throws = true;  // Used by tasks of the multiplexer's queue only.
  const auto add = [&](const std::string& name, bool isThrowing) {
    const Ref<TestAsyncLogger> logger = async(name);
    logger->operationQueue_ = [&, name, isThrowing] {
      asked.add(name);
      if (isThrowing && std::exchange(throws, false)) throw Thrown();
      return queue_;
    };
    multiplexer_->addAsyncLogger(logger);
  };
  add("other", false);
  add("throwing", true);
  add("another", false);
  EXPECT_NO_THROW(log());
  drain();
  std::vector<std::string> askedUntilThrown = asked.events();
  ASSERT_FALSE(askedUntilThrown.empty());
  EXPECT_EQ(askedUntilThrown.back(), "throwing");
  askedUntilThrown.pop_back();
  EXPECT_EQ(trace_.events(), askedUntilThrown);
  EXPECT_THAT(uncaught.events(), ElementsAre("LUMLogMultiplexer"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("other", "throwing", "another"));
  EXPECT_THAT(uncaught.events(), IsEmpty());
}

// A logger that waits delays only the thread that called it.
TEST_F(LUMLogMultiplexerTest, ALoggerThatWaitsDelaysOnlyItsOwnCaller) {
  std::latch isBlocked(1);
  std::latch mayGoOn(1);
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    if (text(*message) != "block") {
      trace_.add(text(*message));
      return;
    }
    isBlocked.count_down();
    mayGoOn.wait();
    trace_.add("unblocked");
  }));
  multiplexer_->addAsyncLogger(async("async"));
  std::thread blocked([&] { log("block"_s); });
  isBlocked.wait();
  log("b"_s);
  const auto added = sync("added");
  multiplexer_->addSyncLogger(added);
  multiplexer_->removeSyncLogger(added);
  drain();
  EXPECT_THAT(trace_.events(), UnorderedElementsAre("async", "async", "b"));
  mayGoOn.count_down();
  blocked.join();
  EXPECT_THAT(trace_.events(), ElementsAre("unblocked"));
}

TEST_F(LUMLogMultiplexerTest, ALoggerThatRemovesItselfGetsNoMoreMessages) {
  Ref<LUMSyncLogger> leaving;
  leaving = rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) {
    multiplexer_->removeSyncLogger(leaving);
    leaving = nullptr;  // The last reference apart from the delivery's own.
    trace_.add("leaving");
  });
  multiplexer_->addSyncLogger(leaving);
  EXPECT_THAT(logAndDrain(), ElementsAre("leaving"));
  EXPECT_THAT(logAndDrain(), IsEmpty());
}

}  // namespace
