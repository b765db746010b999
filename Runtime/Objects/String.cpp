#include "Runtime/Objects/String.h"

#include <array>
#include <cstring>
#include <limits>

namespace rt {

namespace {

// Reads whole words. The last word may overlap the one before it, so that no byte is read alone.
bool isASCII(std::string_view bytes) noexcept {
  constexpr std::uint64_t kHighBits = 0x8080808080808080U;
  constexpr std::size_t kSize = sizeof kHighBits;
  if (bytes.size() < kSize) return false;
  const auto wordAt = [bytes](std::size_t position) {
    std::uint64_t word = 0;
    std::memcpy(&word, bytes.data() + position, kSize);
    return word;
  };
  std::uint64_t all = wordAt(bytes.size() - kSize);
  for (std::size_t i = 0; i + kSize <= bytes.size(); i += kSize) all |= wordAt(i);
  return (all & kHighBits) == 0;
}

// Returns the length of the white space or line end that `text` begins with. 0 if there is none.
std::size_t leadingSpace(std::string_view text) {
  if (text.empty()) return 0;
  const auto first = static_cast<unsigned char>(text[0]);
  if (first < 0x80) return (first >= '\t' && first <= '\r') || first == ' ' ? 1 : 0;
  for (const std::string_view space :
       {"\u0085", "\u00A0", "\u1680", "\u2000", "\u2001", "\u2002", "\u2003", "\u2004", "\u2005", "\u2006",
        "\u2007", "\u2008", "\u2009", "\u200A", "\u2028", "\u2029", "\u202F", "\u205F", "\u3000"}) {
    if (text.starts_with(space)) return space.size();
  }
  return 0;
}

// Returns where the last character of `text`, which is not empty, begins.
std::size_t lastCharacter(std::string_view text) {
  std::size_t i = text.size() - 1;
  while (i > 0 && (static_cast<unsigned char>(text[i]) & 0xC0) == 0x80) --i;
  return i;
}

std::string_view withoutLeadingSpace(std::string_view text) {
  while (const std::size_t length = leadingSpace(text)) text.remove_prefix(length);
  return text;
}

}  // namespace

String String::fromUTF8(std::string_view bytes) {
  return isValidUTF8(bytes) ? copy(bytes) : String();
}

String String::fromUTF8(const char* text) {
  return text != nullptr ? fromUTF8(std::string_view(text)) : String();
}

String String::fromUTF8Repaired(std::string_view bytes) {
  if (isASCII(bytes) || isValidUTF8(bytes)) return copy(bytes);
  const auto visit = [bytes](auto&& put) {
    for (std::string_view rest = bytes; !rest.empty();) {
      const UTF8Sequence next = nextUTF8(rest);
      put(next.isValid ? rest.substr(0, next.length) : kReplacementCharacter);
      rest.remove_prefix(next.length);
    }
  };
  std::size_t length = 0;
  visit([&](std::string_view piece) { length += piece.size(); });
  char* end = nullptr;
  String result = from(StringObject::make(length, end));
  visit([&](std::string_view piece) { end = std::ranges::copy(piece, end).out; });
  return result;
}

String String::overStatic(std::string_view bytes) {
  return isValidUTF8(bytes) ? from(StringObject::over(bytes)) : String();
}

String String::from(const Object* object) noexcept {
  const auto* string = cast<StringObject>(object);
  if (string != nullptr) string->retain();
  return String(string);
}

String String::copy(std::string_view text) {
  return text.empty() ? ""_s : from(StringObject::copyOf(text));
}

String String::part(std::string_view part) const {
  return part.size() == length() ? *this : copy(part);
}

String String::trimmed() const {
  std::string_view text = withoutLeadingSpace(view());
  while (!text.empty()) {
    const std::size_t last = lastCharacter(text);
    if (leadingSpace(text.substr(last)) == 0) break;
    text = text.substr(0, last);
  }
  return part(text);
}

String String::uppercased() const {
  const auto isLower = [](char c) { return c >= 'a' && c <= 'z'; };
  const std::string_view text = view();
  if (std::ranges::none_of(text, isLower)) return *this;
  char* bytes = nullptr;
  String result = from(StringObject::make(text.size(), bytes));
  std::ranges::transform(text, bytes,
                         [&](char c) { return isLower(c) ? static_cast<char>(c - 'a' + 'A') : c; });
  return result;
}

std::int64_t String::integerValue() const noexcept {
  std::string_view text = withoutLeadingSpace(view());
  const bool isNegative = text.starts_with('-');
  if (isNegative || text.starts_with('+')) text.remove_prefix(1);
  // The value is kept negative, since there is one negative number more than there are positive ones.
  using Limits = std::numeric_limits<std::int64_t>;
  std::int64_t value = 0;
  for (const char c : text) {
    if (c < '0' || c > '9') break;
    if (__builtin_mul_overflow(value, 10, &value) || __builtin_sub_overflow(value, c - '0', &value)) {
      return isNegative ? Limits::min() : Limits::max();
    }
  }
  if (isNegative) return value;
  return value == Limits::min() ? Limits::max() : -value;
}

String String::lastPathComponent() const {
  // Without a slash, `rfind` returns npos. Adding 1 gives 0, so the whole text is kept.
  return part(view().substr(view().rfind('/') + 1));
}

String operator+(const String& first, const String& second) {
  char* bytes = nullptr;
  if (second.isEmpty() && first) return first;
  if (first.isEmpty()) return second ? second : ""_s;
  String result = String::from(StringObject::make(first.length() + second.length(), bytes));
  std::memcpy(bytes, first.view().data(), first.length());
  std::memcpy(bytes + first.length(), second.view().data(), second.length());
  return result;
}

}  // namespace rt
