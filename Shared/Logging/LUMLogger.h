#pragma once

/// Where messages go. A logger is either a LUMSyncLogger, called by whoever logs, or a LUMAsyncLogger,
/// called on a queue of its own.
///
///     bool wants(const LUMLogger& logger, const LUMLogMessage& message) {
///       const rt::Ref<LUMLogFilter> filter = logger.filter();
///       return !filter || filter->allowLogMessage(message);
///     }
///
/// Not for: classes to conform to directly; name one of the two.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogMessage.h"

struct RT_VISIBLE LUMLogger : rt::Protocol<LUMLogger> {
  /// Takes `message`, which is not null. No lock is held: it may log, and add and remove loggers.
  virtual void logWithMessage(const rt::Ref<LUMLogMessage>& message) = 0;

  /// What decides which messages the logger takes; null for all. Asked at every message, on any thread.
  virtual rt::Ref<LUMLogFilter> filter() const = 0;

 protected:
  ~LUMLogger() = default;
};
