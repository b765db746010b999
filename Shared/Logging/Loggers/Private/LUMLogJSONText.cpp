#include "Shared/Logging/Loggers/Private/LUMLogJSONText.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>

#include "Runtime/Base/Private/UTF8.h"

namespace {

constexpr unsigned char kDelete = 0x7F;

bool isPlain(char character) noexcept {
  const auto code = static_cast<unsigned char>(character);
  return code >= 0x20 && code < kDelete && code != '"' && code != '\\';
}

constexpr std::uint64_t allBytes(unsigned char byte) noexcept {
  return 0x0101010101010101U * byte;
}

// Returns whether all bytes of `word` may be plain. Never true if one is not.
constexpr bool isPlainWord(std::uint64_t word) noexcept {
  // The subtraction sets the top bit of a byte that is 0, and of some beside it.
  const auto hasNone = [word](unsigned char byte) {
    const std::uint64_t different = word ^ allBytes(byte);
    return ((different - allBytes(1)) & ~different & allBytes(0x80)) == 0;
  };
  return (word & allBytes(0x80)) == 0 && ((word - allBytes(0x20)) & allBytes(0x80)) == 0 && hasNone('"') &&
         hasNone('\\') && hasNone(kDelete);
}

// Returns how many leading bytes of `text` stand for themselves. They are ASCII.
std::size_t plainLength(std::string_view text) noexcept {
  std::size_t length = 0;
  for (std::uint64_t word = 0; text.size() - length >= sizeof word; length += sizeof word) {
    std::memcpy(&word, text.data() + length, sizeof word);
    if (!isPlainWord(word)) break;
  }
  while (length < text.size() && isPlain(text[length])) ++length;
  return length;
}

// What stands for the first bytes of a text: itself, or `place`.
struct Replaced {
  std::size_t length = 1;
  std::string_view by;
};

using Place = std::array<char, 6>;

std::string_view codeUnit(unsigned unit, Place& place) noexcept {
  constexpr std::string_view kDigits = "0123456789abcdef";
  place = {'\\', 'u', '0', '0', '0', '0'};
  for (std::size_t i = place.size(); unit != 0; unit >>= 4U) place[--i] = kDigits[unit & 0xFU];
  return {place.data(), place.size()};
}

Replaced replacedOther(std::string_view text, Place& place) noexcept {
  const rt::UTF8Sequence next = rt::nextUTF8(text);
  if (!next.isValid) return {next.length, rt::kReplacementCharacter};
  const std::string_view character = text.substr(0, next.length);
  const auto last = static_cast<unsigned char>(character.back());
  // Control characters of Unicode, U+0080 to U+009F.
  if (character.front() == '\xC2' && last < 0xA0) return {next.length, codeUnit(last, place)};
  if (character == "\xE2\x80\xA8") return {next.length, "\\u2028"};
  if (character == "\xE2\x80\xA9") return {next.length, "\\u2029"};
  return {next.length, character};
}

Replaced replaced(std::string_view text, Place& place) noexcept {
  const char first = text.front();
  switch (first) {
    case '"':
      return {1, "\\\""};
    case '\\':
      return {1, "\\\\"};
    case '\n':
      return {1, "\\n"};
    case '\r':
      return {1, "\\r"};
    case '\t':
      return {1, "\\t"};
    default:
      break;
  }
  const auto code = static_cast<unsigned char>(first);
  return code <= kDelete ? Replaced{1, codeUnit(code, place)} : replacedOther(text, place);
}

}  // namespace

void appendJSONText(LUMLogLine& line, std::string_view text, std::size_t limit) noexcept {
  while (!text.empty()) {
    const std::size_t plain = std::min(plainLength(text), limit);
    line.append(text.substr(0, plain));
    limit -= plain;
    text.remove_prefix(plain);
    if (text.empty()) return;
    Place place{};
    const Replaced next = replaced(text, place);
    if (next.by.size() > limit) return;
    line.append(next.by);
    limit -= next.by.size();
    text.remove_prefix(next.length);
  }
}
