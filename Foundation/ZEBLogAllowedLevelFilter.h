#pragma once

/// A filter that lets the lines of a set of levels pass.
///
///     logger->setFilter(
///         ZEBLogAllowedLevelFilter::initWithAllowedLevels({ZEBLogLevelDebug, ZEBLogLevelError}));
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: levels other than those of Foundation/ZEBLogLevel.h. They never pass.

#include <bitset>
#include <set>

#include "Foundation/ZEBLogFilter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"

class RT_VISIBLE ZEBLogAllowedLevelFilter
    : public rt::Implements<ZEBLogAllowedLevelFilter, rt::Object, ZEBLogFilter> {
 public:
  /// Makes a filter that allows `allowedLevels`. Returns null if the set is empty or has a level that is not
  /// from 0 to 4.
  static rt::Ref<ZEBLogAllowedLevelFilter> initWithAllowedLevels(const std::set<ZEBLogLevel>& allowedLevels);

  /// Makes a filter that allows the levels 0 to 4.
  static rt::Ref<ZEBLogAllowedLevelFilter> init();

  /// Returns whether `level` is allowed.
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override;

 protected:
  using Levels = std::bitset<ZEBLogLevelAssert + 1>;

  explicit ZEBLogAllowedLevelFilter(Levels allowedLevels) noexcept : allowedLevels_(allowedLevels) {}

  static bool isLevel(ZEBLogLevel level) noexcept { return level >= 0 && level <= ZEBLogLevelAssert; }

 private:
  const Levels allowedLevels_;
};
