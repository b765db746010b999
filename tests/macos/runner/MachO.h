#pragma once

// The parts of the Mach-O format that the runner reads. The names are those of <mach-o/loader.h>,
// <mach-o/nlist.h> and <mach-o/fixup-chains.h>, in this project's style. All numbers are little-endian, as on
// the machines that run this.

#include <array>
#include <cstdint>

namespace macho {

constexpr std::uint32_t kMagic64 = 0xfeedfacf;
constexpr std::uint32_t kProcessorX86_64 = 0x01000007;

/// Kinds of files.
enum class FileType : std::uint32_t { Executable = 2, Library = 6, Bundle = 8 };

/// Bits of `Header::flags`. Only images with these bits take part when weak definitions are shared between
/// images.
constexpr std::uint32_t kDefinesWeakSymbols = 0x8000;
constexpr std::uint32_t kBindsToWeakSymbols = 0x10000;

struct Header {
  std::uint32_t magic;
  std::uint32_t processor;
  std::uint32_t processorKind;
  FileType type;
  std::uint32_t commandCount;
  std::uint32_t commandSize;
  std::uint32_t flags;
  std::uint32_t reserved;
};

/// Kinds of load commands. A bit says that a loader which does not know the kind must refuse the file.
namespace command {
constexpr std::uint32_t kRequired = 0x80000000;
constexpr std::uint32_t kSymbolTable = 0x2;
constexpr std::uint32_t kDynamicSymbolTable = 0xb;
constexpr std::uint32_t kLibrary = 0xc;
constexpr std::uint32_t kInstallName = 0xd;
constexpr std::uint32_t kLinker = 0xe;
constexpr std::uint32_t kWeakLibrary = 0x18 | kRequired;
constexpr std::uint32_t kSegment = 0x19;
constexpr std::uint32_t kIdentifier = 0x1b;
constexpr std::uint32_t kSearchPath = 0x1c | kRequired;
constexpr std::uint32_t kCodeSignature = 0x1d;
constexpr std::uint32_t kReexportedLibrary = 0x1f | kRequired;
constexpr std::uint32_t kFixupOpcodes = 0x22 | kRequired;
constexpr std::uint32_t kFunctionStarts = 0x26;
constexpr std::uint32_t kMain = 0x28 | kRequired;
constexpr std::uint32_t kDataInCode = 0x29;
constexpr std::uint32_t kSourceVersion = 0x2a;
constexpr std::uint32_t kBuildVersion = 0x32;
constexpr std::uint32_t kExportsTrie = 0x33 | kRequired;
constexpr std::uint32_t kChainedFixups = 0x34 | kRequired;
}  // namespace command

struct Command {
  std::uint32_t kind;
  std::uint32_t size;
};

using Name = std::array<char, 16>;

struct Segment {
  Command command;
  Name name;
  std::uint64_t address;
  std::uint64_t size;
  std::uint64_t fileOffset;
  std::uint64_t fileSize;
  std::uint32_t greatestProtection;
  std::uint32_t protection;
  std::uint32_t sectionCount;
  std::uint32_t flags;
};

/// Kinds of sections that a loader treats, in the lowest byte of `Section::flags`.
enum class SectionType : std::uint8_t {
  Initialisers = 0x9,
  ThreadLocalData = 0x11,
  ThreadLocalZeros = 0x12,
  ThreadLocalDescriptors = 0x13,
  ThreadLocalInitialisers = 0x15,
  InitialiserOffsets = 0x16,
};

struct Section {
  Name name;
  Name segment;
  std::uint64_t address;
  std::uint64_t size;
  std::uint32_t fileOffset;
  std::uint32_t alignment;  // as a power of two
  std::uint32_t relocationOffset;
  std::uint32_t relocationCount;
  std::uint32_t flags;
  std::array<std::uint32_t, 3> reserved;

  SectionType type() const { return static_cast<SectionType>(flags & 0xff); }
};

/// A command with a text at `offset` from the command's start: a library, an install name or a search path.
struct TextCommand {
  Command command;
  std::uint32_t offset;
};

struct MainCommand {
  Command command;
  std::uint64_t offset;
  std::uint64_t stackSize;
};

/// A command that says where in the file its data is: chained fixups or exports.
struct DataCommand {
  Command command;
  std::uint32_t offset;
  std::uint32_t size;
};

struct Extent {
  std::uint32_t offset;
  std::uint32_t size;
};

struct FixupOpcodesCommand {
  Command command;
  Extent rebases;
  Extent binds;
  Extent weakBinds;
  Extent lazyBinds;
  Extent exports;
};

struct SymbolTableCommand {
  Command command;
  std::uint32_t symbolOffset;
  std::uint32_t symbolCount;
  std::uint32_t textOffset;
  std::uint32_t textSize;
};

struct Symbol {
  std::uint32_t name;
  std::uint8_t type;
  std::uint8_t section;
  std::uint16_t description;
  std::uint64_t value;

  bool isForDebuggers() const { return (type & 0xe0) != 0; }
  bool isDefinedInASection() const { return (type & 0x0e) == 0x0e; }
};

/// What an import's ordinal means if it is not the number of a library.
namespace ordinal {
constexpr int kSelf = 0;
constexpr int kMainProgram = -1;
constexpr int kAnyImage = -2;
constexpr int kWeakDefinitions = -3;
}  // namespace ordinal

}  // namespace macho
