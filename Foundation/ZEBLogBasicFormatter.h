#pragma once

/// The formatter that adds nothing: a line is the message. What a logger has that was given none.
///
///     logger->setFormatter(rt::make<ZEBLogBasicFormatter>());
///
/// Any thread may use it.

#include "Foundation/ZEBLogFormatter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogBasicFormatter
    : public rt::Implements<ZEBLogBasicFormatter, rt::Object, ZEBLogFormatter> {
 public:
  ZEBLogBasicFormatter() = default;

  /// The format with its arguments, as `rt::formatV` makes it; null where either is null. Throws what a
  /// description of an argument throws.
  rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                           ZEBLogLevel level) override;

  /// `func` as lines show it: "(unknown)" where it is null or nothing but white space; "main()" for "main";
  /// as it is, without the white space around it, where it begins with "-[" or "+[" or ends with ")".
  virtual rt::String prettyNameForFunc(const rt::String& func);
};
