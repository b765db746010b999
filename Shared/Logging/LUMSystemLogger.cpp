#include "Shared/Logging/LUMSystemLogger.h"

#ifdef __GLIBCXX__
#include <cxxabi.h>
#endif

#include <optional>
#include <utility>

#include "Runtime/Process/Bundle.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMSystemLoggerFormatter.h"
#include "Shared/Logging/Private/LUMLogEntryFields.h"

namespace {

std::optional<rt::SystemLog::Type> typeOf(LUMLogLevel level) {
  switch (level) {
    case LUMLogLevelDebug:
      return rt::SystemLog::Type::debug;
    case LUMLogLevelInfo:
      return rt::SystemLog::Type::info;
    case LUMLogLevelError:
      return rt::SystemLog::Type::error;
    case LUMLogLevelFault:
      return rt::SystemLog::Type::fault;
    default:
      return std::nullopt;
  }
}

rt::String textOf(const LUMLogMessage& message, const LUMLogFormatter& formatter) {
  try {
    return formatter.formattedLogMessage(message);
#ifdef __GLIBCXX__
  } catch (const abi::__forced_unwind&) {
    // Cancellation of the thread, which must not be stopped.
    throw;
#endif
  } catch (...) {
    // A message that cannot be formatted must not disturb the code that logged it.
    return nullptr;
  }
}

}  // namespace

rt::Ref<LUMSystemLogger> LUMSystemLogger::initWithFilter(rt::Ref<LUMLogFilter> filter,
                                                         rt::Ref<LUMLogFormatter> formatter) {
  return rt::Ref<LUMSystemLogger>::adopt(new LUMSystemLogger(std::move(filter), std::move(formatter)));
}

LUMSystemLogger::LUMSystemLogger(rt::Ref<LUMLogFilter> filter, rt::Ref<LUMLogFormatter> formatter)
    : filter_(std::move(filter)),
      formatter_(formatter ? std::move(formatter) : LUMSystemLoggerFormatter::init()),
      bundleIdentifier_(rt::Bundle::mainIdentifier()) {}

void LUMSystemLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  const rt::Ref<LUMLogMetadata>& metadata = message->logMetadata();
  const rt::SystemLog log(subsystemOf(*message), metadata ? metadata->category() : nullptr);
  const rt::String text = textOf(*message, *formatter_);
  const std::optional<rt::SystemLog::Type> type = typeOf(message->level());
  if (text.isEmpty() || !type || !log.isEnabled(*type)) return;
  const LUMLogEntryFields fields(*message);
  log.write(*type, text, fields.fields());
}

rt::String LUMSystemLogger::subsystemOf(const LUMLogMessage& message) const {
  const rt::String component = message.logMetadata() ? message.logMetadata()->component() : nullptr;
  if (component.isNull()) return bundleIdentifier_;
  return component.isEmpty() ? component : rt::format("%@.%@", bundleIdentifier_, component);
}
