#pragma once

/// `rt::StringBuilder` builds a text piece by piece.
///
///     rt::StringBuilder builder;
///     builder.append("{ ");
///     for (const Frame& frame : frames) builder.append(frame.name);
///     rt::String trace = builder.string();
///
/// Building a text of up to `kInlineCapacity` bytes allocates once, for the string. A longer text is built on
/// the heap.
///
/// Threads: one thread at a time uses a builder.
///
/// Not for: two or three strings, which `+` joins; formatting values (Runtime/Text/Format.h).

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

  /// Appends bytes. All appended bytes together should be UTF-8: see `string`. Throws std::bad_alloc, and
  /// then appends nothing.
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

  /// Returns room for `count` more bytes. Write them, then call `commit`. The pointer is valid until the next
  /// call of any other function. Throws std::bad_alloc.
  char* prepare(std::size_t count) {
    if (capacity_ - length_ < count) grow(count);
    return bytes_ + length_;
  }
  /// Appends the first `count` bytes of what `prepare` returned.
  void commit(std::size_t count) noexcept { length_ += count; }

  /// Returns how many bytes `prepare` can return without allocating.
  std::size_t available() const noexcept { return capacity_ - length_; }

  /// Returns what has been appended so far. The view is valid until the next append.
  std::string_view view() const noexcept { return {bytes_, length_}; }

  /// Returns what has been appended so far, with U+FFFD in place of what is not UTF-8. Never null. Throws
  /// std::bad_alloc.
  String string() const { return String::fromUTF8Repaired(view()); }

 private:
  void grow(std::size_t count);

  // Makes the buffer larger than `kInlineCapacity`, since callers may prepare more bytes than they commit.
  static constexpr std::size_t kSlack = 32;

  char* bytes_ = inline_;
  std::size_t length_ = 0;
  std::size_t capacity_ = kInlineCapacity + kSlack;
  char inline_[kInlineCapacity + kSlack];
};

}  // namespace rt
