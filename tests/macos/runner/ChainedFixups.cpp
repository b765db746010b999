// Each page of a segment may have one chain. A place in it is 8 bytes: what to write, and the distance to the
// next place.

#include "ChainedFixups.h"

#include <vector>

#include "Reader.h"
#include "Refusal.h"

namespace {

// struct dyld_chained_fixups_header
struct ChainsHeader {
  std::uint32_t version;
  std::uint32_t startsOffset;
  std::uint32_t importsOffset;
  std::uint32_t namesOffset;
  std::uint32_t importCount;
  std::uint32_t importFormat;
  std::uint32_t namesFormat;
};

enum class ImportFormat : std::uint32_t { Plain = 1, WithAddend = 2, WithLongAddend = 3 };

// struct dyld_chained_starts_in_segment, whose last member is an array of `pageCount` numbers.
struct SegmentStarts {
  std::uint32_t size;
  std::uint16_t pageSize;
  std::uint16_t pointerFormat;
  std::uint64_t segmentOffset;
  std::uint32_t greatestAddress;
  std::uint16_t pageCount;
};
constexpr std::size_t kPageStarts = 22;
constexpr std::uint16_t kNoChain = 0xffff;
constexpr std::uint16_t kSeveralChains = 0x8000;

// The linker makes pointers of one form: targets are addresses in the file.
constexpr std::uint16_t kTargetIsAddress = 2;

std::uint64_t bits(std::uint64_t value, unsigned first, unsigned count) {
  return (value >> first) & ((std::uint64_t{1} << count) - 1);
}

// The numbers from the greatest downwards stand for the negative ones.
int ordinalOf(std::uint64_t raw, unsigned width) {
  const auto ordinal = static_cast<int>(raw);
  return ordinal > (1 << width) - 16 ? ordinal - (1 << width) : ordinal;
}

std::vector<std::uint64_t> resolveImports(const Image& image, FileBytes data, const ChainsHeader& header,
                                          const Resolve& resolve) {
  std::vector<std::uint64_t> addresses;
  addresses.reserve(header.importCount);
  const auto resolved = [&](int ordinal, bool mayBeMissing, std::uint64_t nameOffset) {
    const std::string_view name = Reader(data, header.namesOffset + nameOffset).text();
    return resolve({.name = name, .ordinal = ordinal, .mayBeMissing = mayBeMissing});
  };
  for (std::size_t number = 0; number < header.importCount; ++number) {
    switch (static_cast<ImportFormat>(header.importFormat)) {
      case ImportFormat::Plain: {
        const auto word = valueAt<std::uint32_t>(data, header.importsOffset + number * 4);
        addresses.push_back(
            resolved(ordinalOf(bits(word, 0, 8), 8), bits(word, 8, 1) != 0, bits(word, 9, 23)));
        break;
      }
      case ImportFormat::WithAddend: {
        const std::size_t offset = header.importsOffset + number * 8;
        const auto word = valueAt<std::uint32_t>(data, offset);
        const auto addend = valueAt<std::int32_t>(data, offset + 4);
        addresses.push_back(
            resolved(ordinalOf(bits(word, 0, 8), 8), bits(word, 8, 1) != 0, bits(word, 9, 23)) +
            static_cast<std::uint64_t>(std::int64_t{addend}));
        break;
      }
      case ImportFormat::WithLongAddend: {
        const std::size_t offset = header.importsOffset + number * 16;
        const auto word = valueAt<std::uint64_t>(data, offset);
        const auto addend = valueAt<std::uint64_t>(data, offset + 8);
        addresses.push_back(
            resolved(ordinalOf(bits(word, 0, 16), 16), bits(word, 16, 1) != 0, bits(word, 32, 32)) + addend);
        break;
      }
      default:
        refuse("%s has imports of the form %u", image.path().c_str(), header.importFormat);
    }
  }
  return addresses;
}

void followChain(const Image& image, std::uint64_t place, const std::vector<std::uint64_t>& imports) {
  for (;;) {
    auto* const pointer = reinterpret_cast<std::uint64_t*>(place);
    const std::uint64_t value = *pointer;
    if (bits(value, 63, 1) != 0) {
      const std::uint64_t number = bits(value, 0, 24);
      if (number >= imports.size()) refuseShortFile();
      *pointer = imports[number] + bits(value, 24, 8);
    } else {
      *pointer = (bits(value, 0, 36) | (bits(value, 36, 8) << 56)) + image.slide();
    }
    const std::uint64_t distance = bits(value, 51, 12) * 4;
    if (distance == 0) return;
    place += distance;
  }
}

}  // namespace

void followChains(const Image& image, const macho::DataCommand& where, const Resolve& resolve) {
  const FileBytes data = image.bytes(where.offset, where.size);
  const auto header = valueAt<ChainsHeader>(data, 0);
  if (header.version != 0 || header.namesFormat != 0) {
    refuse("%s has chained fixups of version %u", image.path().c_str(), header.version);
  }
  const std::vector<std::uint64_t> imports = resolveImports(image, data, header, resolve);
  const auto segmentCount = valueAt<std::uint32_t>(data, header.startsOffset);
  for (std::size_t segment = 0; segment < segmentCount; ++segment) {
    const auto offset = valueAt<std::uint32_t>(data, header.startsOffset + 4 + segment * 4);
    if (offset == 0) continue;
    const std::size_t begin = header.startsOffset + offset;
    const auto starts = valueAt<SegmentStarts>(data, begin);
    if (starts.pointerFormat != kTargetIsAddress) {
      refuse("%s has chained pointers of the form %u", image.path().c_str(), starts.pointerFormat);
    }
    for (std::size_t page = 0; page < starts.pageCount; ++page) {
      const auto start = valueAt<std::uint16_t>(data, begin + kPageStarts + page * 2);
      if (start == kNoChain) continue;
      if ((start & kSeveralChains) != 0) refuse("%s has several chains in a page", image.path().c_str());
      followChain(image, image.start() + starts.segmentOffset + page * starts.pageSize + start, imports);
    }
  }
}
