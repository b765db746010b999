#pragma once

/// Lets a message pass that all of several filters let pass.
///
///     filter = LUMLogLogicalAndFilter::initWithFilters(rt::Array::of(
///         LUMLogComponentFilter::initWithComponent("Importer"_s),
///         LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError)));
///
/// Without any filter it lets nothing pass, unlike the "and" of logic: a list that came out empty by mistake
/// is rather silent than flooding.
///
/// Not for: one of them; see LUMLogLogicalOrFilter.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMLogFilter.h"

class RT_VISIBLE LUMLogLogicalAndFilter
    : public rt::Implements<LUMLogLogicalAndFilter, rt::Object, LUMLogFilter> {
 public:
  /// Of `filters`, which are asked in order until one refuses the message; what is no LUMLogFilter refuses
  /// all. Where there are none, or `filters` is null, nothing passes.
  static rt::Ref<LUMLogLogicalAndFilter> initWithFilters(rt::Ref<rt::Array> filters) {
    return rt::Ref<LUMLogLogicalAndFilter>::adopt(new LUMLogLogicalAndFilter(std::move(filters)));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;

 protected:
  explicit LUMLogLogicalAndFilter(rt::Ref<rt::Array> filters) noexcept : filters_(std::move(filters)) {}

 private:
  const rt::Ref<rt::Array> filters_;
};
