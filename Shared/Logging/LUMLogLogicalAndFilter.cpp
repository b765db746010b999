#include "Shared/Logging/LUMLogLogicalAndFilter.h"

#include <algorithm>

bool LUMLogLogicalAndFilter::allowLogMessage(const LUMLogMessage& message) const {
  if (!filters_ || filters_->isEmpty()) return false;
  return std::ranges::all_of(*filters_, [&](const rt::Ref<rt::Object>& element) {
    const auto* filter = rt::cast<LUMLogFilter>(element.get());
    return filter != nullptr && filter->allowLogMessage(message);
  });
}
