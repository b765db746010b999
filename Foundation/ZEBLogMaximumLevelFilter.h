#pragma once

/// A filter that lets a line pass if its level is at most a given one.
///
///     logger->setFilter(ZEBLogMaximumLevelFilter::initWithMaximumLevel(ZEBLogLevelInfo));

#include "Foundation/ZEBLogAllowedLevelFilter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogMaximumLevelFilter final
    : public rt::Implements<ZEBLogMaximumLevelFilter, ZEBLogAllowedLevelFilter> {
 public:
  /// Makes a filter that allows the levels 0 to `maximumLevel`. Returns null if that is not from 0 to 4.
  static rt::Ref<ZEBLogMaximumLevelFilter> initWithMaximumLevel(ZEBLogLevel maximumLevel);

 private:
  using Implements::Implements;
};
