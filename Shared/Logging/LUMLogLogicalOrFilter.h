#pragma once

/// Lets a message pass that one of several filters lets pass.
///
///     filter = LUMLogLogicalOrFilter::initWithFilters(rt::Array::of(
///         LUMLogComponentFilter::initWithComponent("Importer"_s),
///         LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError)));
///
/// Not for: all of them; see LUMLogLogicalAndFilter.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogFilter.h"

class RT_VISIBLE LUMLogLogicalOrFilter
    : public rt::Implements<LUMLogLogicalOrFilter, rt::Object, LUMLogFilter> {
 public:
  /// Of `filters`, which are asked in order until one lets the message pass; what is no LUMLogFilter lets
  /// none pass. Where there are none, or `filters` is null, nothing passes.
  static rt::Ref<LUMLogLogicalOrFilter> initWithFilters(rt::Ref<rt::Array> filters) {
    return rt::Ref<LUMLogLogicalOrFilter>::adopt(new LUMLogLogicalOrFilter(std::move(filters)));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;

 protected:
  explicit LUMLogLogicalOrFilter(rt::Ref<rt::Array> filters) noexcept : filters_(std::move(filters)) {}

 private:
  const rt::Ref<rt::Array> filters_;
};
