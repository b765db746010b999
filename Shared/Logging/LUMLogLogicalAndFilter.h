#pragma once

/// Lets a message pass if all of several filters let it pass.
///
///     filter = LUMLogLogicalAndFilter::initWithFilters(rt::Array::of(
///         LUMLogComponentFilter::initWithComponent("Importer"_s),
///         LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError)));
///
/// Without filters it lets nothing pass, although a logical "and" of nothing is true. A list that is empty by
/// mistake then silences a logger instead of flooding it.
///
/// Not for: messages that only one of the filters must let pass; see LUMLogLogicalOrFilter.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"

class RT_VISIBLE LUMLogLogicalAndFilter
    : public rt::Implements<LUMLogLogicalAndFilter, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  /// Makes a filter of `filters`, which are asked in order until one refuses the message. An element that is
  /// not a LUMLogFilter refuses every message. If `filters` is null or empty, nothing passes.
  static rt::Ref<LUMLogLogicalAndFilter> initWithFilters(rt::Ref<rt::Array> filters) {
    return rt::Ref<LUMLogLogicalAndFilter>::adopt(new LUMLogLogicalAndFilter(std::move(filters)));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;

 protected:
  explicit LUMLogLogicalAndFilter(rt::Ref<rt::Array> filters) noexcept : filters_(std::move(filters)) {}

 private:
  const rt::Ref<rt::Array> filters_;
};
