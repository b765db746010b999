#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"

#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Process/Process.h"
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
