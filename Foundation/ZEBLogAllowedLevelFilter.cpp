#include "Foundation/ZEBLogAllowedLevelFilter.h"

#include <algorithm>

rt::Ref<ZEBLogAllowedLevelFilter> ZEBLogAllowedLevelFilter::initWithAllowedLevels(
    const std::set<ZEBLogLevel>& allowedLevels) {
  if (allowedLevels.empty() || !std::ranges::all_of(allowedLevels, isLevel)) return nullptr;
  Levels levels;
  for (const ZEBLogLevel level : allowedLevels) levels.set(static_cast<std::size_t>(level));
  return rt::Ref<ZEBLogAllowedLevelFilter>::adopt(new ZEBLogAllowedLevelFilter(levels));
}

rt::Ref<ZEBLogAllowedLevelFilter> ZEBLogAllowedLevelFilter::init() {
  return rt::Ref<ZEBLogAllowedLevelFilter>::adopt(new ZEBLogAllowedLevelFilter(Levels().set()));
}

bool ZEBLogAllowedLevelFilter::filterAllowsMessage(const rt::String& /*message*/, ZEBLogLevel level) {
  return isLevel(level) && allowedLevels_[static_cast<std::size_t>(level)];
}
