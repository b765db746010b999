#include "Shared/Logging/LUMLogLogicalOrFilter.h"

#include <algorithm>

bool LUMLogLogicalOrFilter::allowLogMessage(const LUMLogMessage& message) const {
  return filters_ && std::ranges::any_of(*filters_, [&](const rt::Ref<rt::Object>& element) {
           const auto* filter = rt::cast<LUMLogFilter>(element.get());
           return filter != nullptr && filter->allowLogMessage(message);
         });
}

LUMLogLevel LUMLogLogicalOrFilter::lowestLevel(const rt::String* component) const noexcept {
  if (!isExactly(*this)) return 0;
  LUMLogLevel lowest = LUMLogLevelNone;
  if (!filters_) return lowest;
  for (const rt::Ref<rt::Object>& element : *filters_) {
    if (const auto* filter = rt::cast<LUMLogFilter>(element.get()))
      lowest = std::min(lowest, LUMLogLowestLevel(filter, component));
  }
  return lowest;
}
