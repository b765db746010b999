#pragma once

/// Builds a text piece by piece.
///
///     rt::StringBuilder builder;
///     builder.append("{ ");
///     for (const Frame& frame : frames) builder.append(frame.name);
///     rt::String trace = builder.string();
///
/// What fits in `kInlineCapacity` bytes allocates once, for the string; longer texts grow on the heap. A
/// builder is used by one thread at a time.
///
/// Not for: two or three strings, where `+` will do; values (Runtime/Text/Format.h).

#include <cstddef>
#include <cstring>
#include <string_view>

#include "Runtime/Objects/String.h"

namespace rt {

class StringBuilder {
 public:
  static constexpr std::size_t kInlineCapacity = 512;

  StringBuilder() noexcept = default;
  StringBuilder(const StringBuilder&) = delete;
  StringBuilder& operator=(const StringBuilder&) = delete;
  ~StringBuilder();

  /// Appends bytes, which should add up to UTF-8: see `string`. Throws std::bad_alloc, and then has
  /// appended nothing.
  void append(std::string_view bytes) {
    if (bytes.empty()) return;
    std::memcpy(prepare(bytes.size()), bytes.data(), bytes.size());
    length_ += bytes.size();
  }
  void append(char byte) {
    *prepare(1) = byte;
    ++length_;
  }
  /// Appends `byte` `count` times.
  void append(std::size_t count, char byte) {
    std::memset(prepare(count), byte, count);
    length_ += count;
  }

  /// Room for `count` bytes more, to be written and then handed to `commit`. Good until the next call of
  /// any other function. Throws std::bad_alloc.
  char* prepare(std::size_t count) {
    if (capacity_ - length_ < count) grow(count);
    return bytes_ + length_;
  }
  /// Appends the first `count` bytes of what `prepare` returned.
  void commit(std::size_t count) noexcept { length_ += count; }

  /// How many bytes `prepare` returns without allocating.
  std::size_t available() const noexcept { return capacity_ - length_; }

  /// What has been appended so far, until the next append.
  std::string_view view() const noexcept { return {bytes_, length_}; }

  /// What has been appended so far as a string, never null; U+FFFD stands in it for what is not UTF-8.
  /// Throws std::bad_alloc.
  String string() const { return String::fromUTF8Repaired(view()); }

 private:
  void grow(std::size_t count);

  // What is prepared may be more than what is then committed.
  static constexpr std::size_t kSlack = 32;

  char* bytes_ = inline_;
  std::size_t length_ = 0;
  std::size_t capacity_ = kInlineCapacity + kSlack;
  char inline_[kInlineCapacity + kSlack];
};

}  // namespace rt
