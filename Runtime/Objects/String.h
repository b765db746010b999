#pragma once

/// `rt::String` is a text: one pointer to an immutable, shared run of UTF-8, or null.
///
///     using namespace rt::literals;
///
///     constexpr rt::String kGreeting = "hello"_s;          // neither allocates nor counts, ever
///     rt::String name = rt::String::fromUTF8(bytes);       // a copy; null if they are not UTF-8
///     if (!name) return;
///     rt::String line = kGreeting + ", "_s + name.trimmed();
///     rt::Ref<rt::Object> object = line;                   // a string is an object, too
///
/// Null and empty are different values. Null means that there is no text, and is false as a condition. Most
/// functions accept null and answer as for an empty text. Those that differ say so.
///
/// Lengths and positions count bytes. NUL is a character like any other. Two strings are equal if they have
/// the same bytes. Strings are ordered by their bytes, which is the order of their code points.
///
/// Copying adds a reference. Moving leaves null behind.
///
/// Threads: threads may use different `String` objects at the same time. One `String` object is as
/// thread-safe as a plain pointer.
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

// Holds the characters of a literal, as an argument of a template.
template <std::size_t size>
struct StringLiteral {
  consteval StringLiteral(const char (&text)[size]) { std::copy_n(text, size, characters); }

  constexpr std::string_view view() const noexcept { return {characters, size - 1}; }

  char characters[size];
};

// The object that all literals with these characters share.
template <StringLiteral literal>
inline constexpr StringObject kStringLiteral{literal.characters, literal.view().size()};

}  // namespace detail

class String;

inline namespace literals {

/// Returns the string of a literal, which must be valid UTF-8. Neither the string nor a copy of it allocates
/// or counts. It can be a constant, for which nothing runs at start-up or at exit. It lives as long as the
/// program, since a library with literals is never unloaded (Runtime/Objects/ClassInfo.h).
template <detail::StringLiteral literal>
constexpr String operator""_s() noexcept;

}  // namespace literals

class String {
 public:
  static constexpr std::size_t kNotFound = std::string_view::npos;

  /// Makes a null string.
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

  /// Returns a copy of `bytes`. Null if they are not valid UTF-8. Throws std::bad_alloc.
  static String fromUTF8(std::string_view bytes);

  /// Returns a copy of a text that ends with NUL. Null for null, and if it is not valid UTF-8. Throws
  /// std::bad_alloc.
  static String fromUTF8(const char* text);

  /// Returns a copy of `bytes` with U+FFFD in place of what is not UTF-8. One U+FFFD replaces each longest
  /// run that could have begun a character, or else a single byte. Never null. Throws std::bad_alloc.
  static String fromUTF8Repaired(std::string_view bytes);

  /// Returns a string over `bytes`, which are not copied. The bytes must never change or go away. Constants
  /// of a library that calls this function or uses classes qualify, since it is never unloaded. Null if the
  /// bytes are not valid UTF-8. Throws std::bad_alloc.
  static String overStatic(std::string_view bytes);

  /// Returns `object` as a string. Null if it is not a string, and for null.
  static String from(const Object* object) noexcept;

  /// Returns the string of `object`. Null for null.
  static String from(Ref<StringObject> object) noexcept { return String(object.detach()); }

  /// Returns the string's object, or null. Does not retain it.
  constexpr StringObject* object() const noexcept { return const_cast<StringObject*>(object_); }
  operator Ref<Object>() const noexcept { return {object()}; }

  constexpr bool isNull() const noexcept {
    // With -fno-delete-null-pointer-checks, which goes with -fsanitize=undefined, g++ cannot compare the
    // address of a literal with null while it compiles.
    if (std::is_constant_evaluated() && __builtin_constant_p(object_ == nullptr) == 0) return false;
    return object_ == nullptr;
  }
  constexpr explicit operator bool() const noexcept { return !isNull(); }

  /// Returns whether there are no characters. True for null.
  constexpr bool isEmpty() const noexcept { return length() == 0; }

  /// Returns the number of bytes. 0 for null.
  constexpr std::size_t length() const noexcept { return view().size(); }

  /// Returns the bytes, which live as long as the string. No NUL need follow them. Empty for null.
  constexpr std::string_view view() const noexcept { return isNull() ? std::string_view() : object_->view(); }
  constexpr operator std::string_view() const noexcept { return view(); }

  /// Returns a hash that is consistent with `==`: the standard library's hash of the bytes. 0 for null.
  std::uint64_t hash() const noexcept {
    return object_ != nullptr ? std::hash<std::string_view>()(object_->view()) : 0;
  }

  constexpr bool hasPrefix(std::string_view prefix) const noexcept { return view().starts_with(prefix); }
  constexpr bool hasSuffix(std::string_view suffix) const noexcept { return view().ends_with(suffix); }
  constexpr bool contains(std::string_view text) const noexcept { return find(text) != kNotFound; }

  /// Returns the first position of `text` at or after `start`, or `kNotFound`. An empty text is found at
  /// `start`, if that is not past the end.
  constexpr std::size_t find(std::string_view text, std::size_t start = 0) const noexcept {
    return view().find(text, start);
  }

  /// Returns the text without the Unicode white space and line ends at both ends. Null for null. Throws
  /// std::bad_alloc.
  String trimmed() const;

  /// Returns the text with A to Z in place of a to z. Other characters stay. Null for null. Throws
  /// std::bad_alloc.
  String uppercased() const;

  /// Returns the decimal integer that the text begins with. White space, and then a sign, may precede it. 0
  /// if there is no integer. The nearest value if the integer is out of range.
  std::int64_t integerValue() const noexcept;

  /// Returns the text after the last slash, or the whole text if there is no slash. For "a/b/c.m" that is
  /// "c.m", for "a/b/" it is "". Null for null. Throws std::bad_alloc.
  String lastPathComponent() const;

  friend constexpr bool operator==(const String& first, const String& second) noexcept {
    if (first.object_ == second.object_) return true;
    return first.object_ != nullptr && second.object_ != nullptr && first.view() == second.view();
  }

  /// Orders strings by their bytes. Null comes before all other strings.
  friend constexpr std::strong_ordering operator<=>(const String& first, const String& second) noexcept {
    if (first && second) return first.view() <=> second.view();
    if (first.isNull() && second.isNull()) return std::strong_ordering::equal;
    return first.isNull() ? std::strong_ordering::less : std::strong_ordering::greater;
  }

  /// Returns whether the string has these bytes. Null is not equal to any bytes, not even to "".
  friend constexpr bool operator==(const String& string, std::string_view bytes) noexcept {
    return string.object_ != nullptr && string.view() == bytes;
  }
  friend constexpr bool operator==(const String& string, std::nullptr_t) noexcept { return string.isNull(); }

  /// Returns both texts, one after the other, in at most one allocation. Null counts as empty. Never null.
  /// Throws std::bad_alloc.
  friend String operator+(const String& first, const String& second);

 private:
  template <detail::StringLiteral>
  friend constexpr String literals::operator""_s() noexcept;

  // Takes over a reference that the caller owns.
  constexpr explicit String(const StringObject* adopted) noexcept : object_(adopted) {}

  // A constant string refers to the object of a literal, which is not counted.
  constexpr void retain() const noexcept {
    if (!std::is_constant_evaluated() && object_ != nullptr) object_->retain();
  }
  constexpr void drop() const noexcept {
    if (!std::is_constant_evaluated() && object_ != nullptr) object_->release();
  }

  // Returns a copy of `text`, which is valid UTF-8.
  static String copy(std::string_view text);

  // Returns this string if `part`, a view of its bytes, has all of them. Otherwise returns a copy of `part`.
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
