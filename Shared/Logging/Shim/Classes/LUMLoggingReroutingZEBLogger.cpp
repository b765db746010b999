#include "Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger.h"

#include <cstdint>

#include "Foundation/Private/ZEBDropExceptions.h"
#include "Foundation/ZEBLogMininumLevelFilter.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogAppControl.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogScope.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"

namespace {

using namespace rt::literals;

// The innermost frames that a call stack leaves out: `logInternalFunc` and its caller in the base class.
constexpr std::uint64_t kOwnFrameCount = 2;

LUMLogLevel messageLevelOf(ZEBLogLevel level) {
  switch (level) {
    case ZEBLogLevelDebug:
      return LUMLogLevelDebug;
    case ZEBLogLevelInfo:
      return LUMLogLevelInfo;
    case ZEBLogLevelError:
      return LUMLogLevelError;
    default:
      return LUMLogLevelFault;
  }
}

void failAssertion(const rt::String& function, std::uint64_t line, const rt::String& description) {
  rt::AssertionHandler::currentHandler()->handleFailureInFunction(
      function, "Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger"_s, line, description);
}

}  // namespace

rt::Ref<LUMLoggingReroutingZEBLogger> LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(
    rt::Ref<LUMLogMultiplexing> logMultiplexer, rt::Ref<ZEBLogFilter> stackTraceFilter) {
  if (!logMultiplexer) return nullptr;
  return rt::Ref<LUMLoggingReroutingZEBLogger>::adopt(
      new LUMLoggingReroutingZEBLogger(std::move(logMultiplexer), std::move(stackTraceFilter)));
}

rt::Ref<LUMLoggingReroutingZEBLogger> LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(
    rt::Ref<LUMLogMultiplexing> logMultiplexer) {
  return initWithLogMultiplexer(std::move(logMultiplexer),
                                ZEBLogMininumLevelFilter::initWithMinimumLevel(ZEBLogLevelError));
}

void LUMLoggingReroutingZEBLogger::setWriter(rt::Ref<ZEBLogWriter> writer) {
  if (!writer) return;
  failAssertion("-[LUMLoggingReroutingZEBLogger setWriter:]"_s, 118,
                "ZEBLogWriter won't be used by LUMLoggingReroutingZEBLogger."_s);
}

void LUMLoggingReroutingZEBLogger::setFormatter(rt::Ref<ZEBLogFormatter> formatter) {
  if (!formatter) return;
  failAssertion("-[LUMLoggingReroutingZEBLogger setFormatter:]"_s, 127,
                "ZEBLogFormatter won't be used by LUMLoggingReroutingZEBLogger."_s);
}

void LUMLoggingReroutingZEBLogger::setFilter(rt::Ref<ZEBLogFilter> filter) {
  if (!filter) return;
  failAssertion("-[LUMLoggingReroutingZEBLogger setFilter:]"_s, 136,
                "ZEBLogFilter won't be used by LUMLoggingReroutingZEBLogger."_s);
}

void LUMLoggingReroutingZEBLogger::logInternalFunc(const char* func, const rt::String& format,
                                                   std::va_list valist, ZEBLogLevel level) {
  rt::String text;
  bool isFormatted = false;
  ZEBDropExceptions([&] {
    text = rt::formatV(format, valist);
    isFormatted = true;
  });
  if (!isFormatted) return;

  rt::Ref<LUMLogCallstack> callstack;
  if (stackTraceFilter_ && stackTraceFilter_->filterAllowsMessage(text, level)) {
    const auto* control = rt::cast<LUMLogAppControl>(logMultiplexer_.get());
    if (control != nullptr && control->captureCallStack()) {
      if (control->captureCallStackAddresses()) {
        callstack = LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(kOwnFrameCount);
      } else {
        callstack = LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(kOwnFrameCount);
      }
    }
  }
  logMultiplexer_->logWithMessage(LUMLogMessage::initWithLevel(
      messageLevelOf(level), format, std::move(text), nullptr, rt::String::fromUTF8(func), 0, nullptr,
      nullptr, callstack, nullptr, LUMLogScope::metadataWith(nullptr)));
  rt::CallStack::keepFrame();
}
