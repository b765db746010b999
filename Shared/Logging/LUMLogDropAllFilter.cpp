#include "Shared/Logging/LUMLogDropAllFilter.h"

bool LUMLogDropAllFilter::allowLogMessage(const LUMLogMessage& /*message*/) const {
  return false;
}

LUMLogLevel LUMLogDropAllFilter::lowestLevel(const rt::String* /*component*/) const noexcept {
  return isExactly(*this) ? LUMLogLevelNone : 0;
}
