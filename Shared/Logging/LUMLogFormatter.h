#pragma once

/// Turns a message into text, for a logger that writes text.
///
///     rt::String Terse::formattedLogMessage(const LUMLogMessage& message) const {
///       return message.formattedString();
///     }
///
/// Threads: called on any thread, also on several at once.
///
/// Not for: leaving messages out; see LUMLogFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogMessage.h"

struct RT_VISIBLE LUMLogFormatter : rt::Protocol<LUMLogFormatter> {
  /// Returns the text for `message`, or null.
  virtual rt::String formattedLogMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMLogFormatter() = default;
};
