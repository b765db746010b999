#pragma once

/// Lets no message pass.
///
///     multiplexer->addLogFilter(LUMLogDropAllFilter::init());           // silence
///
/// Not for: a logger that is to hear nothing any more, which is removed.

#include "Runtime/Class.h"
#include "Runtime/Object.h"
#include "Runtime/Ref.h"
#include "Runtime/Visibility.h"
#include "Shared/Logging/LUMLogFilter.h"

class RT_VISIBLE LUMLogDropAllFilter : public rt::Implements<LUMLogDropAllFilter, rt::Object, LUMLogFilter> {
 public:
  static rt::Ref<LUMLogDropAllFilter> init() { return rt::make<LUMLogDropAllFilter>(); }

  bool allowLogMessage(const LUMLogMessage& message) const override;
};
