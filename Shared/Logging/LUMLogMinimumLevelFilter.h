#pragma once

/// Lets a message pass if its level is at least a given one.
///
///     multiplexer->addLogFilter(LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError));
///
/// Not for: a level that the environment chooses; see LUMDefaultMinimumLogLevelFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMLogLevel.h"

class RT_VISIBLE LUMLogMinimumLevelFilter
    : public rt::Implements<LUMLogMinimumLevelFilter, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  static rt::Ref<LUMLogMinimumLevelFilter> initWithMinimumLevel(LUMLogLevel minimumLevel) {
    return rt::Ref<LUMLogMinimumLevelFilter>::adopt(new LUMLogMinimumLevelFilter(minimumLevel));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;

 protected:
  explicit LUMLogMinimumLevelFilter(LUMLogLevel minimumLevel) noexcept : minimumLevel_(minimumLevel) {}

 private:
  const LUMLogLevel minimumLevel_;
};
