#pragma once

/// The formatter of standard loggers: when, which process and thread, what level, where, and the message.
///
///     logger->setFormatter(ZEBLogStandardFormatter::init());
///     logger->logFuncError("main", "%d left", 3);
///
///     | 2026-11-21 08:04:20.123 importer[4711/0x7f3a5c0e2740] [lvl=3] main() 3 left
///
/// The time is the local one; the thread is its handle. The process is
/// the one in which the formatter was made, also in the child of a fork.
///
/// Any thread may use it.

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
  /// A formatter for this process; null where its name or a formatter of dates cannot be had.
  static rt::Ref<ZEBLogStandardFormatter> init();
  ~ZEBLogStandardFormatter() override;

  /// The line, never null: "(null)" stands for a message of which format or arguments are null. Throws what a
  /// description of an argument throws.
  rt::String stringForFunc(const rt::String& func, const rt::String& withFormat, std::va_list valist,
                           ZEBLogLevel level) override;

 protected:
  /// None of the references is null.
  ZEBLogStandardFormatter(rt::Ref<rt::LocalTimeFormatter> dateFormatter, rt::String processName,
                          std::int32_t processIdentifier) noexcept;

 private:
  const rt::Ref<rt::LocalTimeFormatter> dateFormatter_;
  const rt::String processName_;
  const std::int32_t processIdentifier_;
};
