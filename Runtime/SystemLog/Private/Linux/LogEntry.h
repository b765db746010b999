#pragma once

// What is handed to the daemons, and what becomes of it. Inside of the system log.

#include <cstdint>
#include <string_view>

#include "Runtime/SystemLog/SystemLog.h"

namespace rt::detail {

struct LogEntry {
  SystemLog::Type type = SystemLog::Type::info;
  std::string_view subsystem;
  std::string_view category;
  std::string_view text;
  /// For the entry that tells how many others were dropped; 0 in all others.
  std::uint64_t dropped = 0;
};

enum class Delivery : std::uint8_t {
  done,
  /// The destination is there but would not take it.
  refused,
  /// There is no such destination.
  absent,
};

/// The severity as the journal and the classic daemons number it.
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
