#pragma once

/// What turns a format and its arguments into one line of a logger.
///
///     class Shouting final : public rt::Implements<Shouting, ZEBLogBasicFormatter> {
///      public:
///       rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
///                                ZEBLogLevel level) override {
///         return ZEBLogBasicFormatter::stringForFunc(func, withFormat, valist, level).uppercased();
///       }
///     };
///
/// Not for: writing lines, or deciding which are written.

#include <cstdarg>

#include "Foundation/ZEBLogLevel.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE ZEBLogFormatter : rt::Protocol<ZEBLogFormatter> {
  /// The line, without an end, for the format `withFormat` with the arguments of `valist`, which is left
  /// where it is; null for none, and then nothing is logged. `func` is the name of the function that logs,
  /// or null. Called by any thread that logs, by several at once. What it throws the logger drops, with the
  /// line.
  virtual rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                                   ZEBLogLevel level) = 0;

 protected:
  ~ZEBLogFormatter() = default;
};
