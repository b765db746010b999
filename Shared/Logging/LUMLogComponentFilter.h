#pragma once

/// Lets a message pass if its metadata names a given component.
///
///     multiplexer->addLogFilter(LUMLogComponentFilter::initWithComponent("Importer"_s));
///     const auto importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
///     LUMLogAt(LUMLogLevelInfo, importer, "started"_s);      // passes
///     LUMLogAt(LUMLogLevelInfo, "started"_s);                // does not
///
/// Not for: categories or other metadata. Write a filter for them.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogFilter.h"
#include "Shared/Logging/LUMLogInterest.h"

class RT_VISIBLE LUMLogComponentFilter
    : public rt::Implements<LUMLogComponentFilter, rt::Object, LUMLogFilter, LUMLogInterest> {
 public:
  /// Makes a filter for `component`. If `component` is null, no message passes, not even one without a
  /// component.
  static rt::Ref<LUMLogComponentFilter> initWithComponent(rt::String component) {
    return rt::Ref<LUMLogComponentFilter>::adopt(new LUMLogComponentFilter(std::move(component)));
  }

  bool allowLogMessage(const LUMLogMessage& message) const override;
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override;

 protected:
  explicit LUMLogComponentFilter(rt::String component) noexcept : component_(std::move(component)) {}

 private:
  const rt::String component_;
};
