#pragma once

/// Decides which messages pass. A filter of the multiplexer decides for all loggers, a logger's filter for
/// that logger.
///
///     class OfficeHours : public rt::Implements<OfficeHours, rt::Object, LUMLogFilter> {
///      public:
///       bool allowLogMessage(const LUMLogMessage& message) const override;
///     };
///
/// Threads: called on any thread, also on several at once. May be called more than once for one message.
///
/// Not for: changing messages, which are immutable.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Shared/Logging/LUMLogMessage.h"

struct RT_VISIBLE LUMLogFilter : rt::Protocol<LUMLogFilter> {
  /// Returns whether `message` may pass.
  virtual bool allowLogMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMLogFilter() = default;
};
