#pragma once

/// The formatter of standard loggers. A line has the time, the process and thread, the level, the function
/// and the message.
///
///     logger->setFormatter(ZEBLogStandardFormatter::init());
///     logger->logFuncError("main", "%d left", 3);
///
///     | 2026-11-21 08:04:20.123 importer[4711/0x7f3a5c0e2740] [lvl=3] main() 3 left
///
/// The time is local time, and the thread is given by its handle. The process is the one that made the
/// formatter, even in the child of a fork.
///
/// Threads: thread-safe.

#include <cstdint>

#include "Foundation/ZEBLogBasicFormatter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"

namespace rt {
class LocalTimeFormatter;
}

class RT_VISIBLE ZEBLogStandardFormatter
    : public rt::Implements<ZEBLogStandardFormatter, ZEBLogBasicFormatter> {
 public:
  /// Makes a formatter for this process. Returns null if the process's name or a date formatter is not
  /// available.
  static rt::Ref<ZEBLogStandardFormatter> init();
  ~ZEBLogStandardFormatter() override;

  /// Returns the line; never null. "(null)" stands for the message if the format or `valist` is null. Throws
  /// what the description of an argument throws.
  rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                           ZEBLogLevel level) override;

 protected:
  /// Precondition: none of the references is null.
  ZEBLogStandardFormatter(rt::Ref<rt::LocalTimeFormatter> dateFormatter, rt::String processName,
                          std::int32_t processIdentifier) noexcept;

 private:
  const rt::Ref<rt::LocalTimeFormatter> dateFormatter_;
  const rt::String processName_;
  const std::int32_t processIdentifier_;
};
