#pragma once

/// A filter that lets every line pass. It is the default of a logger.
///
///     logger->setFilter(rt::make<ZEBLogNoFilter>());
///
/// Threads: thread-safe.

#include "Foundation/ZEBLogFilter.h"
#include "Runtime/Base/Visibility.h"

class RT_VISIBLE ZEBLogNoFilter final : public rt::Implements<ZEBLogNoFilter, rt::Object, ZEBLogFilter> {
 public:
  /// Returns true.
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override;
};
