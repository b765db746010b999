#include "Foundation/ZEBLogger.h"

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

using namespace rt::literals;

namespace {

// Recursive: making the first shared logger reads the user defaults, and what is wrong with these is reported
// to a handler of the host's, which may log.
constinit rt::RecursiveLock sharedLock;

// Owned. Never destroyed: programs log until the process is gone.
constinit ZEBLogger* shared RT_GUARDED_BY(sharedLock) = nullptr;

rt::Ref<ZEBLogWriter> standardOutput() {
  return ZEBFileHandleLogWriter::initWithFileHandle(rt::FileHandle::standardOutput());
}

rt::Ref<ZEBLogWriter> standardError() {
  return ZEBFileHandleLogWriter::initWithFileHandle(rt::FileHandle::standardError());
}

// What `build` returns; null where it throws.
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

rt::Ref<ZEBLogger> ZEBLogger::sharedLogger() {
  const rt::LockGuard guard(sharedLock);
  if (shared == nullptr) {
    rt::Ref<ZEBLogger> logger = standardLogger();
    if (shared == nullptr) shared = logger.detach();
  }
  return shared;
}

void ZEBLogger::setSharedLogger(rt::Ref<ZEBLogger> logger) {
  const rt::LockGuard guard(sharedLock);
  // `logger` lets the old one go, after the lock.
  logger = rt::Ref<ZEBLogger>::adopt(std::exchange(shared, logger.detach()));
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

ZEBLogger::~ZEBLogger() {
  if (pieces_.filter == nullptr) return;
  ZEBDropExceptions([this] { pieces().filter->willDetachFromLogger(); });
}

ZEBLogger::Pieces ZEBLogger::pieces() const {
  const rt::LockGuard guard(piecesLock_);
  return pieces_;
}

rt::Ref<ZEBLogWriter> ZEBLogger::writer() const {
  return pieces().writer;
}

rt::Ref<ZEBLogFormatter> ZEBLogger::formatter() const {
  return pieces().formatter;
}

rt::Ref<ZEBLogFilter> ZEBLogger::filter() const {
  return pieces().filter;
}

// The setters' parameters let the old pieces go, after the locks.

void ZEBLogger::setWriter(rt::Ref<ZEBLogWriter> writer) {
  if (writer == nullptr) writer = standardOutput();
  const rt::LockGuard guard(lock_);
  const rt::LockGuard piecesGuard(piecesLock_);
  pieces_.writer.swap(writer);
}

void ZEBLogger::setFormatter(rt::Ref<ZEBLogFormatter> formatter) {
  if (formatter == nullptr) formatter = rt::make<ZEBLogBasicFormatter>();
  const rt::LockGuard guard(lock_);
  const rt::LockGuard piecesGuard(piecesLock_);
  pieces_.formatter.swap(formatter);
}

void ZEBLogger::setFilter(rt::Ref<ZEBLogFilter> filter) {
  if (filter == nullptr) filter = rt::make<ZEBLogNoFilter>();
  const rt::Ref<ZEBLogFilter> added = filter;
  const rt::LockGuard guard(lock_);
  if (const rt::Ref<ZEBLogFilter> old = pieces().filter) old->willDetachFromLogger();
  {
    const rt::LockGuard piecesGuard(piecesLock_);
    pieces_.filter.swap(filter);
  }
  added->didAttachToLogger();
}

void ZEBLogger::logMessage(const rt::String& message, ZEBLogLevel level) {
  if (level >= ZEBLogLevelDebug && level <= ZEBLogLevelAssert) log(level, nullptr, "%@"_s, message);
}

void ZEBLogger::logInternalFunc(const char* func, const rt::String& format, std::va_list valist,
                                ZEBLogLevel level) {
  ZEBDropExceptions([&] {
    const Pieces pieces = this->pieces();
    const rt::String line =
        pieces.formatter->stringForFunc(rt::String::fromUTF8(func), format, valist, level);
    if (line && pieces.filter->filterAllowsMessage(line, level)) pieces.writer->logMessage(line, level);
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
