#pragma once

// Entries as lines of text, for where no journal is. Inside of the system log.

#include "Runtime/SystemLog/Private/Linux/LogEntry.h"
#include "Runtime/SystemLog/Private/Linux/Patience.h"

namespace rt::detail {

/// Sends `entry` to the classic daemon at /dev/log, in as many packets as it takes. Throws std::bad_alloc.
Delivery writeToSyslog(const LogEntry& entry, const Patience& patience);

/// Writes `entry` as one line to standard error. Refused where nobody reads it or it is closed. The
/// lines of different threads stay apart as long as they are not longer than a pipe takes in one piece
/// (4096 bytes) or standard error is a file. Throws std::bad_alloc.
Delivery writeToStandardError(const LogEntry& entry, const Patience& patience);

}  // namespace rt::detail
