#pragma once

/// Keeps the last messages of all levels in memory. When an error comes, it hands them on to a logger: first
/// the kept messages in order, then the error. So a log is short, and yet shows what led to an error.
///
///     const auto file =
///     LUMBoundedLogger::initWithLogger(LUMFileLogger::initWithPath("/var/log/host.log"_s));
///     LUMLogMultiplexer::sharedInstance()->addSyncLogger(LUMRingLogger::initWithLogger(file));
///
/// It wants the messages of all levels. So LUMLogAt makes all messages, also those that no other logger
/// wants.
///
/// A message is handed on once. The target's filter is asked then. The oldest message goes when the ring is
/// full, and is not counted as lost. Two threads may hand on at the same time. Their messages may then
/// mix, but those that one of them hands on stay in order.
///
/// Errors: if the target throws, the other messages are still handed on. Then the first exception is thrown.
///
/// Fork: the child has the kept messages, too.
///
/// Crash: LUMLogCrash hands on what is kept.
///
/// Threads: thread-safe. It holds no lock while the target runs.
///
/// Not for: a complete log; see LUMBoundedLogger.

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSyncLogger.h"
#include "Shared/Logging/Loggers/LUMLogOutput.h"
#include "Shared/Logging/Loggers/Private/LUMLogCrashEntry.h"

struct LUMRingLoggerOptions {
  /// How many messages are kept: from 1 to LUMRingLogger::kMaximumCapacity.
  std::size_t capacity = 256;
  /// The lowest level of the messages that are handed on at once, with all that is kept.
  LUMLogLevel handOnLevel = LUMLogLevelError;
};

class RT_VISIBLE LUMRingLogger : public rt::Implements<LUMRingLogger, LUMLogOutput>,
                                 private LUMLogCrashEntry {
 public:
  static constexpr std::size_t kMaximumCapacity = std::size_t{1} << 24;

  /// Makes an empty ring in front of `target`. Throws std::invalid_argument if `target` is null or the
  /// capacity is out of range, and std::bad_alloc.
  static rt::Ref<LUMRingLogger> initWithLogger(const rt::Ref<LUMSyncLogger>& target,
                                               LUMRingLoggerOptions options = {});

  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;

  /// Hands on what is kept, whatever its level. The ring is empty then.
  void handOn();

  /// Returns what is kept, the oldest first. Throws std::bad_alloc.
  std::vector<rt::Ref<LUMLogMessage>> messages() const RT_EXCLUDES(lock_);

  /// Flushes the target if it is a LUMLogOutput. Hands on nothing.
  bool flush(std::uint32_t milliseconds) override;

  /// Hands on what is kept and then `message`, if the target is a LUMLogOutput.
  void logInSignalHandler(const LUMLogMessage& message) noexcept override;

 protected:
  LUMRingLogger(const rt::Ref<LUMSyncLogger>& target, LUMRingLoggerOptions options);
  ~LUMRingLogger() override;

 private:
  class Guard;

  rt::Ref<LUMLogMessage> keep(const rt::Ref<LUMLogMessage>& message) RT_EXCLUDES(lock_);
  std::vector<rt::Ref<LUMLogMessage>> takeAll() RT_EXCLUDES(lock_);
  void handOnWith(const rt::Ref<LUMLogMessage>& last);

  const LUMLogOutput* crashSelf() const noexcept override { return this; }
  LUMLogOutput* crashTarget() const noexcept override { return output_; }
  void writeAfterCrash(Losses& losses) noexcept override;

  const rt::Ref<LUMSyncLogger> target_;
  // The target, if it is one.
  LUMLogOutput* const output_;
  const std::size_t capacity_;
  const LUMLogLevel handOnLevel_;

  mutable rt::UnfairLock lock_;
  // The thread that holds the lock, or 0. A signal handler on that thread finds all places valid.
  mutable std::atomic<std::uint32_t> holder_ = 0;
  // Each place holds a reference, or null. All these are written with the lock held.
  const std::unique_ptr<std::atomic<LUMLogMessage*>[]> places_;
  std::atomic<std::size_t> next_ = 0;
};
