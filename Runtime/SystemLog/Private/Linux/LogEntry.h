#pragma once

// An entry on its way to a daemon, and the result of delivering it. Internal to the system log.

#include <cstdint>
#include <span>
#include <string_view>

#include "Runtime/SystemLog/SystemLog.h"

namespace rt::detail {

struct LogEntry {
  SystemLog::Type type = SystemLog::Type::info;
  std::string_view subsystem;
  std::string_view category;
  std::string_view text;
  std::span<const SystemLog::Field> fields;
  /// The number of dropped entries that this entry reports. 0 if the entry is not such a report.
  std::uint64_t dropped = 0;
};

enum class Delivery : std::uint8_t {
  done,
  /// The destination exists but did not take the entry.
  refused,
  /// The destination does not exist.
  absent,
};

/// Returns the number that the journal and classic daemons use for this severity.
constexpr int severityOf(SystemLog::Type type) noexcept {
  switch (type) {
    case SystemLog::Type::debug:
      return 7;
    case SystemLog::Type::info:
      return 6;
    case SystemLog::Type::error:
      return 3;
    case SystemLog::Type::fault:
      break;
  }
  return 2;
}

constexpr std::string_view nameOf(SystemLog::Type type) noexcept {
  switch (type) {
    case SystemLog::Type::debug:
      return "debug";
    case SystemLog::Type::info:
      return "info";
    case SystemLog::Type::error:
      return "error";
    case SystemLog::Type::fault:
      break;
  }
  return "fault";
}

}  // namespace rt::detail
