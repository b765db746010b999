// Tests the multiplexer with many threads, while filters and loggers are added and removed.
//
// Invariants: a logger that is always present gets every message once, and those of one thread in the order
// in which it logged them. A logger that is present at times gets some of them, also once each and in order.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;

constexpr std::size_t kThreads = 8;

// Makes a message that identifies its thread and its index. The index stands in the line.
Ref<LUMLogMessage> numbered(LUMLogLevel level, std::size_t thread, std::uint64_t index) {
  return LUMLogMessage::initWithLevel(level, "numbered"_s, "numbered"_s,
                                      rt::String::fromUTF8(std::to_string(thread)), nullptr, index, nullptr,
                                      nullptr, nullptr, nullptr, nullptr);
}

std::size_t threadOf(const LUMLogMessage& message) {
  return static_cast<std::size_t>(message.file().integerValue());
}

// The indices of the received messages, for each thread that logged. Not thread-safe.
class Received {
 public:
  void add(const LUMLogMessage& message) { indices_.at(threadOf(message)).push_back(message.line()); }

  std::size_t count() const {
    std::size_t sum = 0;
    for (const std::vector<std::uint64_t>& indices : indices_) sum += indices.size();
    return sum;
  }
  void expectAll(std::uint64_t count) const {
    for (const std::vector<std::uint64_t>& indices : indices_) {
      ASSERT_EQ(indices.size(), count);
      for (std::uint64_t i = 0; i < count; ++i) ASSERT_EQ(indices.at(i), i);
    }
  }
  void expectSomeInOrder() const {
    for (const std::vector<std::uint64_t>& indices : indices_) {
      for (std::size_t i = 1; i < indices.size(); ++i) ASSERT_LT(indices.at(i - 1), indices.at(i));
    }
  }

 private:
  std::array<std::vector<std::uint64_t>, kThreads> indices_;
};

// Runs `body(thread)` in kThreads threads. Meanwhile repeats `other()` in one more thread.
template <class Body, class Other>
void inThreads(Body body, Other other) {
  std::atomic<bool> isDone = false;
  std::thread otherThread([&] {
    do {
      other();
    } while (!isDone);
  });
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (std::size_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&body, thread] { body(thread); });
  }
  for (std::thread& thread : threads) thread.join();
  isDone = true;
  otherThread.join();
}

class LUMLogMultiplexerThreadsTest : public testing::Test {
 protected:
  static constexpr std::uint64_t kMessages = 2000;

  void drain() {
    multiplexer_->waitForLogging();
    queue_->barrierSync();
  }

  const Ref<LUMLogMultiplexer> multiplexer_ = LUMLogMultiplexer::initWithSystemLogger(nullptr);
  const Ref<Queue> queue_ = rt::make<Queue>("logger"_s);
};

TEST_F(LUMLogMultiplexerThreadsTest, LosesNoMessageWhileFiltersAndLoggersChange) {
  std::mutex mutex;
  Received bySync;
  Received byAsync;  // Used by tasks of the queue only.
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    const std::scoped_lock guard(mutex);
    bySync.add(*message);
  }));
  multiplexer_->addAsyncLogger(
      rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) { byAsync.add(*message); }));

  std::mutex passingMutex;
  Received byPassingSync;
  Received byPassingAsync;
  const auto passingQueue = rt::make<Queue>("passing"_s);
  const auto passing = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelInfo);
  std::uint64_t round = 0;
  inThreads(
      [&](std::size_t thread) {
        for (std::uint64_t i = 0; i < kMessages; ++i) {
          multiplexer_->logWithMessage(numbered(LUMLogLevelInfo, thread, i));
          // Each thread adds and removes something now and then.
          if (i % 16 != 0) continue;
          const Ref<LUMLogFilter> own = LUMLogNoFilter::init();
          multiplexer_->addLogFilter(own);
          multiplexer_->removeLogFilter(own);
        }
      },
      [&] {
        const auto syncLogger = rt::make<TestSyncLogger>(
            [&](const Ref<LUMLogMessage>& message) {
              const std::scoped_lock guard(passingMutex);
              byPassingSync.add(*message);
            },
            passing);
        const auto asyncLogger = rt::make<TestAsyncLogger>(
            passingQueue, [&](const Ref<LUMLogMessage>& message) { byPassingAsync.add(*message); });
        asyncLogger->filter_ = passing;
        const Ref<LUMLogFilter> filter = LUMLogMinimumLevelFilter::initWithMinimumLevel(round % 2);
        multiplexer_->addSyncLogger(syncLogger);
        multiplexer_->addAsyncLogger(asyncLogger);
        multiplexer_->addLogFilter(filter);
        multiplexer_->waitForLogging();
        multiplexer_->removeAsyncLogger(asyncLogger);
        multiplexer_->removeLogFilter(filter);
        multiplexer_->removeSyncLogger(syncLogger);
        ++round;
      });
  drain();
  passingQueue->barrierSync();
  bySync.expectAll(kMessages);
  byAsync.expectAll(kMessages);
  byPassingSync.expectSomeInOrder();
  byPassingAsync.expectSomeInOrder();
}

// One logger logs another message for every tenth that it gets.
TEST_F(LUMLogMultiplexerThreadsTest, LosesNoMessageThatLoggersLog) {
  std::atomic<std::uint64_t> bySync = 0;
  std::uint64_t byAsync = 0;  // Used by tasks of the queue only.
  std::uint64_t byAsyncFromWithin = 0;
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    ++bySync;
    if (message->level() == LUMLogLevelInfo && message->line() % 10 == 0) {
      multiplexer_->logWithMessage(messageWith(LUMLogLevelDebug, "from within"_s));
    }
  }));
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) {
    if (message->level() == LUMLogLevelDebug) {
      ++byAsyncFromWithin;
      return;
    }
    ++byAsync;
    if (message->level() == LUMLogLevelInfo && message->line() % 10 == 5) {
      multiplexer_->logWithMessage(messageWith(LUMLogLevelError, "from within a queue"_s));
    }
  }));
  inThreads(
      [&](std::size_t thread) {
        for (std::uint64_t i = 0; i < kMessages; ++i) {
          multiplexer_->logWithMessage(numbered(LUMLogLevelInfo, thread, i));
        }
      },
      [&] {
        const auto logger = rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) {});
        multiplexer_->addSyncLogger(logger);
        multiplexer_->removeSyncLogger(logger);
      });
  drain();
  drain();  // Delivers what the queue's tasks have logged.
  constexpr std::uint64_t kTenths = kThreads * kMessages / 10;
  EXPECT_EQ(bySync, kThreads * kMessages + 2 * kTenths);
  EXPECT_EQ(byAsync, kThreads * kMessages + kTenths);
  EXPECT_EQ(byAsyncFromWithin, kTenths);
}

// A logger that wants every seventh message at once gets each message once. Deferred messages are in order.
// Urgent ones are in order too, and have arrived when the call returns.
TEST_F(LUMLogMultiplexerThreadsTest, GivesABlockingLoggerEachMessageOnce) {
  constexpr auto isUrgent = [](const LUMLogMessage& message) { return message.line() % 7 == 0; };
  Received later;
  Received atOnce;
  std::array<std::atomic<std::uint64_t>, kThreads> lastAtOnce{};
  const auto logger = rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) {
    if (!isUrgent(*message)) {
      later.add(*message);
      return;
    }
    atOnce.add(*message);
    lastAtOnce.at(threadOf(*message)) = message->line();
  });
  logger->dispatchMode_ = [=](const LUMLogMessage& message) {
    return isUrgent(message) ? LUMLogDispatchModeSynchronous : LUMLogDispatchMode{0};
  };
  multiplexer_->addAsyncLogger(logger);
  std::atomic<std::uint64_t> missing = 0;
  inThreads(
      [&](std::size_t thread) {
        for (std::uint64_t i = 0; i < kMessages; ++i) {
          const Ref<LUMLogMessage> message = numbered(LUMLogLevelInfo, thread, i);
          multiplexer_->logWithMessage(message);
          if (isUrgent(*message) && lastAtOnce.at(thread) != i) ++missing;
        }
      },
      [&] { multiplexer_->waitForLogging(); });
  drain();
  EXPECT_EQ(missing, 0U);
  later.expectSomeInOrder();
  atOnce.expectSomeInOrder();
  std::uint64_t urgent = 0;
  for (std::uint64_t i = 0; i < kMessages; ++i) urgent += i % 7 == 0 ? 1 : 0;
  EXPECT_EQ(atOnce.count(), kThreads * urgent);
  EXPECT_EQ(later.count(), kThreads * (kMessages - urgent));
}

// Changes that threads make at once are all kept.
TEST_F(LUMLogMultiplexerThreadsTest, KeepsConcurrentChanges) {
  constexpr std::uint64_t kEach = 50;
  std::atomic<std::uint64_t> asked = 0;
  std::atomic<std::uint64_t> heard = 0;
  std::atomic<std::uint64_t> heardLater = 0;
  const auto logger = [&] { return rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) { ++heard; }); };
  inThreads(
      [&](std::size_t) {
        for (std::uint64_t i = 0; i < kEach; ++i) {
          multiplexer_->addLogFilter(rt::make<TestFilter>([&](const LUMLogMessage&) {
            ++asked;
            return true;
          }));
          multiplexer_->addSyncLogger(logger());
          const auto passing = logger();
          multiplexer_->addSyncLogger(passing);
          multiplexer_->addAsyncLogger(
              rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>&) { ++heardLater; }));
          multiplexer_->removeSyncLogger(passing);
        }
      },
      [] { std::this_thread::yield(); });
  multiplexer_->logWithMessage(messageWith(LUMLogLevelInfo));
  drain();
  EXPECT_EQ(asked, kThreads * kEach);
  EXPECT_EQ(heard, kThreads * kEach);
  EXPECT_EQ(heardLater, kThreads * kEach);
}

// One logger throws, one removes and adds itself, one logs a fault, and one waits. A logger that is always
// present misses no message that was logged before the exception.
TEST_F(LUMLogMultiplexerThreadsTest, KeepsItsPromisesAmongHostileLoggers) {
  struct Thrown {};
  std::uint64_t byAsync = 0;  // Used by tasks of the queue only.
  std::atomic<std::uint64_t> thrown = 0;
  multiplexer_->addAsyncLogger(rt::make<TestAsyncLogger>(queue_, [&](const Ref<LUMLogMessage>& message) {
    if (message->level() == LUMLogLevelInfo) ++byAsync;
  }));
  Ref<LUMSyncLogger> leaving;
  leaving = rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) {
    multiplexer_->removeSyncLogger(leaving);
    multiplexer_->addSyncLogger(leaving);
  });
  multiplexer_->addSyncLogger(leaving);
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    if (message->level() == LUMLogLevelInfo && message->line() % 8 == 1) {
      multiplexer_->logWithMessage(messageWith(LUMLogLevelFault, "from within"_s));
    }
  }));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    if (message->line() % 8 == 2) throw Thrown();
  }));
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    if (message->line() % 8 == 3) queue_->barrierSync();
  }));
  inThreads(
      [&](std::size_t thread) {
        for (std::uint64_t i = 0; i < kMessages; ++i) {
          try {
            multiplexer_->logWithMessage(numbered(LUMLogLevelInfo, thread, i));
          } catch (const Thrown&) {
            ++thrown;
          }
        }
      },
      [&] {
        const auto logger = rt::make<TestAsyncLogger>(queue_, [](const Ref<LUMLogMessage>&) {});
        multiplexer_->addAsyncLogger(logger);
        multiplexer_->removeAsyncLogger(logger);
      });
  drain();
  EXPECT_EQ(byAsync, kThreads * kMessages);
  EXPECT_EQ(thrown, kThreads * kMessages / 8);
}

// Invariant: the child of a fork can log and add loggers at once, whatever the other threads were doing.
TEST_F(LUMLogMultiplexerThreadsTest, IsUsableInTheChildOfAFork) {
  constexpr int kForks = 200;
  constexpr unsigned kPatienceInSeconds = 30;
  std::atomic<std::uint64_t> heard = 0;
  multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) { ++heard; }));
  const Ref<LUMLogMessage> message = messageWith(LUMLogLevelInfo);
  std::atomic<bool> isEnding = false;
  std::vector<std::thread> threads;
  threads.reserve(3);
  for (int i = 0; i < 2; ++i) {
    threads.emplace_back([&] {
      while (!isEnding) multiplexer_->logWithMessage(message);
    });
  }
  threads.emplace_back([&] {
    const Ref<LUMLogFilter> filter = LUMLogNoFilter::init();
    while (!isEnding) {
      multiplexer_->addLogFilter(filter);
      multiplexer_->removeLogFilter(filter);
    }
  });
  int status = 0;
  for (int i = 0; i < kForks && status == 0; ++i) {
    const pid_t child = fork();
    if (child == 0) {
      alarm(kPatienceInSeconds);  // Ends a child that waits for a thread that it does not have.
      const std::uint64_t heardBefore = heard;
      multiplexer_->logWithMessage(message);
      multiplexer_->addSyncLogger(rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>&) { ++heard; }));
      multiplexer_->logWithMessage(message);
      _exit(heard == heardBefore + 3 ? 0 : 1);
    }
    if (waitpid(child, &status, 0) != child) status = -1;
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(status, 0);
}

}  // namespace
