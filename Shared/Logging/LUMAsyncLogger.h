#pragma once

/// A logger that the multiplexer calls on the logger's own queue.
///
///     class FileLogger : public rt::Implements<FileLogger, rt::Object, LUMAsyncLogger> {
///      public:
///       void logWithMessage(const rt::Ref<LUMLogMessage>& message) override;      // on queue_
///       rt::Ref<LUMLogFilter> filter() const override { return filter_; }
///       rt::Ref<rt::Queue> operationQueue() const override { return queue_; }
///       LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const override {
///         return message.level() == LUMLogLevelFault ? LUMLogDispatchModeSynchronous : 0;
///       }
///     };
///
/// Order: deferred messages of one thread arrive in the order in which they were logged, provided that the
/// logger always returns the same queue. A message that the logger wants at once may overtake deferred ones.
///
/// Errors: a deferred call has no caller to throw to. An exception from `logWithMessage`, from the filter or
/// from `operationQueue` then leaves a task of a queue. It ends the program with a line that names the queue,
/// unless rt::Queue's `setUncaughtExceptionHandler` has installed a handler. `LUMLog` throws what is thrown
/// while its caller waits. The filter and `dispatchModeForMessage` are asked about every message in that
/// time. A logger that wants a message at once also runs in that time.
///
/// Not for: loggers that usually must finish before the caller goes on; see LUMSyncLogger.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMLogger.h"

/// States how to call a LUMAsyncLogger with a message.
using LUMLogDispatchMode = std::uint32_t;

/// Call the logger before `LUMLog` returns. Any other value: call it later.
inline constexpr LUMLogDispatchMode LUMLogDispatchModeSynchronous = 2;

struct RT_VISIBLE LUMAsyncLogger : rt::Protocol<LUMAsyncLogger, LUMLogger> {
  /// Returns the queue to call the logger on. A logger whose queue is null receives nothing. The call comes
  /// from the multiplexer's queue, or from the logging thread if the logger wants the message at once.
  virtual rt::Ref<rt::Queue> operationQueue() const = 0;

  /// Returns how to call the logger with `message`. The call comes from the logging thread.
  ///
  /// Must not return LUMLogDispatchModeSynchronous for a message logged on the logger's own queue: that
  /// deadlocks. The same holds where a task of that queue may wait for a lock that a thread holds while it
  /// logs. A service registry logs with its lock held.
  virtual LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMAsyncLogger() = default;
};
