#include "Shared/Logging/LUMLogLogicalOrFilter.h"

#include <algorithm>

bool LUMLogLogicalOrFilter::allowLogMessage(const LUMLogMessage& message) const {
  return filters_ && std::ranges::any_of(*filters_, [&](const rt::Ref<rt::Object>& element) {
           const auto* filter = rt::cast<LUMLogFilter>(element.get());
           return filter != nullptr && filter->allowLogMessage(message);
         });
}
