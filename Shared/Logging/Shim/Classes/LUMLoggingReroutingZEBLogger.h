#pragma once

/// An older logger that turns each call into one message for a multiplexer of the structured framework.
///
///     ZEBLogger::setSharedLogger(LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(
///         LUMLogMultiplexer::sharedInstance()));
///     ZEBLogError("%@ has no entries", name);          // in the system's log, at LUMLogLevelError
///
/// The levels debug, info, error and assert become LUMLogLevelDebug, LUMLogLevelInfo, LUMLogLevelError and
/// LUMLogLevelFault. So an assert reaches the error handler. Any other level also becomes LUMLogLevelFault,
/// so that it is not lost. A message has the function if one was given, and neither file nor line.
///
/// This logger has no writer, formatter or filter. Setting one fails an assertion.
///
/// Threads: thread-safe, because it is immutable.
///
/// Errors: throws what the stack-trace filter and the multiplexer's filters and loggers throw. The older
/// logger drops such exceptions.
///
/// Not for: new code. Call LUMLogAt.

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
  /// Makes a logger for `logMultiplexer`. Returns null if `logMultiplexer` is null.
  ///
  /// `stackTraceFilter` decides by text and level which messages carry a call stack. If it is null, none
  /// does. No message carries one unless `logMultiplexer` is a LUMLogAppControl that captures call stacks.
  static rt::Ref<LUMLoggingReroutingZEBLogger> initWithLogMultiplexer(
      rt::Ref<LUMLogMultiplexing> logMultiplexer, rt::Ref<ZEBLogFilter> stackTraceFilter);

  /// Same as above, with call stacks from the level error on.
  static rt::Ref<LUMLoggingReroutingZEBLogger> initWithLogMultiplexer(
      rt::Ref<LUMLogMultiplexing> logMultiplexer);

  /// Return null.
  rt::Ref<ZEBLogWriter> writer() const override { return nullptr; }
  rt::Ref<ZEBLogFormatter> formatter() const override { return nullptr; }
  rt::Ref<ZEBLogFilter> filter() const override { return nullptr; }

  /// Do nothing for null. Otherwise they fail an assertion (Runtime/Process/AssertionHandler.h) and set
  /// nothing.
  void setWriter(rt::Ref<ZEBLogWriter> writer) override;
  void setFormatter(rt::Ref<ZEBLogFormatter> formatter) override;
  void setFilter(rt::Ref<ZEBLogFilter> filter) override;

  /// Makes the message and hands it to the multiplexer. If formatting the text throws, drops the exception
  /// and logs nothing.
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
