#pragma once

/// Lets messages pass from a minimum level on, which the environment variable OS_ACTIVITY_MODE sets. The
/// minimum is LUMLogLevelDebug for "debug", LUMLogLevelInfo for "info", and LUMLogLevelError otherwise.
///
///     rt::Ref<LUMSystemLogger> logger =
///         LUMSystemLogger::initWithFilter(LUMDefaultMinimumLogLevelFilter::init());
///
/// The variable is read once per process, when the first such filter is asked.
///
/// Not for: a level that the program chooses; see LUMLogMinimumLevelFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"

class RT_VISIBLE LUMDefaultMinimumLogLevelFilter
    : public rt::Implements<LUMDefaultMinimumLogLevelFilter, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  static rt::Ref<LUMDefaultMinimumLogLevelFilter> init() {
    return rt::make<LUMDefaultMinimumLogLevelFilter>();
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;
};
