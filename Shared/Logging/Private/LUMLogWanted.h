#pragma once

// Which messages the shared multiplexer wants, in the form that `LUMLogAt` reads: the lowest level of all
// messages, and the lowest level of those without metadata. The answer for a component is kept in the
// metadata that names it.
//
// While filters and loggers change, a level may be that of before or after the change. Before the shared
// multiplexer is made, everything is wanted.

#include <atomic>
#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMetadata.h"

class LUMLogMultiplexer;

class RT_VISIBLE LUMLogWanted {
 public:
  /// Returns whether somebody may want a message of this level. `metadata` may be null.
  [[gnu::always_inline]] static bool isWanted(LUMLogLevel level,
                                              const rt::Ref<LUMLogMetadata>& metadata) noexcept {
    if (!isWanted(level)) return false;
    const bool isOfCall = metadata ? isWantedOf(*metadata, level)
                                   : level >= lowestWithoutMetadata_.load(std::memory_order_relaxed);
    return isOfCall || isWantedInScope(level);
  }

  /// Returns whether somebody may want a message of this level and any component.
  [[gnu::always_inline]] static bool isWanted(LUMLogLevel level) noexcept {
    return level >= lowest_.load(std::memory_order_relaxed);
  }

  /// Asks the filters and loggers of `shared`, the shared multiplexer, from now on.
  static void attach(const LUMLogMultiplexer& shared) noexcept;

  /// Asks them again. Does nothing before `attach`.
  static void refresh() noexcept;

 private:
  static bool isWantedOf(const LUMLogMetadata& metadata, LUMLogLevel level) noexcept;
  // The component may be that of the calling thread's scopes.
  static bool isWantedInScope(LUMLogLevel level) noexcept;

  static constinit std::atomic<LUMLogLevel> lowest_;
  static constinit std::atomic<LUMLogLevel> lowestWithoutMetadata_;
};
