#include "Shared/Logging/LUMSystemLoggerFormatter.h"

#include "Runtime/Text/Format.h"

rt::String LUMSystemLoggerFormatter::formattedLogMessage(const LUMLogMessage& message) const {
  if (message.function().isEmpty()) return message.formattedString();
  return rt::format("%@: %@", message.function(), message.formattedString());
}
