#include "Shared/Logging/Loggers/LUMLogLine.h"

#include <algorithm>
#include <array>
#include <charconv>

#include "Runtime/Objects/String.h"
#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/Private/LUMLogDescription.h"

namespace {

bool isControl(char character) noexcept {
  const auto code = static_cast<unsigned char>(character);
  return code < 0x20 || code == 0x7F;
}

}  // namespace

void LUMLogLine::append(std::size_t count, char byte) noexcept {
  if (length_ < place_.size()) {
    std::memset(place_.data() + length_, byte, std::min(count, place_.size() - length_));
  }
  length_ += count;
}

void LUMLogLine::appendEscaped(std::string_view text) noexcept {
  constexpr std::string_view kDigits = "0123456789abcdef";
  while (!text.empty()) {
    const auto plain = static_cast<std::size_t>(std::ranges::find_if(text, isControl) - text.begin());
    append(text.substr(0, plain));
    if (plain == text.size()) return;
    const auto code = static_cast<unsigned char>(text[plain]);
    if (code == '\n') {
      append("\\n");
    } else if (code == '\t') {
      append("\\t");
    } else {
      append("\\x");
      append(kDigits[code >> 4U]);
      append(kDigits[code & 0xFU]);
    }
    text.remove_prefix(plain + 1);
  }
}

void LUMLogLine::appendNumber(std::int64_t value) noexcept {
  if (value < 0) append('-');
  appendUnsigned(value < 0 ? 0 - static_cast<std::uint64_t>(value) : static_cast<std::uint64_t>(value));
}

void LUMLogLine::appendUnsigned(std::uint64_t value, std::size_t width) noexcept {
  std::array<char, 20> digits{};
  const char* const end = std::to_chars(digits.data(), digits.data() + digits.size(), value).ptr;
  const auto count = static_cast<std::size_t>(end - digits.data());
  if (count < width) append(width - count, '0');
  append({digits.data(), count});
}

void LUMLogLine::withText(const rt::Object* object, void (*use)(void* given, std::string_view text),
                          void* given) const {
  if (object == nullptr) return use(given, "(null)");
  if (const auto* string = rt::cast<rt::StringObject>(object)) return use(given, string->view());
  if (caller_ == Caller::kSignalHandler) {
    std::array<char, 64> place{};
    LUMLogLine text(place, caller_);
    if (const auto* number = rt::cast<rt::Number>(object)) {
      switch (number->kind()) {
        case rt::Number::Kind::kUnsigned:
          text.appendUnsigned(number->unsignedValue());
          break;
        case rt::Number::Kind::kReal: {
          // `to_chars` without a precision needs no memory.
          const auto end = std::to_chars(place.data(), place.data() + place.size(), number->realValue());
          return use(given, {place.data(), end.ptr});
        }
        case rt::Number::Kind::kBoolean:
        case rt::Number::Kind::kSigned:
          text.appendNumber(number->integerValue());
          break;
      }
    } else {
      text.append('[');
      text.append(object->classInfo().name);
      text.append(']');
    }
    return use(given, text.text());
  }
  use(given, LUMLogDescriptionOf(*object));
}
