#pragma once

/// The clock for durations: raw nanoseconds that only go forward.
///
///     const std::uint64_t start = rt::MonotonicClock::nanoseconds();
///     work();
///     const std::uint64_t duration = rt::MonotonicClock::nanoseconds() - start;
///
/// Nobody sets it and nothing slews it, so that two durations can be compared. Where it starts is not
/// defined. The time in which the machine sleeps is counted on macOS, not on Linux.
///
/// Not for: the time of day (Runtime/Text/Private/LocalTimeFormatter.h).

#include <cstdint>
#include <ctime>

namespace rt::MonotonicClock {

/// The clock, in nanoseconds. Any thread may call it; it allocates nothing and, where the system maps its
/// clocks into the process, as Linux and macOS do, asks the kernel nothing.
inline std::uint64_t nanoseconds() noexcept {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC_RAW, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000U + static_cast<std::uint64_t>(now.tv_nsec);
}

}  // namespace rt::MonotonicClock
