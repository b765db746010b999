#pragma once

/// The filter that lets the lines of some levels pass.
///
///     logger->setFilter(
///         ZEBLogAllowedLevelFilter::initWithAllowedLevels({ZEBLogLevelDebug, ZEBLogLevelError}));
///
/// It is immutable: any thread may use it.
///
/// Not for: levels beyond those of Foundation/ZEBLogLevel.h, which never pass.

#include <bitset>
#include <set>

#include "Foundation/ZEBLogFilter.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"

class RT_VISIBLE ZEBLogAllowedLevelFilter
    : public rt::Implements<ZEBLogAllowedLevelFilter, rt::Object, ZEBLogFilter> {
 public:
  /// One that allows `allowedLevels`; null where there are none, or one of them is not from 0 to 4.
  static rt::Ref<ZEBLogAllowedLevelFilter> initWithAllowedLevels(const std::set<ZEBLogLevel>& allowedLevels);

  /// One that allows the levels 0 to 4.
  static rt::Ref<ZEBLogAllowedLevelFilter> init();

  /// Whether `level` is one of the allowed levels.
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override;

 protected:
  using Levels = std::bitset<ZEBLogLevelAssert + 1>;

  explicit ZEBLogAllowedLevelFilter(Levels allowedLevels) noexcept : allowedLevels_(allowedLevels) {}

  static bool isLevel(ZEBLogLevel level) noexcept { return level >= 0 && level <= ZEBLogLevelAssert; }

 private:
  const Levels allowedLevels_;
};
