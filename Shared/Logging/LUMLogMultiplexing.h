#pragma once

/// Takes messages and passes them on to filters and loggers, which may be added and removed.
/// LUMLogMultiplexer implements it.
///
///     void Host::attach(LUMLogMultiplexing& multiplexer) { multiplexer.addSyncLogger(terminal_); }
///
/// Not for: logging a message. Call LUMLogAt (LUMLog.h).

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMSyncLogger.h"

struct RT_VISIBLE LUMLogMultiplexing : rt::Protocol<LUMLogMultiplexing> {
  /// Passes `message` on. Ignores null.
  ///
  /// Errors: throws what filters, also those of loggers, and synchronous loggers throw. Throws what an
  /// asynchronous logger throws in `dispatchModeForMessage`. For a message that it wants at once, throws also
  /// what it throws in `operationQueue` and `logWithMessage`.
  virtual void logWithMessage(const rt::Ref<LUMLogMessage>& message) = 0;

  /// Adds or removes a filter that every message must pass. Ignores null, a filter to add that is already
  /// present, and a filter to remove that is not present. All functions below do the same for loggers.
  virtual void addLogFilter(const rt::Ref<LUMLogFilter>& filter) = 0;
  virtual void removeLogFilter(const rt::Ref<LUMLogFilter>& filter) = 0;

  /// Adds or removes a logger. A message that is being logged meanwhile goes to the loggers present at its
  /// start.
  virtual void addSyncLogger(const rt::Ref<LUMSyncLogger>& logger) = 0;
  virtual void removeSyncLogger(const rt::Ref<LUMSyncLogger>& logger) = 0;
  virtual void addAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) = 0;
  virtual void removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) = 0;

 protected:
  ~LUMLogMultiplexing() = default;
};
