#pragma once

/// Lets pass what the environment asks for: from LUMLogLevelDebug on where OS_ACTIVITY_MODE is "debug", from
/// LUMLogLevelInfo on where it is "info", else from LUMLogLevelError on.
///
///     rt::Ref<LUMSystemLogger> logger =
///         LUMSystemLogger::initWithFilter(LUMDefaultMinimumLogLevelFilter::init());
///
/// The environment is read once in a process, the first time that any such filter is asked.
///
/// Not for: a level that the program decides; see LUMLogMinimumLevelFilter.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"

class RT_VISIBLE LUMDefaultMinimumLogLevelFilter
    : public rt::Implements<LUMDefaultMinimumLogLevelFilter, rt::Object, LUMLogFilter> {
 public:
  static rt::Ref<LUMDefaultMinimumLogLevelFilter> init() {
    return rt::make<LUMDefaultMinimumLogLevelFilter>();
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;
};
