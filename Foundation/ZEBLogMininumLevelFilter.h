#pragma once

/// A filter that lets a line pass if its level is at least a given one.
///
///     logger->setFilter(ZEBLogMininumLevelFilter::initWithMinimumLevel(ZEBLogLevelError));
///
/// The spelling of the name is permanent, because classes are found by their names.

#include "Foundation/ZEBLogAllowedLevelFilter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogMininumLevelFilter final
    : public rt::Implements<ZEBLogMininumLevelFilter, ZEBLogAllowedLevelFilter> {
 public:
  /// Makes a filter that allows the levels `minimumLevel` to 4. Returns null if that is not from 0 to 4.
  static rt::Ref<ZEBLogMininumLevelFilter> initWithMinimumLevel(ZEBLogLevel minimumLevel);

 private:
  using Implements::Implements;
};
