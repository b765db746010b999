#include "Runtime/SystemLog/SystemLog.h"

#include <os/log.h>

#include <string>

namespace rt {

namespace {

// The system caches one object for each subsystem and category, so there is no need to keep it here.
os_log_t logOf(const String& subsystem, const String& category) {
  return os_log_create(std::string(subsystem.view()).c_str(), std::string(category.view()).c_str());
}

os_log_type_t typeOf(SystemLog::Type type) {
  switch (type) {
    case SystemLog::Type::debug:
      return OS_LOG_TYPE_DEBUG;
    case SystemLog::Type::info:
      return OS_LOG_TYPE_INFO;
    case SystemLog::Type::error:
      return OS_LOG_TYPE_ERROR;
    case SystemLog::Type::fault:
      break;
  }
  return OS_LOG_TYPE_FAULT;
}

}  // namespace

bool SystemLog::isEnabled(Type type) const noexcept {
  return os_log_type_enabled(logOf(subsystem_, category_), typeOf(type));
}

void SystemLog::write(Type type, std::string_view text) const noexcept {
  // The unified log takes text that ends with NUL, and cuts long text.
  os_log_with_type(logOf(subsystem_, category_), typeOf(type), "%{public}s", std::string(text).c_str());
}

std::uint64_t SystemLog::droppedCount() noexcept {
  return 0;
}

}  // namespace rt
