#include "Foundation/ZEBLogMininumLevelFilter.h"

rt::Ref<ZEBLogMininumLevelFilter> ZEBLogMininumLevelFilter::initWithMinimumLevel(ZEBLogLevel minimumLevel) {
  if (!isLevel(minimumLevel)) return nullptr;
  const Levels levels = Levels().set() << static_cast<std::size_t>(minimumLevel);
  return rt::Ref<ZEBLogMininumLevelFilter>::adopt(new ZEBLogMininumLevelFilter(levels));
}
