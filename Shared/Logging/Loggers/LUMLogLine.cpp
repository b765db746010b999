#include "Shared/Logging/Loggers/LUMLogLine.h"

#include <algorithm>
#include <array>
#include <charconv>

#include "Runtime/Objects/String.h"
#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/Private/LUMLogDescription.h"

namespace {

// The first byte of U+0080 to U+00BF, of which those up to U+009F are control characters, too.
constexpr unsigned char kLatin = 0xC2;

unsigned char codeAt(std::string_view text, std::size_t place) noexcept {
  return place < text.size() ? static_cast<unsigned char>(text[place]) : 0;
}

bool isControlAt(std::string_view text, std::size_t place) noexcept {
  const unsigned char code = codeAt(text, place);
  if (code == kLatin) return codeAt(text, place + 1) >= 0x80 && codeAt(text, place + 1) < 0xA0;
  return code < 0x20 || code == 0x7F;
}

using Word = std::uint64_t;

// Returns whether one of the eight bytes at `bytes` may begin a control character.
bool hasControl(const char* bytes) noexcept {
  constexpr Word kOnes = 0x0101010101010101;
  constexpr Word kHighBits = 0x80 * kOnes;
  Word word = 0;
  std::memcpy(&word, bytes, sizeof(Word));
  const Word deletes = word ^ (0x7F * kOnes);
  // Subtracting a limit sets the highest bit of a byte below it, and then perhaps that of bytes behind it.
  const Word latins = word ^ (kLatin * kOnes);
  const Word found =
      ((word - (0x20 * kOnes)) & ~word) | ((deletes - kOnes) & ~deletes) | ((latins - kOnes) & ~latins);
  return (found & kHighBits) != 0;
}

// Returns how many bytes come before the first control character.
std::size_t plainLength(std::string_view text) noexcept {
  std::size_t length = 0;
  while (text.size() - length >= sizeof(Word) && !hasControl(text.data() + length)) length += sizeof(Word);
  // The last eight bytes may overlap with those before them.
  if (length > 0 && text.size() - length < sizeof(Word) &&
      !hasControl(text.data() + text.size() - sizeof(Word))) {
    return text.size();
  }
  while (length < text.size() && !isControlAt(text, length)) ++length;
  return length;
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
    const std::size_t plain = plainLength(text);
    append(text.substr(0, plain));
    if (plain == text.size()) return;
    // The control characters beyond ASCII have two bytes, the second of which is their code.
    const std::size_t last = codeAt(text, plain) == kLatin ? plain + 1 : plain;
    const unsigned char code = codeAt(text, last);
    if (code == '\n') {
      append("\\n");
    } else if (code == '\t') {
      append("\\t");
    } else {
      append("\\x");
      append(kDigits[code >> 4U]);
      append(kDigits[code & 0xFU]);
    }
    text.remove_prefix(last + 1);
  }
}

void LUMLogLine::appendNumber(std::int64_t value) noexcept {
  if (value < 0) append('-');
  appendUnsigned(value < 0 ? 0 - static_cast<std::uint64_t>(value) : static_cast<std::uint64_t>(value));
}

void LUMLogLine::appendUnsigned(std::uint64_t value, std::size_t width) noexcept {
  std::array<char, 20> digits;  // NOLINT(cppcoreguidelines-pro-type-member-init): filled from the end
  std::size_t count = 0;
  do {
    digits[digits.size() - ++count] = static_cast<char>('0' + (value % 10));
    value /= 10;
  } while (value > 0);
  if (count < width) append(width - count, '0');
  append({digits.data() + digits.size() - count, count});
}

void LUMLogLine::withText(const rt::Object* object, void (*use)(void* given, std::string_view text),
                          void* given) const {
  if (object == nullptr) {
    use(given, "(null)");
  } else if (const auto* string = rt::cast<rt::StringObject>(object)) {
    use(given, string->view());
  } else if (caller_ == Caller::kSignalHandler) {
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
          use(given, {place.data(), end.ptr});
          return;
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
    use(given, text.text());
  } else {
    use(given, LUMLogDescriptionOf(*object));
  }
}
