#pragma once

/// What makes a line of a message, for a logger that writes lines.
///
///     rt::String Terse::formattedLogMessage(const LUMLogMessage& message) const {
///       return message.formattedString();
///     }
///
/// Called on any thread, on several at once.
///
/// Not for: leaving messages out, which takes a LUMLogFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogMessage.h"

struct RT_VISIBLE LUMLogFormatter : rt::Protocol<LUMLogFormatter> {
  /// The text for `message`; may be null.
  virtual rt::String formattedLogMessage(const LUMLogMessage& message) const = 0;

 protected:
  ~LUMLogFormatter() = default;
};
