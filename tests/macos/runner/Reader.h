#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "Image.h"

/// Reads the variable-length numbers and the texts of fixups and exports, one after the other. Refuses the
/// file if the bytes end in the middle of one.
class Reader {
 public:
  explicit Reader(FileBytes bytes, std::size_t position = 0) : bytes_(bytes), position_(position) {}

  bool isAtEnd() const { return position_ >= bytes_.size(); }
  std::size_t position() const { return position_; }

  std::uint8_t byte() { return valueAt<std::uint8_t>(bytes_, position_++); }

  std::uint64_t number() {
    std::uint64_t value = 0;
    for (unsigned shift = 0; shift < 64; shift += 7) {
      const std::uint8_t next = byte();
      value |= std::uint64_t{next & 0x7fU} << shift;
      if ((next & 0x80U) == 0) return value;
    }
    refuseShortFile();
  }

  std::int64_t signedNumber() {
    std::uint64_t value = 0;
    for (unsigned shift = 0; shift < 64;) {
      const std::uint8_t next = byte();
      value |= std::uint64_t{next & 0x7fU} << shift;
      shift += 7;
      if ((next & 0x80U) != 0) continue;
      if (shift < 64 && (next & 0x40U) != 0) value |= ~std::uint64_t{0} << shift;
      return static_cast<std::int64_t>(value);
    }
    refuseShortFile();
  }

  std::string_view text() {
    const std::size_t begin = position_;
    while (byte() != 0) {
    }
    const void* const first = bytes_.data() + begin;
    return {static_cast<const char*>(first), position_ - begin - 1};
  }

 private:
  FileBytes bytes_;
  std::size_t position_;
};
