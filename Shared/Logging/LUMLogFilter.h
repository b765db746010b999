#pragma once

/// What decides which messages go somewhere: to all loggers, where it is one of the multiplexer's, or to the
/// logger that has it.
///
///     class OfficeHours : public rt::Implements<OfficeHours, rt::Object, LUMLogFilter> {
///      public:
///       bool allowLogMessage(const LUMLogMessage& message) const override;
///     };
///
/// Called on any thread, on several at once, and for one message possibly more than once.
///
/// Not for: changing messages, which nobody can.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Shared/Logging/LUMLogMessage.h"

struct RT_VISIBLE LUMLogFilter : rt::Protocol<LUMLogFilter> {
  /// Whether `message` may pass.
  virtual bool allowLogMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMLogFilter() = default;
};
