#pragma once

/// A clock for durations: raw nanoseconds that never go back.
///
///     const std::uint64_t start = rt::MonotonicClock::nanoseconds();
///     work();
///     const std::uint64_t duration = rt::MonotonicClock::nanoseconds() - start;
///
/// Nobody sets the clock and nothing slews it, so durations can be compared. Its starting point is not
/// defined. On macOS it counts the time in which the machine sleeps. On Linux it does not.
///
/// Not for: the time of day (Runtime/Text/LocalTimeFormatter.h).

#include <cstdint>
#include <ctime>

namespace rt::MonotonicClock {

/// Returns the clock's time in nanoseconds. Allocates nothing. Does not call the kernel if the system maps
/// its clocks into the process, as Linux and macOS do.
///
/// Threads: any thread may call this.
inline std::uint64_t nanoseconds() noexcept {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC_RAW, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000U + static_cast<std::uint64_t>(now.tv_nsec);
}

}  // namespace rt::MonotonicClock
