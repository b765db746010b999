#include "Runtime/SystemLog/SystemLog.h"

#include <utility>

namespace rt {

SystemLog::SystemLog(String subsystem, String category) noexcept
    : subsystem_(std::move(subsystem)), category_(std::move(category)) {}

}  // namespace rt
