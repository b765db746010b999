#include "Shared/Logging/Private/LUMLogEntryFields.h"

#include <charconv>

#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Dictionary.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/Private/LUMLogDescription.h"

LUMLogEntryFields::LUMLogEntryFields(const LUMLogMessage& message) {
  constexpr std::int64_t kNanosecondsPerMicrosecond = 1000;
  if (message.file()) add("CODE_FILE", message.file());
  if (message.line() != 0) addNumber("CODE_LINE", message.line());
  if (message.function()) add("CODE_FUNC", message.function());
  addNumber("TID", message.threadIdentifier());
  addNumber("REALTIME_TIMESTAMP", static_cast<std::uint64_t>(message.time() / kNanosecondsPerMicrosecond));
  if (!message.logMetadata()) return;
  for (const auto& [key, value] : *message.logMetadata()->properties()) {
    if (count_ == fields_.size()) break;
    const rt::String name = rt::String::from(key.get());
    if (name && !LUMLogMetadata::isPredefinedKey(name)) addProperty(name, *value);
  }
}

void LUMLogEntryFields::addNumber(std::string_view name, std::uint64_t value) noexcept {
  char* const begin = digits_.data() + digitCount_;
  char* const end = std::to_chars(begin, begin + kLongestNumber, value).ptr;
  digitCount_ += static_cast<std::size_t>(end - begin);
  add(name, {begin, end});
}

void LUMLogEntryFields::addProperty(const rt::String& key, const rt::Object& value) {
  if (const auto* string = rt::cast<rt::StringObject>(&value)) {
    add(key, string->view());
    return;
  }
  rt::String& description = descriptions_[count_];
  description = LUMLogDescriptionOf(value);
  add(key, description);
}
