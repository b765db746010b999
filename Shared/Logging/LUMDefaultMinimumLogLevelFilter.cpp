#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"

#include "Runtime/Lazy.h"
#include "Runtime/Process.h"
#include "Runtime/String.h"
#include "Shared/Logging/LUMLogLevel.h"

namespace {

LUMLogLevel levelFromEnvironment() {
  const rt::String mode = rt::Process::environmentValue("OS_ACTIVITY_MODE");
  if (mode == "debug") return LUMLogLevelDebug;
  if (mode == "info") return LUMLogLevelInfo;
  return LUMLogLevelError;
}

}  // namespace

bool LUMDefaultMinimumLogLevelFilter::allowLogMessage(const LUMLogMessage& message) const {
  static constinit rt::Lazy<LUMLogLevel> threshold;
  return message.level() >= threshold.get(levelFromEnvironment);
}
