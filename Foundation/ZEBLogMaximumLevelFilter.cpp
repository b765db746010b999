#include "Foundation/ZEBLogMaximumLevelFilter.h"

rt::Ref<ZEBLogMaximumLevelFilter> ZEBLogMaximumLevelFilter::initWithMaximumLevel(ZEBLogLevel maximumLevel) {
  if (!isLevel(maximumLevel)) return nullptr;
  const Levels levels = Levels().set() >> static_cast<std::size_t>(ZEBLogLevelAssert - maximumLevel);
  return rt::Ref<ZEBLogMaximumLevelFilter>::adopt(new ZEBLogMaximumLevelFilter(levels));
}
