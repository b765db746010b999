#pragma once

// The distance of local time from UTC, cheap enough for each line of a log. Internal to the loggers.
//
//     | const std::int64_t local = second + LUMLogLocalOffset::secondsAt(second, line.caller());
//
// The process knows one offset at a time, that of a quarter of an hour. Time zones change their offset at the
// start of a quarter. So a line costs one load, and one line a quarter asks the system.

#include <cstdint>

#include "Shared/Logging/Loggers/LUMLogLine.h"

namespace LUMLogLocalOffset {

/// Returns by how many seconds local time is ahead of UTC at `second`, which counts from the start of 1970.
///
/// The zone is that of the environment variable TZ, else that of the system. A change of either takes effect
/// at the next quarter of an hour. In a signal handler the result is the offset that was asked for last,
/// since asking the system is not safe there.
///
/// Threads: any thread may call this, also in the child of a fork.
std::int32_t secondsAt(std::int64_t second, LUMLogLine::Caller caller) noexcept;

}  // namespace LUMLogLocalOffset
