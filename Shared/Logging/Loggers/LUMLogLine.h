#pragma once

/// A line of text that is built in memory of the caller. It never allocates, so a signal handler may use it.
///
///     std::array<char, 256> place;
///     LUMLogLine line(place);
///     line.append("3 entries");
///     if (line.isComplete()) write(2, line.text().data(), line.text().size());
///
/// A line longer than its place keeps what fits, and counts the rest. So a caller can make room and build the
/// line again.
///
/// Threads: one thread at a time uses a line.
///
/// Not for: strings (Runtime/Objects/StringBuilder.h).

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>
#include <string_view>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Object.h"

class RT_VISIBLE LUMLogLine {
 public:
  /// Where the line is built. In a signal handler no description of an object may be asked for.
  enum class Caller : std::uint8_t { kThread, kSignalHandler };

  /// Makes an empty line in `place`, which outlives it.
  explicit LUMLogLine(std::span<char> place, Caller caller = Caller::kThread) noexcept
      : place_(place), caller_(caller) {}
  LUMLogLine(const LUMLogLine&) = delete;
  LUMLogLine& operator=(const LUMLogLine&) = delete;

  /// Appends bytes as they are.
  void append(std::string_view bytes) noexcept {
    // Two copies, because the compiler inlines the first one if it knows the size.
    if (const std::size_t free = room(); bytes.size() <= free) [[likely]] {
      std::memcpy(place_.data() + length_, bytes.data(), bytes.size());
    } else if (free > 0) {
      std::memcpy(place_.data() + length_, bytes.data(), free);
    }
    length_ += bytes.size();
  }
  void append(char byte) noexcept { append(std::string_view(&byte, 1)); }
  void append(std::size_t count, char byte) noexcept;

  /// Appends `text` so that it stays on one line and cannot control a terminal. A control character becomes
  /// "\n", "\t" or "\x1b", and a backslash stays as it is.
  void appendEscaped(std::string_view text) noexcept;

  /// Appends `value` in decimal, with leading zeros up to `width` digits.
  void appendNumber(std::int64_t value) noexcept;
  void appendUnsigned(std::uint64_t value, std::size_t width = 0) noexcept;

  /// Returns the text of `object`: that of a string itself, else its description. Calls `use` with it. In a
  /// signal handler, only strings and numbers have a text. For others it is the name of the class in
  /// brackets. Null has "(null)". If the description throws, the text is "(no description)".
  template <class Use>
  void withTextOf(const rt::Object* object, Use use) const {
    withText(object, [](void* given, std::string_view text) { (*static_cast<Use*>(given))(text); }, &use);
  }

  /// Returns the length of the whole line in bytes, also of what did not fit.
  std::size_t length() const noexcept { return length_; }
  bool isComplete() const noexcept { return length_ <= place_.size(); }

  /// Returns how many more bytes fit.
  std::size_t room() const noexcept { return length_ < place_.size() ? place_.size() - length_ : 0; }

  /// Takes back what was appended after the line had this length.
  void cutTo(std::size_t length) noexcept { length_ = length; }

  /// Returns the part of the line that fits.
  std::string_view text() const noexcept {
    return {place_.data(), length_ < place_.size() ? length_ : place_.size()};
  }

  Caller caller() const noexcept { return caller_; }

 private:
  void withText(const rt::Object* object, void (*use)(void* given, std::string_view text), void* given) const;

  const std::span<char> place_;
  const Caller caller_;
  std::size_t length_ = 0;
};
