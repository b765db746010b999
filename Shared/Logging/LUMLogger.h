#pragma once

/// A destination of messages. A logger is either a LUMSyncLogger, which runs on the thread that logs, or a
/// LUMAsyncLogger, which runs on its own queue.
///
///     bool wants(const LUMLogger& logger, const LUMLogMessage& message) {
///       const rt::Ref<LUMLogFilter> filter = logger.filter();
///       return !filter || filter->allowLogMessage(message);
///     }
///
/// Not for: conforming directly. Conform to LUMSyncLogger or LUMAsyncLogger.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogMessage.h"

struct RT_VISIBLE LUMLogger : rt::Protocol<LUMLogger> {
  /// Logs `message`, which is not null. Runs without a lock held, so it may log, and add and remove loggers.
  virtual void logWithMessage(const rt::Ref<LUMLogMessage>& message) = 0;

  /// Returns the filter that decides which messages the logger takes; null means all. Called for every
  /// message, on any thread.
  virtual rt::Ref<LUMLogFilter> filter() const = 0;

 protected:
  ~LUMLogger() = default;
};
