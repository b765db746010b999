// An opcode is the upper half of a byte. The lower half is a small number, its immediate value.

#include "FixupOpcodes.h"

#include "Reader.h"
#include "Refusal.h"

namespace {

constexpr std::uint64_t kPointer = sizeof(std::uint64_t);

// A place in the image that moves on.
class Place {
 public:
  explicit Place(const Image& image) : image_(image) {}

  void moveTo(std::size_t segment, std::uint64_t offset) {
    if (segment >= image_.segments().size()) refuseShortFile();
    address_ = image_.segments()[segment].address + image_.slide() + offset;
  }
  void moveBy(std::uint64_t distance) { address_ += distance; }

  std::uint64_t& pointer() const {
    if (!image_.contains(address_) || !image_.contains(address_ + kPointer - 1)) refuseShortFile();
    return *reinterpret_cast<std::uint64_t*>(address_);
  }

 private:
  const Image& image_;
  std::uint64_t address_ = 0;
};

[[noreturn]] void refuseOpcode(const Image& image, const char* kind, unsigned byte) {
  refuse("%s has the %s opcode 0x%x", image.path().c_str(), kind, byte);
}

// Reads a count and a gap, and calls `step` with the gap as often as the count says.
template <class Step>
void repeatWithGaps(Reader& reader, const Step& step) {
  const std::uint64_t count = reader.number();
  const std::uint64_t gap = reader.number();
  for (std::uint64_t left = count; left != 0; --left) step(gap);
}

void rebase(const Image& image, FileBytes program) {
  enum : unsigned {
    kDone = 0x00,
    kSetType = 0x10,
    kSetPlace = 0x20,
    kMove = 0x30,
    kMoveByPointers = 0x40,
    kRebase = 0x50,
    kRebaseCounted = 0x60,
    kRebaseAndMove = 0x70,
    kRebaseCountedWithGaps = 0x80,
  };
  Reader reader(program);
  Place place(image);
  const auto rebaseOnce = [&](std::uint64_t gap) {
    place.pointer() += image.slide();
    place.moveBy(kPointer + gap);
  };
  while (!reader.isAtEnd()) {
    const unsigned byte = reader.byte();
    const unsigned immediate = byte & 0x0fU;
    switch (byte & 0xf0U) {
      case kDone:
        return;
      case kSetType:
        if (immediate != 1) refuseOpcode(image, "rebase", byte);
        break;
      case kSetPlace:
        place.moveTo(immediate, reader.number());
        break;
      case kMove:
        place.moveBy(reader.number());
        break;
      case kMoveByPointers:
        place.moveBy(immediate * kPointer);
        break;
      case kRebase:
        for (unsigned left = immediate; left != 0; --left) rebaseOnce(0);
        break;
      case kRebaseCounted:
        for (std::uint64_t left = reader.number(); left != 0; --left) rebaseOnce(0);
        break;
      case kRebaseAndMove:
        rebaseOnce(reader.number());
        break;
      case kRebaseCountedWithGaps:
        repeatWithGaps(reader, rebaseOnce);
        break;
      default:
        refuseOpcode(image, "rebase", byte);
    }
  }
}

enum class Binding : std::uint8_t { AtLoad, Weak, Lazy };

void bind(const Image& image, FileBytes program, Binding binding, const Resolve& resolve) {
  enum : unsigned {
    kDone = 0x00,
    kSetOrdinal = 0x10,
    kSetLongOrdinal = 0x20,
    kSetSpecialOrdinal = 0x30,
    kSetName = 0x40,
    kSetType = 0x50,
    kSetAddend = 0x60,
    kSetPlace = 0x70,
    kMove = 0x80,
    kBind = 0x90,
    kBindAndMove = 0xa0,
    kBindAndMoveByPointers = 0xb0,
    kBindCountedWithGaps = 0xc0,
  };
  constexpr unsigned kMayBeMissing = 1;
  constexpr unsigned kDefinesStrongSymbol = 8;
  Reader reader(program);
  Place place(image);
  Import import{.name = "", .ordinal = macho::ordinal::kWeakDefinitions, .mayBeMissing = false};
  std::int64_t addend = 0;
  const auto bindOnce = [&](std::uint64_t gap) {
    const std::uint64_t address = resolve(import);
    // A weak binding follows another one to the same place, which stays if no image defines the symbol.
    if (address != 0 || binding != Binding::Weak)
      place.pointer() = address + static_cast<std::uint64_t>(addend);
    place.moveBy(kPointer + gap);
  };
  while (!reader.isAtEnd()) {
    const unsigned byte = reader.byte();
    const unsigned immediate = byte & 0x0fU;
    switch (byte & 0xf0U) {
      case kDone:
        // Each lazy binding ends so, because the system may run it alone.
        if (binding != Binding::Lazy) return;
        break;
      case kSetOrdinal:
        import.ordinal = static_cast<int>(immediate);
        break;
      case kSetLongOrdinal:
        import.ordinal = static_cast<int>(reader.number());
        break;
      case kSetSpecialOrdinal:
        import.ordinal = immediate == 0 ? 0 : static_cast<int>(immediate) - 16;
        break;
      case kSetName:
        // The second flag only announces that this image has a definition that is not weak.
        if ((immediate & ~(kMayBeMissing | kDefinesStrongSymbol)) != 0) refuseOpcode(image, "bind", byte);
        import.mayBeMissing = binding == Binding::Weak || (immediate & kMayBeMissing) != 0;
        import.name = reader.text();
        break;
      case kSetType:
        if (immediate != 1) refuseOpcode(image, "bind", byte);
        break;
      case kSetAddend:
        addend = reader.signedNumber();
        break;
      case kSetPlace:
        place.moveTo(immediate, reader.number());
        break;
      case kMove:
        place.moveBy(reader.number());
        break;
      case kBind:
        bindOnce(0);
        break;
      case kBindAndMove:
        bindOnce(reader.number());
        break;
      case kBindAndMoveByPointers:
        bindOnce(immediate * kPointer);
        break;
      case kBindCountedWithGaps:
        repeatWithGaps(reader, bindOnce);
        break;
      default:
        refuseOpcode(image, "bind", byte);
    }
  }
}

}  // namespace

void obeyOpcodes(const Image& image, const macho::FixupOpcodesCommand& where, const Resolve& resolve) {
  const auto program = [&](const macho::Extent& extent) { return image.bytes(extent.offset, extent.size); };
  rebase(image, program(where.rebases));
  bind(image, program(where.binds), Binding::AtLoad, resolve);
  bind(image, program(where.lazyBinds), Binding::Lazy, resolve);
  bind(image, program(where.weakBinds), Binding::Weak, resolve);
}
