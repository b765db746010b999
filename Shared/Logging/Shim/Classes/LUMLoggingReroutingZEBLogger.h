#pragma once

/// An older logger that feeds the structured framework: each call becomes one message for a multiplexer.
///
///     ZEBLogger::setSharedLogger(LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(
///         LUMLogMultiplexer::sharedInstance()));
///     ZEBLogError("%@ has no entries", name);          // in the system's log, at LUMLogLevelError
///
/// The levels debug, info, error and assert become LUMLogLevelDebug, LUMLogLevelInfo, LUMLogLevelError and
/// LUMLogLevelFault, so that an assert reaches the error handler. Any other level becomes LUMLogLevelFault
/// too, rather than being lost. A message has the function where one was given, and neither file nor line.
///
/// The writer, formatter and filter of an older logger have nothing to do here: there are none, and giving it
/// one is a mistake.
///
/// Immutable: any thread may use it. Unlike the older logger itself, it lets through what the stack-trace
/// filter and the multiplexer's filters and loggers throw.
///
/// Not for: new code, which calls LUMLogAt.

#include <cstdarg>
#include <utility>

#include "Foundation/ZEBLogFilter.h"
#include "Foundation/ZEBLogFormatter.h"
#include "Foundation/ZEBLogLevel.h"
#include "Foundation/ZEBLogWriter.h"
#include "Foundation/ZEBLogger.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogMultiplexing.h"

class RT_VISIBLE LUMLoggingReroutingZEBLogger
    : public rt::Implements<LUMLoggingReroutingZEBLogger, ZEBLogger> {
 public:
  /// With messages for `logMultiplexer`; null where that is null. `stackTraceFilter`, which may be null, is
  /// asked with text and level which messages have a call stack, as far as the multiplexer wants any; without
  /// it none has.
  static rt::Ref<LUMLoggingReroutingZEBLogger> initWithLogMultiplexer(
      rt::Ref<LUMLogMultiplexing> logMultiplexer, rt::Ref<ZEBLogFilter> stackTraceFilter);

  /// The same with call stacks from the level error on.
  static rt::Ref<LUMLoggingReroutingZEBLogger> initWithLogMultiplexer(
      rt::Ref<LUMLogMultiplexing> logMultiplexer);

  /// Always null.
  rt::Ref<ZEBLogWriter> writer() const override { return nullptr; }
  rt::Ref<ZEBLogFormatter> formatter() const override { return nullptr; }
  rt::Ref<ZEBLogFilter> filter() const override { return nullptr; }

  /// Do nothing with null, and otherwise fail an assertion (Runtime/Process/AssertionHandler.h).
  void setWriter(rt::Ref<ZEBLogWriter> writer) override;
  void setFormatter(rt::Ref<ZEBLogFormatter> formatter) override;
  void setFilter(rt::Ref<ZEBLogFilter> filter) override;

  /// Makes the message and hands it to the multiplexer, unless making the text throws: then nothing is
  /// logged.
  [[gnu::noinline]] void logInternalFunc(const char* func, const rt::String& format, std::va_list valist,
                                         ZEBLogLevel level) override;

 protected:
  LUMLoggingReroutingZEBLogger(rt::Ref<LUMLogMultiplexing> logMultiplexer,
                               rt::Ref<ZEBLogFilter> stackTraceFilter) noexcept
      : logMultiplexer_(std::move(logMultiplexer)), stackTraceFilter_(std::move(stackTraceFilter)) {}

 private:
  const rt::Ref<LUMLogMultiplexing> logMultiplexer_;
  const rt::Ref<ZEBLogFilter> stackTraceFilter_;
};
