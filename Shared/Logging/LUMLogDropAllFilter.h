#pragma once

/// Lets no message pass.
///
///     multiplexer->addLogFilter(LUMLogDropAllFilter::init());           // silence
///
/// Not for: silencing one logger for good. Remove that logger instead.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"

class RT_VISIBLE LUMLogDropAllFilter
    : public rt::Implements<LUMLogDropAllFilter, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  static rt::Ref<LUMLogDropAllFilter> init() { return rt::make<LUMLogDropAllFilter>(); }

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;
};
