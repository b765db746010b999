#pragma once

/// A logger that is called on a queue of its own, later.
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
/// Messages of one thread that come later are in the order in which they were logged, given that the logger
/// keeps to one queue. One that is wanted at once may overtake those that still wait.
///
/// What a logger throws when it is called later has no caller to go to, whether `logWithMessage`, its filter
/// or `operationQueue` throws it: it leaves a task of a queue, and unless rt::Queue's
/// `setUncaughtExceptionHandler` says otherwise, the program ends with a line that names the queue. What is
/// thrown while the caller waits, `LUMLog` throws: by the filter and `dispatchModeForMessage`, which every
/// message asks first, and by a logger that wants the message at once.
///
/// Not for: what must see a message before the caller goes on, as a rule; see LUMSyncLogger.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogger.h"

namespace rt {
class Queue;
}

/// How a LUMAsyncLogger wants to be called.
using LUMLogDispatchMode = std::uint32_t;

/// Before `LUMLog` returns. Any other value: later.
inline constexpr LUMLogDispatchMode LUMLogDispatchModeSynchronous = 2;

struct RT_VISIBLE LUMAsyncLogger : rt::Protocol<LUMAsyncLogger, LUMLogger> {
  /// The queue to be called on; without one the logger receives nothing. Asked on the multiplexer's queue,
  /// or on the thread that logs where the logger wants the message at once.
  virtual rt::Ref<rt::Queue> operationQueue() const = 0;

  /// How to be called with `message`; asked on the thread that logs. Must not be
  /// LUMLogDispatchModeSynchronous for what is logged on the logger's own queue, which would wait for
  /// itself, nor where a task of that queue may wait for a lock that a thread holds while it logs, as a
  /// service registry does.
  virtual LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMAsyncLogger() = default;
};
