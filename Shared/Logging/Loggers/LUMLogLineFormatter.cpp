#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"

#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

rt::String LUMLogLineFormatter::formattedLogMessage(const LUMLogMessage& message) const {
  const LUMLogRenderedLine line(*this, message, "");
  return rt::String::fromUTF8Repaired(line.text());
}
