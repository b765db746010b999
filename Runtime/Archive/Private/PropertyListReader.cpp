// PropertyList::decoded.
#include <algorithm>
#include <bit>
#include <limits>

#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Base/Private/UTF8.h"

namespace rt {

namespace {

constexpr std::string_view kHeader = "bplist00";
constexpr std::size_t kTrailerSize = 32;

using Bytes = std::span<const std::byte>;

[[noreturn]] void fail(const char* what, std::size_t offset) {
  throw MalformedPropertyList(std::string(what) + " at byte " + std::to_string(offset));
}

// Returns the big-endian number in `bytes`, which are 8 at most.
std::uint64_t unsignedNumber(Bytes bytes) {
  std::uint64_t number = 0;
  for (const std::byte byte : bytes) number = number << 8U | std::to_integer<std::uint64_t>(byte);
  return number;
}

// Reads each object of the table once. Compares every length with the number of bytes left before it
// allocates.
class Reader {
 public:
  explicit Reader(Bytes file) : file_(file) {}

  PropertyList read() {
    readTrailer();
    // Objects do not overlap, so all of them together fit between header and table.
    bytesLeft_ = tableOffset_ - kHeader.size();
    list_.values.reserve(objectCount_);
    for (std::size_t i = 0; i < objectCount_; ++i) {
      const std::uint64_t offset =
          unsignedNumber(file_.subspan(tableOffset_ + (i * offsetSize_), offsetSize_));
      if (offset < kHeader.size() || offset >= tableOffset_) {
        fail("an object outside the file", tableOffset_ + (i * offsetSize_));
      }
      readObject(offset);
    }
    return std::move(list_);
  }

 private:
  void readTrailer() {
    if (file_.size() < kHeader.size() + kTrailerSize ||
        !std::ranges::equal(file_.first(kHeader.size()), std::as_bytes(std::span(kHeader)))) {
      throw MalformedPropertyList("no binary property list");
    }
    const std::size_t end = file_.size() - kTrailerSize;
    const Bytes trailer = file_.last(kTrailerSize);
    offsetSize_ = std::to_integer<std::size_t>(trailer[6]);
    referenceSize_ = std::to_integer<std::size_t>(trailer[7]);
    const std::uint64_t objectCount = unsignedNumber(trailer.subspan(8, 8));
    const std::uint64_t root = unsignedNumber(trailer.subspan(16, 8));
    const std::uint64_t tableOffset = unsignedNumber(trailer.subspan(24, 8));
    if (offsetSize_ < 1 || offsetSize_ > 8 || referenceSize_ < 1 || referenceSize_ > 8 ||
        tableOffset < kHeader.size() || tableOffset > end ||
        objectCount > (end - tableOffset) / offsetSize_ ||
        objectCount > std::numeric_limits<PropertyList::Index>::max() || root >= objectCount) {
      fail("a trailer that contradicts the file", end);
    }
    objectCount_ = objectCount;
    tableOffset_ = tableOffset;
    list_.root = static_cast<PropertyList::Index>(root);
  }

  void readObject(std::size_t offset) {
    start_ = position_ = offset;
    const auto marker = std::to_integer<unsigned>(take(1)[0]);
    const unsigned low = marker & 0xFU;
    switch (marker >> 4U) {
      case 0x0:
        if (low != 8 && low != 9) break;
        list_.add(low == 9);
        return;
      case 0x1:
        readInteger(low);
        return;
      case 0x2:
        if (low != 3) break;
        list_.add(std::bit_cast<double>(unsignedNumber(take(8))));
        return;
      case 0x5:
        readAscii(low);
        return;
      case 0x6:
        readUtf16(low);
        return;
      case 0x8:
        if (low > 7) break;
        list_.add(PropertyList::Reference{unsignedNumber(take(low + 1))});
        return;
      case 0xA: {
        const Bytes references = takeElements(low, referenceSize_);
        PropertyList::Array array(references.size() / referenceSize_);
        for (std::size_t i = 0; i < array.size(); ++i) array[i] = reference(references, i);
        list_.add(std::move(array));
        return;
      }
      case 0xD: {
        const Bytes references = takeElements(low, 2 * referenceSize_);
        PropertyList::Dictionary dictionary(references.size() / (2 * referenceSize_));
        for (std::size_t i = 0; i < dictionary.size(); ++i) {
          dictionary[i] = {reference(references, i), reference(references, dictionary.size() + i)};
        }
        list_.add(std::move(dictionary));
        return;
      }
      default:
        break;
    }
    fail("an object of unknown kind", start_);
  }

  void readInteger(unsigned log2Size) {
    if (log2Size > 4) fail("an integer of unknown size", start_);
    const Bytes bytes = take(std::size_t{1} << log2Size);
    const std::uint64_t number = unsignedNumber(bytes.last(std::min<std::size_t>(bytes.size(), 8)));
    // Up to 4 bytes are unsigned, 8 and 16 are signed.
    if (log2Size == 4) {
      const std::uint64_t high = unsignedNumber(bytes.first(8));
      const bool isNegative = static_cast<std::int64_t>(number) < 0;
      if (high == 0 && isNegative) {
        list_.add(number);
        return;
      }
      if (high != (isNegative ? ~std::uint64_t{0} : 0)) fail("an integer of more than 64 bits", start_);
    }
    list_.add(static_cast<std::int64_t>(number));
  }

  void readAscii(unsigned low) {
    const Bytes bytes = takeElements(low, 1);
    std::string text(bytes.size(), '\0');
    for (std::size_t i = 0; i < bytes.size(); ++i) {
      if (bytes[i] >= std::byte{0x80}) fail("a text that is not ASCII", start_);
      text[i] = static_cast<char>(bytes[i]);
    }
    list_.add(std::move(text));
  }

  void readUtf16(unsigned low) {
    const Bytes bytes = takeElements(low, 2);
    std::string text;
    text.reserve(bytes.size());
    for (std::size_t i = 0; i < bytes.size(); i += 2) {
      auto point = static_cast<char32_t>(unsignedNumber(bytes.subspan(i, 2)));
      if (point >= 0xD800 && point < 0xE000) {
        i += 2;
        const auto low2 = i < bytes.size() ? static_cast<char32_t>(unsignedNumber(bytes.subspan(i, 2))) : 0;
        if (point >= 0xDC00 || low2 < 0xDC00 || low2 >= 0xE000) fail("half a character in a text", start_);
        point = 0x10000 + ((point - 0xD800) << 10U) + (low2 - 0xDC00);
      }
      char character[kMaximumUTF8Length];
      text.append(character, encodeUTF8(point, character));
    }
    list_.add(std::move(text));
  }

  PropertyList::Index reference(Bytes references, std::size_t position) const {
    const std::uint64_t number =
        unsignedNumber(references.subspan(position * referenceSize_, referenceSize_));
    if (number >= objectCount_) fail("a collection with an element outside the table", start_);
    return static_cast<PropertyList::Index>(number);
  }

  // Takes the bytes of elements of `size` bytes each. `low`, or the integer that follows, is their number.
  Bytes takeElements(unsigned low, std::size_t size) {
    std::uint64_t count = low;
    if (low == 0xF) {
      const auto marker = std::to_integer<unsigned>(take(1)[0]);
      if (marker < 0x10 || marker > 0x13) fail("a collection without a count", start_);
      count = unsignedNumber(take(std::size_t{1} << (marker & 0xFU)));
    }
    if (count > bytesLeft_ / size) fail("an object that is larger than the file", start_);
    return take(count * size);
  }

  Bytes take(std::size_t size) {
    if (size > tableOffset_ - position_) fail("an object that runs out of the file", start_);
    if (size > bytesLeft_) fail("an object that overlaps another", start_);
    bytesLeft_ -= size;
    const Bytes taken = file_.subspan(position_, size);
    position_ += size;
    return taken;
  }

  Bytes file_;
  PropertyList list_;
  std::size_t offsetSize_ = 0;
  std::size_t referenceSize_ = 0;
  std::size_t objectCount_ = 0;
  std::size_t tableOffset_ = 0;
  std::size_t bytesLeft_ = 0;
  std::size_t start_ = 0;
  std::size_t position_ = 0;
};

}  // namespace

PropertyList PropertyList::decoded(std::span<const std::byte> bytes) {
  PropertyList list = Reader(bytes).read();
  if (const char* error = list.structuralError()) throw MalformedPropertyList(error);
  return list;
}

}  // namespace rt
