// The setters work under a recursive lock. A filter is told of its attaching and detaching under that lock,
// and may use the logger meanwhile. A line is logged without a lock: writer, formatter and filter are one
// immutable object, which `rt::AtomicRef` reads. So a filter that logs from another thread while it is
// attached waits for nobody. A replaced piece lives until the last line with it is written.

#include "Foundation/ZEBLogger.h"

#include <string_view>
#include <utility>

#include "Foundation/ZEBArrayCompositeLogWriter.h"
#include "Foundation/ZEBDropExceptions.h"
#include "Foundation/ZEBFileHandleLogWriter.h"
#include "Foundation/ZEBLogBasicFormatter.h"
#include "Foundation/ZEBLogLevelFilter.h"
#include "Foundation/ZEBLogMaximumLevelFilter.h"
#include "Foundation/ZEBLogMininumLevelFilter.h"
#include "Foundation/ZEBLogNoFilter.h"
#include "Foundation/ZEBLogStandardFormatter.h"
#include "Runtime/Locks/Lazy.h"

using namespace rt::literals;

namespace {

// Serialises the threads that set the shared logger. Recursive, because making the first logger reads the
// user defaults. A mistake in these is reported to a handler of the host, which may log.
constinit rt::RecursiveLock sharedLock;

// Never destroyed, because programs log until the process ends.
rt::AtomicRef<ZEBLogger>& shared() {
  static constinit rt::Lazy<rt::AtomicRef<ZEBLogger>> logger;
  return logger.get([] { return rt::AtomicRef<ZEBLogger>(); });
}

rt::Ref<ZEBLogWriter> standardOutput() {
  return ZEBFileHandleLogWriter::initWithFileHandle(rt::FileHandle::standardOutput());
}

rt::Ref<ZEBLogWriter> standardError() {
  return ZEBFileHandleLogWriter::initWithFileHandle(rt::FileHandle::standardError());
}

// Returns what `build` returns; null if `build` throws.
template <class Build>
rt::Ref<ZEBLogger> built(Build build) {
  rt::Ref<ZEBLogger> logger;
  ZEBDropExceptions([&] { logger = build(); });
  return logger;
}

rt::Ref<ZEBLogger> buildStandardLogger(rt::Ref<ZEBLogWriter> writer) {
  return ZEBLogger::initWithWriter(std::move(writer), ZEBLogStandardFormatter::init(),
                                   ZEBLogLevelFilter::init());
}

}  // namespace

// The pieces that log a line. One object, so that a line reads all of them at once.
class ZEBLogger::Pieces final : public rt::Implements<Pieces, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "ZEBLoggerPieces";

  // Changed only before the object belongs to a logger.
  rt::Ref<ZEBLogWriter> writer;
  rt::Ref<ZEBLogFormatter> formatter;
  rt::Ref<ZEBLogFilter> filter;
};

rt::Ref<ZEBLogger> ZEBLogger::sharedLogger() {
  if (rt::Ref<ZEBLogger> logger = shared().load()) return logger;
  const rt::LockGuard guard(sharedLock);
  if (rt::Ref<ZEBLogger> logger = shared().load()) return logger;
  // If this thread has set a logger meanwhile, that one stays.
  shared().compareExchange(nullptr, standardLogger());
  return shared().load();
}

void ZEBLogger::setSharedLogger(rt::Ref<ZEBLogger> logger) {
  const rt::LockGuard guard(sharedLock);
  // `logger` now holds the old logger, and releases it after the lock.
  logger = shared().exchange(std::move(logger));
}

rt::Ref<ZEBLogger> ZEBLogger::standardLogger() {
  return built([] { return buildStandardLogger(standardOutput()); });
}

rt::Ref<ZEBLogger> ZEBLogger::standardLoggerWithStderr() {
  return built([] { return buildStandardLogger(standardError()); });
}

rt::Ref<ZEBLogger> ZEBLogger::standardLoggerWithStdoutAndStderr() {
  return built([] {
    const auto formatter = rt::make<ZEBLogBasicFormatter>();
    const auto low = initWithWriter(standardOutput(), formatter,
                                    ZEBLogMaximumLevelFilter::initWithMaximumLevel(ZEBLogLevelInfo));
    const auto high = initWithWriter(standardError(), formatter,
                                     ZEBLogMininumLevelFilter::initWithMinimumLevel(ZEBLogLevelError));
    return buildStandardLogger(initWithWriter(ZEBArrayCompositeLogWriter::of(low, high), formatter, nullptr));
  });
}

rt::Ref<ZEBLogger> ZEBLogger::standardLoggerWithPath(const rt::String& path) {
  return built([&]() -> rt::Ref<ZEBLogger> {
    rt::Ref<ZEBLogWriter> writer = ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(path, 0644);
    return writer != nullptr ? buildStandardLogger(std::move(writer)) : nullptr;
  });
}

rt::Ref<ZEBLogger> ZEBLogger::loggerWithWriter(rt::Ref<ZEBLogWriter> writer,
                                               rt::Ref<ZEBLogFormatter> formatter,
                                               rt::Ref<ZEBLogFilter> filter) {
  return built([&] { return initWithWriter(std::move(writer), std::move(formatter), std::move(filter)); });
}

rt::Ref<ZEBLogger> ZEBLogger::logger() {
  return loggerWithWriter(nullptr, nullptr, nullptr);
}

rt::Ref<ZEBLogger> ZEBLogger::initWithWriter(rt::Ref<ZEBLogWriter> writer, rt::Ref<ZEBLogFormatter> formatter,
                                             rt::Ref<ZEBLogFilter> filter) {
  rt::Ref<ZEBLogger> logger = rt::Ref<ZEBLogger>::adopt(new ZEBLogger());
  logger->setWriter(std::move(writer));
  logger->setFormatter(std::move(formatter));
  logger->setFilter(std::move(filter));
  return logger;
}

rt::Ref<ZEBLogger> ZEBLogger::init() {
  return initWithWriter(nullptr, nullptr, nullptr);
}

ZEBLogger::ZEBLogger() = default;

ZEBLogger::~ZEBLogger() {
  if (const rt::Ref<ZEBLogFilter> last = pieceOf(&Pieces::filter)) {
    ZEBDropExceptions([&] { last->willDetachFromLogger(); });
  }
}

template <class Piece>
rt::Ref<Piece> ZEBLogger::pieceOf(rt::Ref<Piece> Pieces::* piece) const {
  const rt::Ref<Pieces> pieces = pieces_.load();
  return pieces != nullptr ? (*pieces).*piece : nullptr;
}

rt::Ref<ZEBLogWriter> ZEBLogger::writer() const {
  return pieceOf(&Pieces::writer);
}

rt::Ref<ZEBLogFormatter> ZEBLogger::formatter() const {
  return pieceOf(&Pieces::formatter);
}

rt::Ref<ZEBLogFilter> ZEBLogger::filter() const {
  return pieceOf(&Pieces::filter);
}

// The other pieces stay as they are.
template <class Piece>
void ZEBLogger::setPiece(rt::Ref<Piece> Pieces::* piece, rt::Ref<Piece> value, rt::Ref<Pieces>& next) {
  if (const rt::Ref<Pieces> known = pieces_.load()) {
    next->writer = known->writer;
    next->formatter = known->formatter;
    next->filter = known->filter;
  }
  (*next).*piece = std::move(value);
  next = pieces_.exchange(std::move(next));
}

// The setters declare `pieces` before the lock, so that the replaced pieces are released after it.

void ZEBLogger::setWriter(rt::Ref<ZEBLogWriter> writer) {
  if (writer == nullptr) writer = standardOutput();
  rt::Ref<Pieces> pieces = rt::make<Pieces>();
  const rt::LockGuard guard(lock_);
  setPiece(&Pieces::writer, std::move(writer), pieces);
}

void ZEBLogger::setFormatter(rt::Ref<ZEBLogFormatter> formatter) {
  if (formatter == nullptr) formatter = rt::make<ZEBLogBasicFormatter>();
  rt::Ref<Pieces> pieces = rt::make<Pieces>();
  const rt::LockGuard guard(lock_);
  setPiece(&Pieces::formatter, std::move(formatter), pieces);
}

void ZEBLogger::setFilter(rt::Ref<ZEBLogFilter> filter) {
  if (filter == nullptr) filter = rt::make<ZEBLogNoFilter>();
  rt::Ref<Pieces> pieces = rt::make<Pieces>();
  const rt::LockGuard guard(lock_);
  if (const rt::Ref<ZEBLogFilter> old = pieceOf(&Pieces::filter)) old->willDetachFromLogger();
  setPiece(&Pieces::filter, filter, pieces);
  filter->didAttachToLogger();
}

void ZEBLogger::logMessage(const rt::String& message, ZEBLogLevel level) {
  if (level >= ZEBLogLevelDebug && level <= ZEBLogLevelAssert) log(level, nullptr, "%@"_s, message);
}

void ZEBLogger::logInternalFunc(const char* func, const rt::String& format, std::va_list valist,
                                ZEBLogLevel level) {
  ZEBDropExceptions([&] {
    const rt::Ref<Pieces> pieces = pieces_.load();
    const rt::String line =
        pieces->formatter->stringForFunc(rt::String::fromUTF8(func), format, valist, level);
    if (line && pieces->filter->filterAllowsMessage(line, level)) pieces->writer->logMessage(line, level);
  });
}

void ZEBLogger::logVariadic(ZEBLogLevel level, const char* func, const rt::String* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  try {
    logInternalFunc(func, *format, arguments, level);
  } catch (...) {
    va_end(arguments);
    throw;
  }
  va_end(arguments);
}
