// PropertyList::encoded.
#include <algorithm>
#include <bit>

#include "Runtime/Archive/Private/PropertyList.h"
#include "Runtime/Base/Private/UTF8.h"

namespace rt {

namespace {

constexpr std::string_view kHeader = "bplist00";

// Returns the binary logarithm of how many bytes `number` takes as an integer of the format.
unsigned log2Size(std::uint64_t number) {
  if (number <= 0xFF) return 0;
  if (number <= 0xFFFF) return 1;
  return number <= 0xFFFFFFFF ? 2 : 3;
}

// Returns `text` in UTF-16. Throws std::invalid_argument if it is not valid UTF-8.
std::u16string utf16(std::string_view text) {
  if (!isValidUTF8(text)) throw std::invalid_argument("a text in a property list is no valid UTF-8");
  std::u16string units;
  units.reserve(text.size());
  for (std::size_t position = 0; position < text.size();) {
    const auto at = [&](std::size_t i) { return char32_t{static_cast<unsigned char>(text[position + i])}; };
    const std::size_t length = nextUTF8(text.substr(position)).length;
    // In a character of several bytes, the leading ones of the first byte are their number.
    char32_t point = length == 1 ? at(0) : at(0) & (0x7FU >> length);
    for (std::size_t i = 1; i < length; ++i) point = point << 6U | (at(i) & 0x3F);
    if (point >= 0x10000) {
      units.push_back(static_cast<char16_t>(0xD800 + ((point - 0x10000) >> 10U)));
      point = 0xDC00 + (point & 0x3FF);
    }
    units.push_back(static_cast<char16_t>(point));
    position += length;
  }
  return units;
}

class Writer {
 public:
  explicit Writer(const PropertyList& list)
      : list_(list), referenceSize_(std::size_t{1} << log2Size(list.values.size() - 1)) {}

  std::vector<std::byte> write() {
    append(std::as_bytes(std::span(kHeader)));
    std::vector<std::size_t> offsets;
    offsets.reserve(list_.values.size());
    for (const PropertyList::Value& value : list_.values) {
      offsets.push_back(bytes_.size());
      std::visit([this](const auto& content) { writeObject(content); }, value);
    }
    const std::size_t tableOffset = bytes_.size();
    const std::size_t offsetSize = std::size_t{1} << log2Size(tableOffset);
    for (const std::size_t offset : offsets) appendNumber(offset, offsetSize);
    appendNumber(0, 6);
    appendNumber(offsetSize, 1);
    appendNumber(referenceSize_, 1);
    appendNumber(offsets.size(), 8);
    appendNumber(list_.root, 8);
    appendNumber(tableOffset, 8);
    return std::move(bytes_);
  }

 private:
  void writeObject(bool value) { appendNumber(value ? 0x09 : 0x08, 1); }
  void writeObject(std::int64_t value) {
    const auto number = static_cast<std::uint64_t>(value);
    appendInteger(number, value < 0 ? 3 : log2Size(number));
  }
  void writeObject(std::uint64_t value) {
    const bool isLarge = static_cast<std::int64_t>(value) < 0;
    appendInteger(value, isLarge ? 4 : log2Size(value));
  }
  void writeObject(double value) {
    appendNumber(0x23, 1);
    appendNumber(std::bit_cast<std::uint64_t>(value), 8);
  }
  void writeObject(const PropertyList::Text& text) {
    if (std::ranges::all_of(text, [](char c) { return static_cast<unsigned char>(c) < 0x80; })) {
      appendHeader(0x5, text.size());
      append(std::as_bytes(std::span(text)));
      return;
    }
    const std::u16string units = utf16(text);
    appendHeader(0x6, units.size());
    for (const char16_t unit : units) appendNumber(unit, 2);
  }
  void writeObject(PropertyList::Reference reference) {
    const unsigned size = 1U << log2Size(reference.number);
    appendNumber(0x80 | (size - 1), 1);
    appendNumber(reference.number, size);
  }
  void writeObject(const PropertyList::Array& array) {
    appendHeader(0xA, array.size());
    for (const PropertyList::Index index : array) appendNumber(index, referenceSize_);
  }
  void writeObject(const PropertyList::Dictionary& dictionary) {
    appendHeader(0xD, dictionary.size());
    for (const auto& entry : dictionary) appendNumber(entry.first, referenceSize_);
    for (const auto& entry : dictionary) appendNumber(entry.second, referenceSize_);
  }

  void appendHeader(unsigned kind, std::size_t count) {
    appendNumber(kind << 4U | std::min<std::size_t>(count, 0xF), 1);
    if (count >= 0xF) appendInteger(count, log2Size(count));
  }

  void appendInteger(std::uint64_t number, unsigned log2) {
    appendNumber(0x10 | log2, 1);
    appendNumber(number, std::size_t{1} << log2);
  }

  void appendNumber(std::uint64_t number, std::size_t size) {
    for (; size > 8; --size) bytes_.push_back(std::byte{0});
    for (; size > 0; --size) bytes_.push_back(static_cast<std::byte>(number >> (8 * (size - 1))));
  }

  void append(std::span<const std::byte> bytes) { bytes_.insert(bytes_.end(), bytes.begin(), bytes.end()); }

  const PropertyList& list_;
  std::size_t referenceSize_;
  std::vector<std::byte> bytes_;
};

}  // namespace

std::vector<std::byte> PropertyList::encoded() const {
  if (const char* error = structuralError()) throw std::invalid_argument(error);
  return Writer(*this).write();
}

}  // namespace rt
