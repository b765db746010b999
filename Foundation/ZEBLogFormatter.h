#pragma once

/// Turns a format and its arguments into one line of a logger.
///
///     class Shouting final : public rt::Implements<Shouting, ZEBLogBasicFormatter> {
///      public:
///       rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
///                                ZEBLogLevel level) override {
///         return ZEBLogBasicFormatter::stringForFunc(func, withFormat, valist, level).uppercased();
///       }
///     };
///
/// Not for: writing lines, or deciding which lines are written.

#include <cstdarg>

#include "Foundation/ZEBLogLevel.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE ZEBLogFormatter : rt::Protocol<ZEBLogFormatter> {
  /// Returns the line, without a line feed, for the format `withFormat` and the arguments `valist`. If it
  /// returns null, nothing is logged. Does not advance `valist`. `func` is the name of the function that
  /// logs, or null.
  /// Threads: any thread that logs may call it, also several at once.
  /// Errors: if it throws, the logger drops the exception and the line.
  virtual rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                                   ZEBLogLevel level) = 0;

 protected:
  ~ZEBLogFormatter() = default;
};
