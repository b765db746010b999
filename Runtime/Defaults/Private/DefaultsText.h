#pragma once

/// The text of a file of user defaults, one setting a line, as people write it and programs change it.
///
///     | # Written by the operator on call.
///     | ZEBVerboseLogging = YES
///     | greeting = "  two blanks before, one line\n after"   # a remark
///
///     rt::DefaultsText text = rt::DefaultsText::parsed(content);      // throws MalformedDefaults
///     text.find("ZEBVerboseLogging");                                 // "YES"
///     text.set("ZEBVerboseLogging", "NO");
///     text.text();                                                    // remarks and order are kept
///
/// A line is blank, a remark that begins with `#`, or `key = value`. A value goes from the first character
/// that is no blank to the last before the end of the line or a `#`; nothing there is the empty text. A
/// key or value in double quotes is taken as it stands between them, where \" \\ \n \r \t and \uXXXX (four
/// hexadecimal digits) stand for a character; so can a `#`, a `=` in a key and blanks at an end be written.
/// The text is UTF-8, of at most 1 MiB, with line ends of either kind, and has no key twice.
///
/// Not for: what is to be shared with other tools; nested data.

#include <cstddef>
#include <list>
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

/// A plain value that can be moved but not copied: as safe as a map.
class DefaultsText {
 public:
  static constexpr std::size_t kMaximumSize = std::size_t{1} << 20U;

  /// No settings.
  DefaultsText() = default;
  DefaultsText(DefaultsText&&) noexcept = default;
  DefaultsText& operator=(DefaultsText&&) noexcept = default;
  ~DefaultsText() = default;

  /// The settings in `text`. Throws MalformedDefaults.
  static DefaultsText parsed(std::string_view text);

  /// The value of `key`, until the next change; null when there is none.
  const std::string* find(std::string_view key) const noexcept;

  /// Sets `key`, in the line that has it or in a new one at the end. Both are any UTF-8; throws
  /// std::invalid_argument for other bytes.
  void set(std::string_view key, std::string_view value);

  /// Takes away the line that has `key`, if there is one.
  void remove(std::string_view key);

  /// The whole text: lines that were not changed are as they were.
  std::string text() const;

 private:
  using Lines = std::list<std::string>;
  struct Setting {
    Lines::iterator line;
    std::string value;
  };

  Lines lines_;
  std::map<std::string, Setting, std::less<>> settings_;
};

}  // namespace rt
