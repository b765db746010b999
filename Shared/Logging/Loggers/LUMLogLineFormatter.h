#pragma once

/// A formatter that writes a message as one line into memory of its caller. The loggers that write text use
/// it: it allocates nothing, and works in a signal handler after a crash.
///
///     class Terse : public rt::Implements<Terse, rt::Object, LUMLogLineFormatter> {
///      public:
///       void appendLine(LUMLogLine& line, const LUMLogMessage& message) const override {
///         line.appendEscaped(message.formattedString().view());
///       }
///     };
///
///     multiplexer->addSyncLogger(LUMFileLogger::initWithPath("/var/log/host.log"_s, rt::make<Terse>()));
///
/// Threads: called on any thread, also on several at once.
///
/// Not for: leaving messages out; see LUMLogFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFormatter.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"

struct RT_VISIBLE LUMLogLineFormatter : rt::Protocol<LUMLogLineFormatter, LUMLogFormatter> {
  /// Appends the line for `message`, without a line feed at its end. Appends the same bytes if it is called
  /// again for the same message.
  ///
  /// If `line.caller()` is kSignalHandler, it allocates nothing, takes no lock and calls only functions that
  /// are safe in a signal handler. The memory of `message` may still be written by the interrupted thread.
  virtual void appendLine(LUMLogLine& line, const LUMLogMessage& message) const = 0;

  /// Returns the line as a string.
  rt::String formattedLogMessage(const LUMLogMessage& message) const override;

 protected:
  ~LUMLogLineFormatter() = default;
};
