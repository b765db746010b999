#pragma once

#include <atomic>
#include <ctime>

/// A callback that changes the times which the system's clocks report. Link `clock-hook`:
///
///     clockHook = [](clockid_t clock, timespec& time) {
///       if (clock == CLOCK_REALTIME) time.tv_sec += 3;
///     };
///
/// `clock_gettime` calls it on the calling thread, with the system's time, which it may change. The clocks of
/// the C++ library use `clock_gettime`. Other system calls still use the real clocks. Null changes nothing
/// and is the default.
using ClockHook = void (*)(clockid_t clock, timespec& time);

extern constinit std::atomic<ClockHook> clockHook;
