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
/// Errors: `LUMLog` throws what the logger throws while the caller waits. The caller waits for the filter and
/// `dispatchModeForMessage`, which are called for every message. It also waits for all calls for a message
/// that the logger wants at once. The other calls are deferred: `operationQueue`, the filter again and
/// `logWithMessage`. An exception from a deferred call has no caller to reach. It ends the program with a
/// line that names the queue, unless `rt::Queue::setUncaughtExceptionHandler` has set a handler.
///
/// Not for: a logger whose messages usually must be written before the caller goes on; see LUMSyncLogger.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMLogger.h"

/// How a LUMAsyncLogger wants to be called with a message.
using LUMLogDispatchMode = std::uint32_t;

/// Call the logger before `LUMLog` returns. Any other value: call it later.
inline constexpr LUMLogDispatchMode LUMLogDispatchModeSynchronous = 2;

struct RT_VISIBLE LUMAsyncLogger : rt::Protocol<LUMAsyncLogger, LUMLogger> {
  /// Returns the queue to call the logger on. If it is null, the logger receives nothing. Called on the
  /// multiplexer's queue, or on the logging thread if the logger wants the message at once.
  virtual rt::Ref<rt::Queue> operationQueue() const = 0;

  /// Returns how to call the logger with `message`. Called on the logging thread.
  ///
  /// LUMLogDispatchModeSynchronous deadlocks for a message that is logged on the logger's own queue. It also
  /// deadlocks if a task of that queue waits for a lock that the logging thread holds. A service registry,
  /// for example, logs with its lock held.
  virtual LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMAsyncLogger() = default;
};
