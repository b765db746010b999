#pragma once

// Writes to the journal in its native protocol. Internal to the system log.

#include "Runtime/SystemLog/Linux/LogEntry.h"
#include "Runtime/SystemLog/Linux/Patience.h"

namespace rt::detail {

/// Writes `entry` to the journal. Allocates nothing.
Delivery writeToJournal(const LogEntry& entry, const Patience& patience) noexcept;

}  // namespace rt::detail
