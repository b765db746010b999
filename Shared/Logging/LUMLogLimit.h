#pragma once

/// Limits how often a line of the program logs.
///
///     static constinit LUMLogLimit limit = LUMLogLimit::onePer(60);        // seconds
///     if (limit.allows())
///       LUMLogAt(LUMLogLevelError, "the disk is full (%lu more since the last line)"_s, limit.skipped());
///
/// Make it a static variable beside the line, so that it counts this line alone.
///
/// Threads: any thread may use it, also several at once. Takes no lock and allocates nothing. It may be used
/// while the program is being loaded and while it exits.
///
/// Not for: limits for a component or a logger. Write a filter for these.

#include <algorithm>
#include <atomic>
#include <cstdint>

#include "Runtime/Base/Visibility.h"

class RT_VISIBLE LUMLogLimit {
 public:
  /// Allows the first time only.
  static constexpr LUMLogLimit once() noexcept { return {Kind::once, 0}; }

  /// Allows the first time, and then each `count`-th. A `count` of 0 counts as 1, which allows always.
  static constexpr LUMLogLimit everyNth(std::uint64_t count) noexcept {
    return {Kind::everyNth, count != 0 ? count : 1};
  }

  /// Allows the first time, and then once `seconds` have passed since the last time that it allowed. A number
  /// below 0 counts as 0, and one above a hundred years as that.
  static constexpr LUMLogLimit onePer(double seconds) noexcept {
    constexpr double kLongest = 100.0 * 366 * 24 * 60 * 60;
    const double limited = seconds > 0 ? std::min(seconds, kLongest) : 0;
    return {Kind::onePer, static_cast<std::uint64_t>(limited * 1e9)};
  }

  LUMLogLimit(const LUMLogLimit&) = delete;
  LUMLogLimit& operator=(const LUMLogLimit&) = delete;

  /// Returns whether the line may be logged now, and counts the call.
  bool allows() noexcept;

  /// Returns how many calls were refused between the last two that were allowed. After an allowed call, that
  /// is the number of lines that its message stands for, less itself.
  std::uint64_t skipped() const noexcept { return skipped_.load(std::memory_order_relaxed); }

 private:
  enum class Kind : std::uint8_t { once, everyNth, onePer };

  constexpr LUMLogLimit(Kind kind, std::uint64_t amount) noexcept : kind_(kind), amount_(amount) {}

  bool isDue() noexcept;

  const Kind kind_;
  const std::uint64_t amount_;  // Calls or nanoseconds.
  // The number of calls, or the time from which the next one is allowed.
  std::atomic<std::uint64_t> state_ = 0;
  std::atomic<std::uint64_t> refused_ = 0;
  std::atomic<std::uint64_t> skipped_ = 0;
};
