#pragma once

/// Lets a message pass if at least one of several filters lets it pass.
///
///     filter = LUMLogLogicalOrFilter::initWithFilters(rt::Array::of(
///         LUMLogComponentFilter::initWithComponent("Importer"_s),
///         LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError)));
///
/// Not for: messages that all of the filters must let pass; see LUMLogLogicalAndFilter.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"

class RT_VISIBLE LUMLogLogicalOrFilter
    : public rt::Implements<LUMLogLogicalOrFilter, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  /// Makes a filter of `filters`, which are asked in order until one lets the message pass. An element that
  /// is not a LUMLogFilter lets no message pass. If `filters` is null or empty, nothing passes.
  static rt::Ref<LUMLogLogicalOrFilter> initWithFilters(rt::Ref<rt::Array> filters) {
    return rt::Ref<LUMLogLogicalOrFilter>::adopt(new LUMLogLogicalOrFilter(std::move(filters)));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;

 protected:
  explicit LUMLogLogicalOrFilter(rt::Ref<rt::Array> filters) noexcept : filters_(std::move(filters)) {}

 private:
  const rt::Ref<rt::Array> filters_;
};
