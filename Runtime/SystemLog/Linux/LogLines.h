#pragma once

// Writes entries as lines of text, if there is no journal. Internal to the system log.

#include "Runtime/SystemLog/Linux/LogEntry.h"
#include "Runtime/SystemLog/Linux/Patience.h"

namespace rt::detail {

/// Sends `entry` to the classic daemon at /dev/log, in as many packets as it needs. Throws std::bad_alloc.
Delivery writeToSyslog(const LogEntry& entry, const Patience& patience);

/// Writes `entry` as one line to standard error. Returns `refused` if standard error is closed, has no
/// reader, or does not take the whole line in time. Throws std::bad_alloc.
/// Threads: thread-safe. Lines of different threads do not mix in a file. In a pipe they do not mix up to
/// 4096 bytes, which it takes in one piece.
Delivery writeToStandardError(const LogEntry& entry, const Patience& patience);

}  // namespace rt::detail
