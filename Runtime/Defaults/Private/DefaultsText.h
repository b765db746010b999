#pragma once

/// The text of a file of user defaults. It has one setting a line.
///
///     | # Written by the operator on call.
///     | ZEBVerboseLogging = YES
///     | greeting = "  two blanks before, one line\n after"   # a remark
///
///     rt::DefaultsText text = rt::DefaultsText::parsed(content);      // throws MalformedDefaults
///     text.find("ZEBVerboseLogging");                                 // "YES"
///
/// Runtime/Defaults/UserDefaults.h has the rules.
///
/// Threads: as safe as a std::map.
///
/// Not for: files that other tools read; nested data.

#include <cstddef>
#include <functional>
#include <map>
#include <stdexcept>
#include <string>
#include <string_view>

namespace rt {

/// The text is malformed. `what()` says why, and in which line.
class MalformedDefaults final : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

class DefaultsText {
 public:
  static constexpr std::size_t kMaximumSize = std::size_t{1} << 20U;

  /// Makes a text without settings.
  DefaultsText() = default;

  /// Reads `text`. Throws MalformedDefaults.
  static DefaultsText parsed(std::string_view text);

  /// Returns the value of `key`, which this object owns. Null if there is no such key.
  const std::string* find(std::string_view key) const noexcept;

 private:
  std::map<std::string, std::string, std::less<>> settings_;
};

}  // namespace rt
