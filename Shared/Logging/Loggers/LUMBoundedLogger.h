#pragma once

/// Makes any logger asynchronous, with a queue of limited length. The thread that logs puts a reference to
/// the message into the queue and goes on. A task writes the messages to the target, in order.
///
///     const rt::Ref<LUMFileLogger> target = LUMFileLogger::initWithPath("/var/log/host.log"_s);
///     const rt::Ref<LUMBoundedLogger> logger = LUMBoundedLogger::initWithLogger(target, {.capacity = 1024});
///     LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger);
///     ...
///     logger->flush(1000);
///
/// Each message that the target's filter lets pass is written, dropped or failed, and counted as such. When a
/// full queue has room again, the target gets an error in place of the dropped messages. Its component is
/// "LUMBoundedLogger", its text "3 messages were dropped: the queue of LUMFileLogger was full". It does not
/// pass the target's filter.
///
/// The target runs on one thread at a time. If it is a LUMAsyncLogger, it runs on its `operationQueue`. A
/// message that such a target wants at once is written before `logWithMessage` returns, and may overtake
/// messages that wait. A thread that already runs a task of that queue puts it into the queue instead.
///
/// Latency: a message waits for a millisecond at most while the task is awake, plus what the target and the
/// system take. The task sleeps in short pauses for about six milliseconds after the last message, and then
/// ends. The next message starts a task, which costs its thread a system call. A task that pauses occupies
/// one of the 64 threads that rt::Queue has for work other than utility work. Its priority is not lowered,
/// since threads may wait for room.
///
/// Blocking: with kBlock, a thread that logs waits for room. It must not hold a lock that the target takes. A
/// thread that writes to a target of any LUMBoundedLogger never waits, and neither does one that runs a task
/// of the target's `operationQueue`: its message is dropped and counted, if the queue is full.
///
/// Errors: a message for which the target throws counts as failed, and so does one for a LUMAsyncLogger
/// without a queue. The program goes on. `logWithMessage` throws what `dispatchModeForMessage` throws, and
/// what the target throws for a message that it wants at once.
///
/// Exit: what waits at exit is written, also what destructors of static objects log (Runtime/Queues/Queue.h).
///
/// Fork: the queue is empty in the child, which may log at once. The child's counts start at 0.
///
/// Crash: see LUMLogCrash.h. The message that was being written at that moment may then be written twice.
///
/// Threads: thread-safe.
///
/// Not for: messages that must be on the disk before the program goes on.

#include <atomic>
#include <cstddef>
#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogger.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"
#include "Shared/Logging/Loggers/Private/LUMLogCrashEntry.h"
#include "Shared/Logging/Loggers/Private/LUMLogMessageQueue.h"

/// What happens to a message when the queue is full.
enum class LUMLogWhenFull : std::uint8_t {
  /// The thread that logs waits for room.
  kBlock,
  /// The oldest messages that wait are dropped.
  kDropOldest,
  /// The new message is dropped.
  kDropNewest,
};

struct LUMBoundedLoggerOptions {
  /// How many messages may wait: from 1 to kMaximumCapacity. Rounded up to a power of two.
  std::size_t capacity = 8192;
  LUMLogWhenFull whenFull = LUMLogWhenFull::kBlock;
};

class RT_VISIBLE LUMBoundedLogger : public rt::Implements<LUMBoundedLogger, LUMLogOutput>,
                                    private LUMLogCrashEntry {
 public:
  static constexpr std::size_t kMaximumCapacity = std::size_t{1} << 24;

  /// Makes a logger that writes to `target`. Throws std::invalid_argument if `target` is null or the capacity
  /// is out of range, and std::bad_alloc.
  static rt::Ref<LUMBoundedLogger> initWithLogger(const rt::Ref<LUMLogger>& target,
                                                  LUMBoundedLoggerOptions options = {});

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  /// Return what the target says.
  rt::Ref<LUMLogFilter> filter() const override { return target_->filter(); }
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;

  /// Waits until what was logged before is written, and then flushes the target if it is a LUMLogOutput.
  /// Returns false when `milliseconds` have passed. Also returns false, at once, on a thread that writes to
  /// the target: it would wait for itself.
  bool flush(std::uint32_t milliseconds) override;

  /// Writes what waits and then `message`, if the target is a LUMLogOutput.
  void logInSignalHandler(const LUMLogMessage& message) noexcept override;

  /// Returns how many messages were dropped because the queue was full.
  std::uint64_t droppedCount() const noexcept { return droppedCount_.load(); }

  /// Returns for how many messages the target has thrown or had no queue.
  std::uint64_t failedCount() const noexcept { return failedCount_.load(); }

  std::size_t capacity() const noexcept { return queue_.capacity(); }

  /// Returns whether the task is there, writing or pausing. The answer may be out of date at once.
  bool isAwake() const noexcept { return state_.load() != kIdle; }

 protected:
  LUMBoundedLogger(const rt::Ref<LUMLogger>& target, LUMBoundedLoggerOptions options);
  ~LUMBoundedLogger() override;

 private:
  class WriterScope;
  // NOLINTNEXTLINE(performance-enum-size): a thread sleeps at a word of 32 bits.
  enum State : std::uint32_t { kIdle, kAwake, kPausing };

  bool push(LUMLogMessage& message) noexcept;
  bool pushOnceThereIsRoom(LUMLogMessage& message);
  bool wouldWaitForItself() const noexcept;
  bool waitForRoom(LUMLogMessage& message);
  void drop(LUMLogMessage& message) noexcept;
  bool isWrittenAtOnce(const rt::Ref<LUMLogMessage>& message);

  void wake();
  void endPause() noexcept;
  bool sleep(std::uint32_t progress, std::uint64_t nanoseconds) noexcept;

  void run(bool mayPause) noexcept;
  bool pauseForMessages() noexcept;
  bool hasWork() const noexcept;
  void writeAll() noexcept;
  bool writeBatch(bool isRefused) noexcept;
  bool writeNext(bool isRefused) noexcept;
  void write(const rt::Ref<LUMLogMessage>& message, bool isRefused) noexcept;
  rt::Ref<LUMLogMessage> reportOf(std::uint64_t count) const;
  void reportDropped(std::uint64_t count, bool isRefused) noexcept;
  void wakeWaiters(bool isMore) noexcept;

  const LUMLogOutput* crashSelf() const noexcept override { return this; }
  LUMLogOutput* crashTarget() const noexcept override { return output_; }
  void writeAfterCrash(Losses& losses) noexcept override;
  void writeInSignalHandler(LUMLogMessage& message, Losses& losses) noexcept;
  void forgetAfterFork() noexcept override;

  const rt::Ref<LUMLogger> target_;
  // The target, if it is one of these.
  LUMAsyncLogger* const asyncTarget_;
  LUMLogOutput* const output_;
  const LUMLogWhenFull whenFull_;
  const std::uint64_t halfMask_;
  const rt::Ref<rt::Queue> taskQueue_;

  LUMLogMessageQueue queue_;
  alignas(64) std::atomic<std::uint32_t> state_ = kIdle;
  // Drops that no message has reported, other than gaps between positions.
  std::atomic<std::uint64_t> unreported_ = 0;
  std::atomic<std::uint64_t> droppedCount_ = 0;
  std::atomic<std::uint64_t> failedCount_ = 0;
  // How many threads sleep at `progress_`, until messages have been written.
  std::atomic<std::uint32_t> waiters_ = 0;

  // Written by the task.
  alignas(64) LUMLogMessageQueue::Claim claim_;
  std::atomic<std::uint32_t> progress_ = 0;
  // All messages before this position are written or dropped, and this many drops are reported.
  std::atomic<std::uint64_t> finished_ = 0;
  std::atomic<std::uint64_t> reportedCount_ = 0;
  // The position behind the last message that the task has taken.
  std::uint64_t expected_ = 0;
  std::uint64_t lastWake_ = 0;
};
