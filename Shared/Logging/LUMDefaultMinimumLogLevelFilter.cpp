#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"

#include <atomic>

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

constinit rt::Lazy<LUMLogLevel> threshold;

// The threshold once it has been read. 0 before, since a filter that has not been asked may admit anything.
constinit std::atomic<LUMLogLevel> knownThreshold = 0;

}  // namespace

bool LUMDefaultMinimumLogLevelFilter::allowLogMessage(const LUMLogMessage& message) const {
  const LUMLogLevel level = threshold.get(levelFromEnvironment);
  if (knownThreshold.load(std::memory_order_relaxed) != level) [[unlikely]] {
    knownThreshold.store(level, std::memory_order_relaxed);
    LUMLogInterestChanged();
  }
  return message.level() >= level;
}

LUMLogLevel LUMDefaultMinimumLogLevelFilter::lowestLevel(const rt::String* /*component*/) const noexcept {
  return isExactly(*this) ? knownThreshold.load(std::memory_order_relaxed) : 0;
}
