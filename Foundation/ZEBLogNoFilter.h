#pragma once

/// The filter that lets every line pass: what a logger has that was given none.
///
///     logger->setFilter(rt::make<ZEBLogNoFilter>());
///
/// Any thread may use it.

#include "Foundation/ZEBLogFilter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogNoFilter final : public rt::Implements<ZEBLogNoFilter, rt::Object, ZEBLogFilter> {
 public:
  /// True.
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override;
};
