#pragma once

/// The older logger, which writes one line of text per call. A formatter makes the line, a filter decides
/// whether it passes, and a writer writes it. Each of them may be replaced while other threads log.
///
///     ZEBLogger::setSharedLogger(ZEBLogger::standardLoggerWithPath("/var/log/host.log"_s));
///
///     const rt::Ref<ZEBLogger> logger = ZEBLogger::sharedLogger();
///     logger->logError("%@ has %d entries"_s, name, 0);
///     logger->logFuncInfo(__func__, "started"_s);      // shorter: Foundation/ZEBLoggerMacroHelpers.h
///
/// A format that does not fit its arguments does not compile (Runtime/Text/FormatString.h). A literal with
/// the suffix `_s` is fastest. A plain literal costs one more allocation, and std::bad_alloc from there
/// reaches the caller. Pass a format that is known only at run time to `logInternalFunc`.
///
/// Errors: apart from that, logging throws nothing. If a formatter, a filter, a writer or the description of
/// an argument fails, the line is lost. The next line is not affected.
///
/// Threads: all of it is thread-safe, also in the child of a fork, whatever other threads were doing.
///
/// Not for: new code, which uses the structured framework (Shared/Logging/LUMLog.h).
///
/// Not for: a writer that logs through its own logger.

#include <cstdarg>
#include <type_traits>

#include "Foundation/ZEBLogFilter.h"
#include "Foundation/ZEBLogFormatter.h"
#include "Foundation/ZEBLogLevel.h"
#include "Foundation/ZEBLogWriter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/RecursiveLock.h"
#include "Runtime/Objects/Private/AtomicRef.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Text/FormatString.h"
#include "Runtime/Text/Private/FormatArguments.h"

class RT_VISIBLE ZEBLogger : public rt::Implements<ZEBLogger, rt::Object, ZEBLogWriter> {
 public:
  /// Returns the logger that `setSharedLogger` has set. If none was set, or null, the call makes a
  /// `standardLogger` and sets it. Returns null only if that fails; the next call then tries again.
  static rt::Ref<ZEBLogger> sharedLogger();

  /// Sets the process's logger; `logger` may be null. Code that got the previous logger from `sharedLogger`
  /// may go on using it.
  static void setSharedLogger(rt::Ref<ZEBLogger> logger);

  // The factories return null if building the logger throws.

  /// Makes a logger to standard output, with a ZEBLogStandardFormatter and a ZEBLogLevelFilter.
  static rt::Ref<ZEBLogger> standardLogger();

  /// Same as `standardLogger`, but to standard error.
  static rt::Ref<ZEBLogger> standardLoggerWithStderr();

  /// Same as `standardLogger`, but with levels 3 and 4 to standard error.
  static rt::Ref<ZEBLogger> standardLoggerWithStdoutAndStderr();

  /// Same as `standardLogger`, but to the end of the file at `path`. A file that does not exist is created
  /// with mode 0644. Returns null if the file cannot be opened.
  static rt::Ref<ZEBLogger> standardLoggerWithPath(const rt::String& path);

  /// Makes a logger with these pieces. A null piece stands for the default that its setter names.
  static rt::Ref<ZEBLogger> loggerWithWriter(rt::Ref<ZEBLogWriter> writer, rt::Ref<ZEBLogFormatter> formatter,
                                             rt::Ref<ZEBLogFilter> filter);

  /// Makes a logger with the default pieces.
  static rt::Ref<ZEBLogger> logger();

  /// Same as `loggerWithWriter`, but never null. Sets the writer, the formatter and the filter, in this
  /// order. Throws std::bad_alloc, and what the filter throws in `didAttachToLogger`.
  static rt::Ref<ZEBLogger> initWithWriter(rt::Ref<ZEBLogWriter> writer, rt::Ref<ZEBLogFormatter> formatter,
                                           rt::Ref<ZEBLogFilter> filter);

  /// Same as above, with the default pieces.
  static rt::Ref<ZEBLogger> init();

  /// Calls the filter's `willDetachFromLogger`.
  ~ZEBLogger() override;

  /// Return the pieces, which are never null.
  virtual rt::Ref<ZEBLogWriter> writer() const;
  virtual rt::Ref<ZEBLogFormatter> formatter() const;
  virtual rt::Ref<ZEBLogFilter> filter() const;

  /// Sets the writer; null stands for standard output.
  ///
  /// Threads: the setters of one logger wait for each other. Logging never waits for them. A line that is
  /// being logged keeps the pieces that were set when it began.
  virtual void setWriter(rt::Ref<ZEBLogWriter> writer);

  /// Sets the formatter; null stands for a new ZEBLogBasicFormatter.
  virtual void setFormatter(rt::Ref<ZEBLogFormatter> formatter);

  /// Calls the old filter's `willDetachFromLogger`, sets the new filter, and calls its `didAttachToLogger`.
  /// Null stands for a new ZEBLogNoFilter. If a filter throws, the remaining steps are not done and the
  /// exception passes through.
  virtual void setFilter(rt::Ref<ZEBLogFilter> filter);

  // The logging functions are inlined in every build, so that exactly one frame lies between the code that
  // logs and `logInternalFunc`: that of `logVariadic`. Subclasses that capture call stacks rely on that.

  /// Log a line at the levels 1 to 4.
  template <class... Arguments>
  [[gnu::always_inline]] void logDebug(rt::FormatString<std::type_identity_t<Arguments>...> format,
                                       const Arguments&... arguments) {
    log(ZEBLogLevelDebug, nullptr, format, arguments...);
  }
  template <class... Arguments>
  [[gnu::always_inline]] void logInfo(rt::FormatString<std::type_identity_t<Arguments>...> format,
                                      const Arguments&... arguments) {
    log(ZEBLogLevelInfo, nullptr, format, arguments...);
  }
  template <class... Arguments>
  [[gnu::always_inline]] void logError(rt::FormatString<std::type_identity_t<Arguments>...> format,
                                       const Arguments&... arguments) {
    log(ZEBLogLevelError, nullptr, format, arguments...);
  }
  template <class... Arguments>
  [[gnu::always_inline]] void logAssert(rt::FormatString<std::type_identity_t<Arguments>...> format,
                                        const Arguments&... arguments) {
    log(ZEBLogLevelAssert, nullptr, format, arguments...);
  }

  /// Same as above, with the name of the function that logs. `func` ends with NUL, or is null.
  template <class... Arguments>
  [[gnu::always_inline]] void logFuncDebug(const char* func,
                                           rt::FormatString<std::type_identity_t<Arguments>...> msg,
                                           const Arguments&... arguments) {
    log(ZEBLogLevelDebug, func, msg, arguments...);
  }
  template <class... Arguments>
  [[gnu::always_inline]] void logFuncInfo(const char* func,
                                          rt::FormatString<std::type_identity_t<Arguments>...> msg,
                                          const Arguments&... arguments) {
    log(ZEBLogLevelInfo, func, msg, arguments...);
  }
  template <class... Arguments>
  [[gnu::always_inline]] void logFuncError(const char* func,
                                           rt::FormatString<std::type_identity_t<Arguments>...> msg,
                                           const Arguments&... arguments) {
    log(ZEBLogLevelError, func, msg, arguments...);
  }
  template <class... Arguments>
  [[gnu::always_inline]] void logFuncAssert(const char* func,
                                            rt::FormatString<std::type_identity_t<Arguments>...> msg,
                                            const Arguments&... arguments) {
    log(ZEBLogLevelAssert, func, msg, arguments...);
  }

  /// Logs `message` unchanged at `level`. Drops it if `level` is not from 1 to 4.
  void logMessage(const rt::String& message, ZEBLogLevel level) override;

  /// Logs one line. All of the functions above end here. The formatter makes the line of `format` and
  /// `valist`, the filter decides whether it passes, and the writer writes it. Does not advance `valist`.
  /// `func` is null or ends with NUL. A name that is not UTF-8 counts as null.
  virtual void logInternalFunc(const char* func, const rt::String& format, std::va_list valist,
                               ZEBLogLevel level);

 protected:
  /// Makes a logger without pieces. A subclass sets them, or overrides the functions that use them:
  /// `logInternalFunc`, and the accessors and setters.
  ZEBLogger();

 private:
  class Pieces;

  template <class Piece>
  rt::Ref<Piece> pieceOf(rt::Ref<Piece> Pieces::* piece) const;
  // Replaces one piece by `value`. `next` is a new object, and holds the replaced pieces on return. Allocates
  // nothing.
  template <class Piece>
  void setPiece(rt::Ref<Piece> Pieces::* piece, rt::Ref<Piece> value, rt::Ref<Pieces>& next)
      RT_REQUIRES(lock_);

  template <class... Arguments>
  [[gnu::always_inline]] void log(ZEBLogLevel level, const char* func,
                                  const rt::FormatString<std::type_identity_t<Arguments>...>& format,
                                  const Arguments&... arguments) {
    const rt::String text = format.string();
    logVariadic(level, func, &text, rt::toVariadic(rt::toArgument(arguments))...);
  }

  // Takes the arguments in the form that `rt::toVariadic` gives them.
  [[gnu::noinline]] void logVariadic(ZEBLogLevel level, const char* func, const rt::String* format, ...);

  // Serialises the setters.
  rt::RecursiveLock lock_;
  // Replaced as a whole, never changed, so that each line keeps the pieces that it found. Null in a subclass
  // that sets no pieces.
  rt::AtomicRef<Pieces> pieces_;
};
