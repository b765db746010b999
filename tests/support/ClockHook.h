#pragma once

#include <atomic>
#include <ctime>

/// What a test program has the system's clocks say. Link `clock-hook`:
///
///     clockHook = [](clockid_t clock, timespec& time) {
///       if (clock == CLOCK_REALTIME) time.tv_sec += 3;
///     };
///
/// It is called on every thread that reads a clock by `clock_gettime`, as the clocks of the C++ library do.
/// It gets what the system says, and may change it. The other calls of the system keep to the system's
/// clocks. Null, as at the start, changes nothing.
using ClockHook = void (*)(clockid_t clock, timespec& time);

extern constinit std::atomic<ClockHook> clockHook;
