#pragma once

/// Formats an entry of the system's log as "function: text", or as the text alone if the function is unknown.
///
///     LUMSystemLoggerFormatter::init()->formattedLogMessage(*message);        // "int main(): started"
///
/// Not for: lines in files, which also need the time.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFormatter.h"

class RT_VISIBLE LUMSystemLoggerFormatter
    : public rt::Implements<LUMSystemLoggerFormatter, rt::Object, LUMLogFormatter> {
 public:
  static rt::Ref<LUMSystemLoggerFormatter> init() { return rt::make<LUMSystemLoggerFormatter>(); }

  rt::String formattedLogMessage(const LUMLogMessage& message) const override;
};
