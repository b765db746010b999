#pragma once

/// The older logger: a line of text for each call, made by a formatter, let through by a filter, written by a
/// writer, each of which may be exchanged while others log.
///
///     ZEBLogger::setSharedLogger(ZEBLogger::standardLoggerWithPath("/var/log/host.log"_s));
///
///     const rt::Ref<ZEBLogger> logger = ZEBLogger::sharedLogger();
///     logger->logError("%@ has %d entries"_s, name, 0);
///     logger->logFuncInfo(__func__, "started"_s);      // shorter: Foundation/ZEBLoggerMacroHelpers.h
///
/// A format that its arguments do not fit does not compile (Runtime/Text/FormatString.h). `"..."_s` is as
/// fast as it gets; a plain literal takes an allocation more, and std::bad_alloc passes there. A format that
/// is known only at run time goes to `logInternalFunc`.
///
/// Whatever else goes wrong, in a formatter, a filter, a writer or the description of an argument, logging
/// throws nothing: the line is lost and the next one tries again.
///
/// Any thread may use all of it, also in the child of a fork, whatever other threads were doing.
///
/// Not for: new code, which has the structured framework; a writer that logs through its own logger.

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
  /// The process's logger: what `setSharedLogger` has set or, before that and after it has set null, a
  /// `standardLogger`, which is made by the first call. Null only where that is; the next call tries again.
  static rt::Ref<ZEBLogger> sharedLogger();

  /// Makes `logger`, which may be null, the process's. Who has the one before it from `sharedLogger` may go
  /// on with it.
  static void setSharedLogger(rt::Ref<ZEBLogger> logger);

  // The factories return null where something throws while they build the logger.

  /// To standard output, by a ZEBLogStandardFormatter, through a ZEBLogLevelFilter.
  static rt::Ref<ZEBLogger> standardLogger();

  /// The same to standard error.
  static rt::Ref<ZEBLogger> standardLoggerWithStderr();

  /// The same with levels 1 and 2 to standard output, 3 and 4 to standard error.
  static rt::Ref<ZEBLogger> standardLoggerWithStdoutAndStderr();

  /// The same to the end of the file at `path`, which is made with mode 0644 where there is none. Null where
  /// it cannot be opened.
  static rt::Ref<ZEBLogger> standardLoggerWithPath(const rt::String& path);

  /// A new logger with these pieces, each of which may be null for the one that its setter describes.
  static rt::Ref<ZEBLogger> loggerWithWriter(rt::Ref<ZEBLogWriter> writer, rt::Ref<ZEBLogFormatter> formatter,
                                             rt::Ref<ZEBLogFilter> filter);

  /// The same without any.
  static rt::Ref<ZEBLogger> logger();

  /// As `loggerWithWriter`, but throws what the filter throws in `didAttachToLogger`, and std::bad_alloc.
  /// Sets the writer, the formatter and the filter, in this order. Never null.
  static rt::Ref<ZEBLogger> initWithWriter(rt::Ref<ZEBLogWriter> writer, rt::Ref<ZEBLogFormatter> formatter,
                                           rt::Ref<ZEBLogFilter> filter);

  /// The same without any.
  static rt::Ref<ZEBLogger> init();

  /// Tells the filter `willDetachFromLogger`.
  ~ZEBLogger() override;

  /// The pieces; never null.
  virtual rt::Ref<ZEBLogWriter> writer() const;
  virtual rt::Ref<ZEBLogFormatter> formatter() const;
  virtual rt::Ref<ZEBLogFilter> filter() const;

  /// Sets the writer; null means standard output.
  ///
  /// Setters of one logger wait for each other, and no thread that logs waits for them. A line that is under
  /// way is made, filtered and written by the pieces that were there as it began.
  virtual void setWriter(rt::Ref<ZEBLogWriter> writer);

  /// Sets the formatter; null means a new ZEBLogBasicFormatter.
  virtual void setFormatter(rt::Ref<ZEBLogFormatter> formatter);

  /// Tells the old filter `willDetachFromLogger`, sets the new one, and tells it `didAttachToLogger`; null
  /// means a new ZEBLogNoFilter. What a filter throws there passes; what comes after it is then not done.
  virtual void setFilter(rt::Ref<ZEBLogFilter> filter);

  // Inlined in every build, so that between the code that logs and `logInternalFunc` there is one frame, that
  // of `logVariadic`: who captures call stacks counts on it.

  /// Log at the levels 1 to 4.
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

  /// The same in the function called `func`, a text that ends with NUL, or null.
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

  /// Logs `message` as it is, at `level`; at any other level than 1 to 4, drops it.
  void logMessage(const rt::String& message, ZEBLogLevel level) override;

  /// What all of the above come to: has the formatter make a line of `format` and of the arguments in
  /// `valist`, which is left where it is, and hands that to the writer if the filter allows it. `func` is
  /// null or ends with NUL; one that is not UTF-8 counts as null.
  virtual void logInternalFunc(const char* func, const rt::String& format, std::va_list valist,
                               ZEBLogLevel level);

 protected:
  /// Without pieces. A subclass sets them, or overrides what would use them: `logInternalFunc`, and the
  /// accessors and setters.
  ZEBLogger();

 private:
  class Pieces;

  template <class Piece>
  rt::Ref<Piece> pieceOf(rt::Ref<Piece> Pieces::* piece) const;
  // `next` is new, and is the pieces that were there when it returns. Allocates nothing.
  template <class Piece>
  void setPiece(rt::Ref<Piece> Pieces::* piece, rt::Ref<Piece> value, rt::Ref<Pieces>& next)
      RT_REQUIRES(lock_);

  template <class... Arguments>
  [[gnu::always_inline]] void log(ZEBLogLevel level, const char* func,
                                  const rt::FormatString<std::type_identity_t<Arguments>...>& format,
                                  const Arguments&... arguments) {
    const rt::String text = format.string();
    logVariadic(level, func, &text, rt::toVariadic(arguments)...);
  }

  // With arguments that are as `rt::toVariadic` makes them.
  [[gnu::noinline]] void logVariadic(ZEBLogLevel level, const char* func, const rt::String* format, ...);

  // The setters'.
  rt::RecursiveLock lock_;
  // Replaced, never changed, so that a line goes on with those that it has found. Null in a subclass that
  // sets none.
  rt::AtomicRef<Pieces> pieces_;
};
