#pragma once

/// The text of a file of user defaults, one setting a line, as people write it.
///
///     | # Written by the operator on call.
///     | ZEBVerboseLogging = YES
///     | greeting = "  two blanks before, one line\n after"   # a remark
///
///     rt::DefaultsText text = rt::DefaultsText::parsed(content);      // throws MalformedDefaults
///     text.find("ZEBVerboseLogging");                                 // "YES"
///
/// A line is blank, a remark that begins with `#`, or `key = value`. A value goes from the first character
/// that is no blank to the last before the end of the line or a `#`; nothing there is the empty text. A
/// key or value in double quotes is taken as it stands between them, where \" \\ \n \r \t and \uXXXX (four
/// hexadecimal digits) stand for a character; so can a `#`, a `=` in a key and blanks at an end be written.
/// The text is UTF-8, of at most 1 MiB, with line ends of either kind, and has no key twice.
///
/// Not for: what is to be shared with other tools; nested data.

#include <cstddef>
#include <functional>
#include <map>
#include <stdexcept>
#include <string>
#include <string_view>

namespace rt {

/// The text is none of user defaults; `what()` says why, and in which line.
class MalformedDefaults final : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// A plain value: as safe as a map.
class DefaultsText {
 public:
  static constexpr std::size_t kMaximumSize = std::size_t{1} << 20U;

  /// No settings.
  DefaultsText() = default;

  /// The settings in `text`. Throws MalformedDefaults.
  static DefaultsText parsed(std::string_view text);

  /// The value of `key`, as long as this is there; null when there is none.
  const std::string* find(std::string_view key) const noexcept;

 private:
  std::map<std::string, std::string, std::less<>> settings_;
};

}  // namespace rt
