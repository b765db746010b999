#pragma once

/// Lets messages of a level pass, and of all levels above it.
///
///     multiplexer->addLogFilter(LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError));
///
/// Not for: what the environment is to decide; see LUMDefaultMinimumLogLevelFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogLevel.h"

class RT_VISIBLE LUMLogMinimumLevelFilter
    : public rt::Implements<LUMLogMinimumLevelFilter, rt::Object, LUMLogFilter> {
 public:
  static rt::Ref<LUMLogMinimumLevelFilter> initWithMinimumLevel(LUMLogLevel minimumLevel) {
    return rt::Ref<LUMLogMinimumLevelFilter>::adopt(new LUMLogMinimumLevelFilter(minimumLevel));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;

 protected:
  explicit LUMLogMinimumLevelFilter(LUMLogLevel minimumLevel) noexcept : minimumLevel_(minimumLevel) {}

 private:
  const LUMLogLevel minimumLevel_;
};
