#pragma once

/// An object that takes messages and passes them through filters to loggers, like LUMLogMultiplexer. Filters
/// and loggers may be added and removed.
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
  /// Errors: throws what filters throw, including those of loggers, and what synchronous loggers throw.
  /// Throws what an asynchronous logger throws in `dispatchModeForMessage`. If that logger wants the message
  /// at once, also throws what it throws in `operationQueue` and `logWithMessage`.
  virtual void logWithMessage(const rt::Ref<LUMLogMessage>& message) = 0;

  /// Adds or removes a filter that every message must pass. Does nothing for null, when adding a filter that
  /// is present, or when removing one that is not. Equal objects count as the same. The functions for loggers
  /// do the same.
  virtual void addLogFilter(const rt::Ref<LUMLogFilter>& filter) = 0;
  virtual void removeLogFilter(const rt::Ref<LUMLogFilter>& filter) = 0;

  /// Adds or removes a logger. A message that is just being logged still goes to the loggers that were
  /// present at its start.
  virtual void addSyncLogger(const rt::Ref<LUMSyncLogger>& logger) = 0;
  virtual void removeSyncLogger(const rt::Ref<LUMSyncLogger>& logger) = 0;
  virtual void addAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) = 0;
  virtual void removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& logger) = 0;

 protected:
  ~LUMLogMultiplexing() = default;
};
