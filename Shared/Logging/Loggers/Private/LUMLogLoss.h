#pragma once

// What a logger writes about the lines that it has lost. Internal to the loggers.

#include <cstdint>

#include "Runtime/Objects/Ref.h"
#include "Shared/Logging/LUMLogMessage.h"

/// Returns an error that says how many lines were lost, and why, as the system numbers errors: "2 lines were
/// lost: No space left on device". Throws std::bad_alloc.
rt::Ref<LUMLogMessage> LUMLogLossMessage(std::uint64_t count, int error);
