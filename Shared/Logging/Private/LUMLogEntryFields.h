#pragma once

// What the system's log stores of a message beside its text. Internal to LUMSystemLogger.
//
// These are CODE_FILE, CODE_LINE, CODE_FUNC, TID, REALTIME_TIMESTAMP (in microseconds since 1970), and the
// properties of the metadata but for those with predefined keys.

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "Runtime/Objects/String.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "Shared/Logging/LUMLogMessage.h"

/// The fields of a message, which outlives them.
class LUMLogEntryFields {
 public:
  explicit LUMLogEntryFields(const LUMLogMessage& message);
  LUMLogEntryFields(const LUMLogEntryFields&) = delete;
  LUMLogEntryFields& operator=(const LUMLogEntryFields&) = delete;

  std::span<const rt::SystemLog::Field> fields() const noexcept { return {fields_.data(), count_}; }

 private:
  static constexpr std::size_t kLongestNumber = 20;

  void add(std::string_view name, std::string_view value) noexcept { fields_[count_++] = {name, value}; }
  void addNumber(std::string_view name, std::uint64_t value) noexcept;
  void addProperty(const rt::String& key, const rt::Object& value);

  std::array<rt::SystemLog::Field, rt::SystemLog::kMostFields> fields_{};
  std::size_t count_ = 0;
  std::array<char, 3 * kLongestNumber> digits_{};
  std::size_t digitCount_ = 0;
  std::array<rt::String, rt::SystemLog::kMostFields> descriptions_;
};
