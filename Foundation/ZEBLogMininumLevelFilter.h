#pragma once

/// The filter that lets the lines of a level, and of those above it, pass.
///
///     logger->setFilter(ZEBLogMininumLevelFilter::initWithMinimumLevel(ZEBLogLevelError));
///
/// Its name is spelled like this for good: classes are found by their names.

#include "Foundation/ZEBLogAllowedLevelFilter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogMininumLevelFilter final
    : public rt::Implements<ZEBLogMininumLevelFilter, ZEBLogAllowedLevelFilter> {
 public:
  /// One that allows the levels `minimumLevel` to 4; null where that is not from 0 to 4.
  static rt::Ref<ZEBLogMininumLevelFilter> initWithMinimumLevel(ZEBLogLevel minimumLevel);

 private:
  using Implements::Implements;
};
