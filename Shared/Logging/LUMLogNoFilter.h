#pragma once

/// Lets every message pass, for code that requires a filter.
///
///     rt::Ref<LUMLogFilter> filter = LUMLogNoFilter::init();
///
/// Not for: a logger's `filter`, which may be null instead.

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogFilter.h"

class RT_VISIBLE LUMLogNoFilter : public rt::Implements<LUMLogNoFilter, rt::Object, LUMLogFilter> {
 public:
  static rt::Ref<LUMLogNoFilter> init() { return rt::make<LUMLogNoFilter>(); }

  bool allowLogMessage(const LUMLogMessage& message) const override;
};
