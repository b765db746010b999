#pragma once

/// What takes messages and passes them on to filters and loggers that come and go: see LUMLogMultiplexer.
///
///     void Host::attach(LUMLogMultiplexing& multiplexer) { multiplexer.addSyncLogger(terminal_); }
///
/// Not for: whoever logs, who calls LUMLogAt (LUMLog.h).

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSyncLogger.h"

struct RT_VISIBLE LUMLogMultiplexing : rt::Protocol<LUMLogMultiplexing> {
  /// Passes `message` on; null is ignored. Throws what is thrown on the way: by a filter, also one that a
  /// logger has, by a synchronous logger, by an asynchronous one that is asked how it wants to be called, and
  /// by one that wants `message` at once or is asked for its queue then.
  virtual void logWithMessage(const rt::Ref<LUMLogMessage>& message) = 0;

  /// Adds or removes one that all messages must pass. Null is ignored, and so is adding what is there and
  /// removing what is not; the same goes for loggers.
  virtual void addLogFilter(const rt::Ref<LUMLogFilter>& filter) = 0;
  virtual void removeLogFilter(const rt::Ref<LUMLogFilter>& filter) = 0;

  /// Adds or removes a logger. What is being logged meanwhile goes to those that were there when it began.
  virtual void addSyncLogger(const rt::Ref<LUMSyncLogger>& logger) = 0;
  virtual void removeSyncLogger(const rt::Ref<LUMSyncLogger>& logger) = 0;
  virtual void addAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) = 0;
  virtual void removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) = 0;

 protected:
  ~LUMLogMultiplexing() = default;
};
