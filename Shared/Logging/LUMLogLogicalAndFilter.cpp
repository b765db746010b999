#include "Shared/Logging/LUMLogLogicalAndFilter.h"

#include <algorithm>

bool LUMLogLogicalAndFilter::allowLogMessage(const LUMLogMessage& message) const {
  if (!filters_ || filters_->isEmpty()) return false;
  return std::ranges::all_of(*filters_, [&](const rt::Ref<rt::Object>& element) {
    const auto* filter = rt::cast<LUMLogFilter>(element.get());
    return filter != nullptr && filter->allowLogMessage(message);
  });
}

LUMLogLevel LUMLogLogicalAndFilter::lowestLevel(const rt::String* component) const noexcept {
  if (!isExactly(*this)) return 0;
  if (!filters_ || filters_->isEmpty()) return LUMLogLevelNone;
  LUMLogLevel lowest = 0;
  for (const rt::Ref<rt::Object>& element : *filters_) {
    const auto* filter = rt::cast<LUMLogFilter>(element.get());
    lowest = std::max(lowest, filter != nullptr ? LUMLogLowestLevel(filter, component) : LUMLogLevelNone);
  }
  return lowest;
}
