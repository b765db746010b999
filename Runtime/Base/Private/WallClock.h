#pragma once

/// The time of day, for records that are made often.
///
///     const std::int64_t time = rt::WallClock::nanoseconds();
///
/// Not for: durations, since the clock may be set (Runtime/Base/Private/MonotonicClock.h).

#include <cstdint>

namespace rt::WallClock {

/// Returns the nanoseconds since the start of 1970, in UTC. Allocates nothing and takes no lock.
///
/// The result differs from the system's own clock by less than a microsecond as a rule, and by a millisecond
/// at most. Two calls on different threads may therefore seem to be in the wrong order. A change of the
/// system's clock is seen after a millisecond at the latest.
///
/// Threads: any thread may call this, also in a signal handler.
std::int64_t nanoseconds() noexcept;

}  // namespace rt::WallClock
