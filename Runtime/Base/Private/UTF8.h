#pragma once

/// Checks whether bytes are UTF-8, splits them into characters and writes characters as UTF-8.
///
///     if (!rt::isValidUTF8(bytes)) return;
///
///     char text[rt::kMaximumUTF8Length];
///     std::size_t length = rt::encodeUTF8(U'\u20ac', text);   // 3
///
/// Valid UTF-8 is what the Unicode standard calls well-formed: no overlong forms, no surrogates, nothing
/// above U+10FFFF. NUL is a character like any other.
///
/// Threads: any thread may call all of these functions.
///
/// Not for: text that is to be kept, which is a `rt::String` (Runtime/Objects/String.h).

#include <cstddef>
#include <cstring>
#include <string_view>
#include <type_traits>

namespace rt {

/// The greatest number of bytes in a character.
inline constexpr std::size_t kMaximumUTF8Length = 4;

/// U+FFFD, which replaces bytes that are not UTF-8.
inline constexpr std::string_view kReplacementCharacter = "\xEF\xBF\xBD";

/// Describes what some bytes begin with.
struct UTF8Sequence {
  /// The number of bytes of the character. If the bytes do not begin with a character, the number of those
  /// that could have begun one, at least 1. 0 if there are no bytes.
  std::size_t length;
  /// Whether the bytes begin with a character.
  bool isValid;
  /// Whether the bytes end before the character does.
  bool isCutShort;
};

/// Returns what `bytes` begin with.
constexpr UTF8Sequence nextUTF8(std::string_view bytes) noexcept {
  if (bytes.empty()) return {0, false, false};
  const auto at = [bytes](std::size_t i) { return static_cast<unsigned char>(bytes[i]); };
  const unsigned char first = at(0);
  if (first < 0x80) return {1, true, false};

  // The range of the second byte rules out overlong forms, surrogates and values above U+10FFFF.
  std::size_t length = 0;
  unsigned char low = 0x80;
  unsigned char high = 0xBF;
  if (first >= 0xC2 && first <= 0xDF) {
    length = 2;
  } else if (first >= 0xE0 && first <= 0xEF) {
    length = 3;
    if (first == 0xE0) low = 0xA0;
    if (first == 0xED) high = 0x9F;
  } else if (first >= 0xF0 && first <= 0xF4) {
    length = 4;
    if (first == 0xF0) low = 0x90;
    if (first == 0xF4) high = 0x8F;
  } else {
    return {1, false, false};
  }
  for (std::size_t i = 1; i < length; ++i) {
    if (i == bytes.size()) return {i, false, true};
    if (at(i) < low || at(i) > high) return {i, false, false};
    low = 0x80;
    high = 0xBF;
  }
  return {length, true, false};
}

/// Returns how many leading bytes are valid UTF-8. In valid text, that is all of them.
constexpr std::size_t validUTF8Length(std::string_view bytes) noexcept {
  std::size_t i = 0;
  while (i < bytes.size()) {
    if (!std::is_constant_evaluated()) {
      // Most text is ASCII, which is skipped word by word.
      for (std::size_t word = 0; bytes.size() - i >= sizeof word; i += sizeof word) {
        std::memcpy(&word, bytes.data() + i, sizeof word);
        if ((word & 0x8080808080808080U) != 0) break;
      }
      if (i == bytes.size()) break;
    }
    const UTF8Sequence next = nextUTF8(bytes.substr(i));
    if (!next.isValid) break;
    i += next.length;
  }
  return i;
}

/// Returns whether all of `bytes` are valid UTF-8. True for no bytes.
constexpr bool isValidUTF8(std::string_view bytes) noexcept {
  return validUTF8Length(bytes) == bytes.size();
}

/// Returns how many leading bytes of `text` fit into `room` bytes if no character is cut in two. Text that
/// has no beginning of a character there is cut anywhere, so that something fits.
constexpr std::size_t lengthThatFits(std::string_view text, std::size_t room) noexcept {
  if (text.size() <= room) return text.size();
  std::size_t length = room;
  // A byte of the form 10xxxxxx continues a character.
  while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0U) == 0x80U) --length;
  return length > 0 ? length : room;
}

/// Writes `character` to `bytes`, which has room for `kMaximumUTF8Length` bytes. Returns how many bytes it
/// took. Writes U+FFFD for a surrogate and for a value above U+10FFFF.
constexpr std::size_t encodeUTF8(char32_t character, char* bytes) noexcept {
  const auto put = [bytes](std::size_t i, char32_t value) { bytes[i] = static_cast<char>(value); };
  const auto continuation = [](char32_t value) { return 0x80 | (value & 0x3F); };
  if (character > 0x10FFFF || (character >= 0xD800 && character <= 0xDFFF)) character = 0xFFFD;
  if (character < 0x80) {
    put(0, character);
    return 1;
  }
  if (character < 0x800) {
    put(0, 0xC0 | (character >> 6));
    put(1, continuation(character));
    return 2;
  }
  if (character < 0x10000) {
    put(0, 0xE0 | (character >> 12));
    put(1, continuation(character >> 6));
    put(2, continuation(character));
    return 3;
  }
  put(0, 0xF0 | (character >> 18));
  put(1, continuation(character >> 12));
  put(2, continuation(character >> 6));
  put(3, continuation(character));
  return 4;
}

}  // namespace rt
