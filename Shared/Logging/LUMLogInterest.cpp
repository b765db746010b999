#include "Shared/Logging/LUMLogInterest.h"

LUMLogLevel LUMLogLowestLevel(const LUMLogFilter* filter, const rt::String* component) noexcept {
  const auto* interest = rt::cast<LUMLogInterest>(filter);
  return interest != nullptr ? interest->lowestLevel(component) : 0;
}
