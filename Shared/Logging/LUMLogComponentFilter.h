#pragma once

/// Lets the messages of one component pass: those whose metadata names it.
///
///     multiplexer->addLogFilter(LUMLogComponentFilter::initWithComponent("Importer"_s));
///     const auto importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
///     LUMLogAt(LUMLogLevelInfo, importer, "started"_s);      // passes
///     LUMLogAt(LUMLogLevelInfo, "started"_s);                // does not
///
/// Not for: categories or other metadata, which take a filter of one's own.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"

class RT_VISIBLE LUMLogComponentFilter
    : public rt::Implements<LUMLogComponentFilter, rt::Object, LUMLogFilter> {
 public:
  /// Lets nothing pass if `component` is null: a message without metadata or without a component has none
  /// that could be equal.
  static rt::Ref<LUMLogComponentFilter> initWithComponent(rt::String component) {
    return rt::Ref<LUMLogComponentFilter>::adopt(new LUMLogComponentFilter(std::move(component)));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;

 protected:
  explicit LUMLogComponentFilter(rt::String component) noexcept : component_(std::move(component)) {}

 private:
  const rt::String component_;
};
