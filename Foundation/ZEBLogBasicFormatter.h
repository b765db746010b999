#pragma once

/// A formatter whose line is the message alone. It is the default of a logger.
///
///     logger->setFormatter(rt::make<ZEBLogBasicFormatter>());
///
/// Threads: thread-safe.

#include "Foundation/ZEBLogFormatter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogBasicFormatter
    : public rt::Implements<ZEBLogBasicFormatter, rt::Object, ZEBLogFormatter> {
 public:
  ZEBLogBasicFormatter() = default;

  /// Returns the format with its arguments, as `rt::formatV` does. Null if the format or `valist` is null.
  /// Throws what the description of an argument throws.
  rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                           ZEBLogLevel level) override;

  /// Returns `func` as lines show it, without the white space around it. "main" becomes "main()". Text that
  /// begins with "-[" or "+[", or ends with ")", stays as it is. Null or blank text becomes "(unknown)".
  virtual rt::String prettyNameForFunc(const rt::String& func);
};
