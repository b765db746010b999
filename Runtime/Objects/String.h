#pragma once

/// Text: one pointer to an immutable, shared run of UTF-8, or null.
///
///     using namespace rt::literals;
///
///     constexpr rt::String kGreeting = "hello"_s;          // neither allocates nor counts, ever
///     rt::String name = rt::String::fromUTF8(bytes);       // a copy; null where they are not UTF-8
///     if (!name) return;
///     rt::String line = kGreeting + ", "_s + name.trimmed();
///     rt::Ref<rt::Object> object = line;                   // a string is an object, too
///
/// Null and empty are different values: null is no text, and false as a condition. Most questions may be
/// put to null all the same and get the answer of an empty text; those that may not say so.
///
/// Lengths and positions count bytes. NUL is a character like any other. Two strings are equal when they
/// have the same bytes, and are ordered by them, which is the order of their code points.
///
/// Copying adds a reference and moving leaves null behind. Different `String` objects may be used by
/// different threads at once; one `String` object is as safe as a plain pointer.
///
/// Not for: bytes that are not text; building a text piece by piece (Runtime/Objects/StringBuilder.h).

#include <algorithm>
#include <compare>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string_view>
#include <type_traits>
#include <utility>

#include "Runtime/Base/UTF8.h"
#include "Runtime/Objects/StringObject.h"

namespace rt {

namespace detail {

/// The characters of a literal, as an argument of a template.
template <std::size_t size>
struct StringLiteral {
  consteval StringLiteral(const char (&text)[size]) { std::copy_n(text, size, characters); }

  constexpr std::string_view view() const noexcept { return {characters, size - 1}; }

  char characters[size];
};

/// The one object of all literals with these characters.
template <StringLiteral literal>
inline constexpr StringObject kStringLiteral{literal.characters, literal.view().size()};

}  // namespace detail

class String;

inline namespace literals {

/// The string of a literal, which is valid UTF-8. Neither allocates nor counts, also when it is copied; it
/// can be a constant, and then nothing runs for it at start-up or at exit. It is there as long as the program
/// is: a library with literals is never unloaded (Runtime/Objects/ClassInfo.h).
template <detail::StringLiteral literal>
constexpr String operator""_s() noexcept;

}  // namespace literals

class String {
 public:
  /// Null.
  constexpr String() noexcept = default;
  constexpr String(std::nullptr_t) noexcept {}

  constexpr String(const String& other) noexcept : object_(other.object_) { retain(); }
  constexpr String(String&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
  constexpr ~String() { drop(); }

  constexpr String& operator=(String other) noexcept {
    swap(other);
    return *this;
  }

  constexpr void swap(String& other) noexcept { std::swap(object_, other.object_); }

  /// A copy of `bytes`; null where they are not valid UTF-8. Throws std::bad_alloc.
  static String fromUTF8(std::string_view bytes);

  /// The same for a text that ends with NUL; null for null.
  static String fromUTF8(const char* text);

  /// A copy of `bytes` with U+FFFD in the place of what is not UTF-8: once for each run of bytes that could
  /// have become one character. Never null. Throws std::bad_alloc.
  static String fromUTF8Repaired(std::string_view bytes);

  /// A string over `bytes`, which must never change nor go away: they are not copied. Constants of a library
  /// that calls this, or uses classes, will do, since it is never unloaded. Null where they are not valid
  /// UTF-8. Throws std::bad_alloc.
  static String overStatic(std::string_view bytes);

  /// `object` as a string; null where it is none, and for null.
  static String from(const Object* object) noexcept;

  /// A string with the object `object`, which may be null.
  static String from(Ref<StringObject> object) noexcept { return String(object.detach()); }

  /// The object; null for null. Not retained.
  constexpr StringObject* object() const noexcept { return const_cast<StringObject*>(object_); }
  operator Ref<Object>() const noexcept { return {object()}; }

  constexpr bool isNull() const noexcept {
    // With -fno-delete-null-pointer-checks, which goes with -fsanitize=undefined, g++ cannot compare the
    // address of a literal with null while it compiles.
    if (std::is_constant_evaluated() && __builtin_constant_p(object_ == nullptr) == 0) return false;
    return object_ == nullptr;
  }
  constexpr explicit operator bool() const noexcept { return !isNull(); }

  /// Whether there are no characters: null has none either.
  constexpr bool isEmpty() const noexcept { return length() == 0; }

  /// How many bytes; 0 for null.
  constexpr std::size_t length() const noexcept { return view().size(); }

  /// The bytes, as long as the string lives. They need not end with NUL.
  constexpr std::string_view view() const noexcept { return isNull() ? std::string_view() : object_->view(); }
  constexpr operator std::string_view() const noexcept { return view(); }

  /// A hash that suits `==`: the standard library's of the bytes. 0 for null.
  std::uint64_t hash() const noexcept {
    return object_ != nullptr ? std::hash<std::string_view>()(object_->view()) : 0;
  }

  constexpr bool hasPrefix(std::string_view prefix) const noexcept { return view().starts_with(prefix); }
  constexpr bool hasSuffix(std::string_view suffix) const noexcept { return view().ends_with(suffix); }
  constexpr bool contains(std::string_view text) const noexcept {
    return view().find(text) != std::string_view::npos;
  }

  /// Without the white space and line ends of Unicode at both ends. Null for null. Throws std::bad_alloc.
  String trimmed() const;

  /// With A to Z in the place of a to z; other characters stay. Null for null. Throws std::bad_alloc.
  String uppercased() const;

  /// The decimal integer that the text begins with, after white space and a sign, if any; 0 where there is
  /// none, the nearest value where it is out of range.
  std::int64_t integerValue() const noexcept;

  /// What follows the last slash, or all where there is none: "c.m" of "a/b/c.m", "" of "a/b/". Null for
  /// null. Throws std::bad_alloc.
  String lastPathComponent() const;

  friend constexpr bool operator==(const String& first, const String& second) noexcept {
    if (first.object_ == second.object_) return true;
    return first.object_ != nullptr && second.object_ != nullptr && first.view() == second.view();
  }

  /// Null comes before all others.
  friend constexpr std::strong_ordering operator<=>(const String& first, const String& second) noexcept {
    if (first && second) return first.view() <=> second.view();
    if (first.isNull() && second.isNull()) return std::strong_ordering::equal;
    return first.isNull() ? std::strong_ordering::less : std::strong_ordering::greater;
  }

  /// Whether the string has these bytes. Null equals none, not even "".
  friend constexpr bool operator==(const String& string, std::string_view bytes) noexcept {
    return string.object_ != nullptr && string.view() == bytes;
  }
  friend constexpr bool operator==(const String& string, std::nullptr_t) noexcept { return string.isNull(); }

  /// One after the other, in one allocation; null counts as empty, and the result is never null. Throws
  /// std::bad_alloc.
  friend String operator+(const String& first, const String& second);

 private:
  template <detail::StringLiteral>
  friend constexpr String literals::operator""_s() noexcept;

  // Takes over a reference that the object has already.
  constexpr explicit String(const StringObject* adopted) noexcept : object_(adopted) {}

  // A string that is a constant has a literal's object, which is not counted.
  constexpr void retain() const noexcept {
    if (!std::is_constant_evaluated() && object_ != nullptr) object_->retain();
  }
  constexpr void drop() const noexcept {
    if (!std::is_constant_evaluated() && object_ != nullptr) object_->release();
  }

  /// A copy of `text`, which is valid UTF-8.
  static String copy(std::string_view text);

  /// This string where `part`, of its bytes, is all of them; otherwise a copy of `part`.
  String part(std::string_view part) const;

  const StringObject* object_ = nullptr;
};

template <detail::StringLiteral literal>
constexpr String literals::operator""_s() noexcept {
  static_assert(isValidUTF8(literal.view()), "the literal is not valid UTF-8");
  return String(&detail::kStringLiteral<literal>);
}

}  // namespace rt

template <>
struct std::hash<rt::String> {
  std::size_t operator()(const rt::String& string) const noexcept { return string.hash(); }
};
