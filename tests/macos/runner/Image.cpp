#include "Image.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <limits>

#include "Reader.h"
#include "Refusal.h"

using namespace macho;

namespace {

constexpr std::uint64_t kPage = 4096;

std::string_view textOf(const Name& name) {
  return {name.data(), strnlen(name.data(), name.size())};
}

bool hasMemory(const Segment& segment) {
  return textOf(segment.name) != "__PAGEZERO" && segment.size != 0;
}

std::uint64_t roundedUp(std::uint64_t size) {
  return (size + kPage - 1) & ~(kPage - 1);
}

void* pointerTo(std::uint64_t address) {
  return reinterpret_cast<void*>(address);
}

}  // namespace

void refuseShortFile() {
  refuse("a Mach-O file ends in the middle of what it says");
}

FileBytes bytesOfFile(const std::string& path) {
  const int file = open(path.c_str(), O_RDONLY | O_CLOEXEC);
  struct stat status{};
  if (file < 0) return {};
  void* bytes = MAP_FAILED;
  if (fstat(file, &status) == 0 && status.st_size > 0) {
    bytes = mmap(nullptr, static_cast<std::size_t>(status.st_size), PROT_READ, MAP_PRIVATE, file, 0);
  }
  close(file);
  if (bytes == MAP_FAILED) return {};
  return {static_cast<const std::byte*>(bytes), static_cast<std::size_t>(status.st_size)};
}

bool isMachO(FileBytes file) {
  if (file.size() < sizeof(Header)) return false;
  const auto header = valueAt<Header>(file, 0);
  return header.magic == kMagic64 && header.processor == kProcessorX86_64;
}

Image::Image(std::string path, FileBytes file) : path_(std::move(path)), file_(file), header_() {
  if (!isMachO(file_)) refuse("%s is not a Mach-O file for x86-64", path_.c_str());
  header_ = valueAt<Header>(file_, 0);
  readCommands();
  map();
  if (exportsExtent_) readExports(bytes(exportsExtent_->offset, exportsExtent_->size));
}

void Image::readCommands() {
  std::size_t offset = sizeof(Header);
  for (std::uint32_t left = header_.commandCount; left != 0; --left) {
    const auto command = valueAt<Command>(file_, offset);
    readCommand(command, offset);
    offset += command.size;
  }
}

void Image::readCommand(const Command& command, std::size_t offset) {
  switch (command.kind) {
    case command::kSegment: {
      const auto segment = valueAt<Segment>(file_, offset);
      segments_.push_back(segment);
      for (std::uint32_t number = 0; number < segment.sectionCount; ++number) {
        sections_.push_back(
            valueAt<Section>(file_, offset + sizeof(Segment) + std::size_t{number} * sizeof(Section)));
      }
      break;
    }
    case command::kLibrary:
    case command::kWeakLibrary:
      libraries_.push_back({text(offset), command.kind == command::kWeakLibrary});
      break;
    case command::kSearchPath:
      searchPaths_.push_back(text(offset));
      break;
    case command::kInstallName:
      installName_ = text(offset);
      break;
    case command::kChainedFixups:
      chainedFixups_ = valueAt<DataCommand>(file_, offset);
      break;
    case command::kFixupOpcodes:
      fixupOpcodes_ = valueAt<FixupOpcodesCommand>(file_, offset);
      exportsExtent_ = fixupOpcodes_->exports;
      break;
    case command::kExportsTrie: {
      const auto trie = valueAt<DataCommand>(file_, offset);
      exportsExtent_ = Extent{.offset = trie.offset, .size = trie.size};
      break;
    }
    case command::kSymbolTable:
      symbols_ = valueAt<SymbolTableCommand>(file_, offset);
      break;
    case command::kMain:
      entry_ = valueAt<MainCommand>(file_, offset).offset;
      break;
    // What these say does not matter to a loader that binds everything at once and checks no signature.
    case command::kDynamicSymbolTable:
    case command::kLinker:
    case command::kIdentifier:
    case command::kCodeSignature:
    case command::kFunctionStarts:
    case command::kDataInCode:
    case command::kSourceVersion:
    case command::kBuildVersion:
      break;
    default:
      refuse("%s has the load command 0x%x", path_.c_str(), command.kind);
  }
}

std::string Image::text(std::size_t commandOffset) const {
  const auto command = valueAt<TextCommand>(file_, commandOffset);
  return std::string(Reader(file_, commandOffset + command.offset).text());
}

void Image::map() {
  std::uint64_t low = std::numeric_limits<std::uint64_t>::max();
  std::uint64_t high = 0;
  for (const Segment& segment : segments_) {
    if (!hasMemory(segment)) continue;
    low = std::min(low, segment.address);
    high = std::max(high, roundedUp(segment.address + segment.size));
  }
  if (low >= high) refuse("%s has no segment", path_.c_str());
  void* memory = mmap(nullptr, high - low, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) refuse("there is no memory for %s", path_.c_str());
  start_ = reinterpret_cast<std::uint64_t>(memory);
  end_ = start_ + (high - low);
  slide_ = start_ - low;
  for (const Segment& segment : segments_) {
    if (!hasMemory(segment)) continue;
    if (segment.fileSize > segment.size) refuseShortFile();
    const FileBytes content = bytes(segment.fileOffset, segment.fileSize);
    std::ranges::copy(content, static_cast<std::byte*>(pointerTo(segment.address + slide_)));
  }
}

FileBytes Image::bytes(std::uint64_t offset, std::uint64_t size) const {
  if (offset > file_.size() || file_.size() - offset < size) refuseShortFile();
  return file_.subspan(offset, size);
}

const void* Image::header() const {
  return pointerTo(start_);
}

bool Image::contains(const void* address) const {
  return contains(reinterpret_cast<std::uint64_t>(address));
}

std::span<std::byte> Image::memory(const Section& section) const {
  return {static_cast<std::byte*>(pointerTo(section.address + slide_)), section.size};
}

std::span<std::byte> Image::section(std::string_view segment, std::string_view name) const {
  for (const Section& each : sections_) {
    if (textOf(each.segment) == segment && textOf(each.name) == name) return memory(each);
  }
  return {};
}

// The trie's edges are parts of names. A node that ends a name has data: flags and an address.
void Image::readExports(FileBytes trie) {
  if (trie.empty()) return;
  constexpr std::uint64_t kKindMask = 0x3;
  constexpr std::uint64_t kAbsolute = 0x2;
  constexpr std::uint64_t kWeak = 0x4;
  constexpr std::uint64_t kReexport = 0x8;
  constexpr std::uint64_t kResolver = 0x10;
  struct Node {
    std::size_t offset;
    std::string name;
  };
  std::vector<Node> open{{.offset = 0, .name = ""}};
  std::size_t visited = 0;
  while (!open.empty()) {
    if (++visited > trie.size()) refuse("%s has a loop in its exports", path_.c_str());
    const Node node = std::move(open.back());
    open.pop_back();
    Reader reader(trie, node.offset);
    const std::uint64_t size = reader.number();
    const std::size_t edges = reader.position() + size;
    if (size != 0) {
      const std::uint64_t flags = reader.number();
      if ((flags & (kReexport | kResolver)) != 0 || (flags & kKindMask) == kKindMask) {
        refuse("%s exports %s with the flags 0x%llx", path_.c_str(), node.name.c_str(),
               static_cast<unsigned long long>(flags));
      }
      const std::uint64_t value = reader.number();
      const bool isAbsolute = (flags & kKindMask) == kAbsolute;
      exports_[node.name] = {.address = isAbsolute ? value : start_ + value, .isWeak = (flags & kWeak) != 0};
    }
    Reader edge(trie, edges);
    for (unsigned left = edge.byte(); left != 0; --left) {
      std::string name = node.name + std::string(edge.text());
      open.push_back({.offset = edge.number(), .name = std::move(name)});
    }
  }
}

std::optional<Image::Export> Image::exported(std::string_view name) const {
  const auto found = exports_.find(std::string(name));
  if (found == exports_.end()) return std::nullopt;
  return found->second;
}

std::optional<Image::NearestSymbol> Image::symbolBefore(std::uint64_t address) const {
  if (!symbols_) return std::nullopt;
  std::optional<NearestSymbol> nearest;
  for (std::size_t number = 0; number < symbols_->symbolCount; ++number) {
    const auto symbol = valueAt<Symbol>(file_, symbols_->symbolOffset + number * sizeof(Symbol));
    if (symbol.isForDebuggers() || !symbol.isDefinedInASection()) continue;
    const std::uint64_t begin = symbol.value + slide_;
    if (begin > address || (nearest && begin <= nearest->address)) continue;
    std::string_view name = Reader(file_, std::size_t{symbols_->textOffset} + symbol.name).text();
    if (name.starts_with('_')) name.remove_prefix(1);
    nearest = {.name = name.data(), .address = begin};
  }
  return nearest;
}

Image::ThreadLocals Image::threadLocals() const {
  std::uint64_t begin = std::numeric_limits<std::uint64_t>::max();
  std::uint64_t endOfData = 0;
  std::uint64_t end = 0;
  ThreadLocals result;
  for (const Section& section : sections_) {
    const bool isData = section.type() == SectionType::ThreadLocalData;
    if (!isData && section.type() != SectionType::ThreadLocalZeros) continue;
    begin = std::min(begin, section.address);
    end = std::max(end, section.address + section.size);
    if (isData) endOfData = std::max(endOfData, section.address + section.size);
    result.alignment = std::max(result.alignment, std::size_t{1} << section.alignment);
  }
  if (end == 0) return {};
  result.size = end - begin;
  if (endOfData != 0) {
    result.data = {static_cast<const std::byte*>(pointerTo(begin + slide_)), endOfData - begin};
  }
  return result;
}

std::uint64_t Image::entry() const {
  if (!entry_) refuse("%s has no main", path_.c_str());
  return start_ + *entry_;
}

void Image::protect() const {
  for (const Segment& segment : segments_) {
    if (!hasMemory(segment)) continue;
    // The bits for reading, writing and executing are the same on both systems.
    static_assert(PROT_READ == 1 && PROT_WRITE == 2 && PROT_EXEC == 4);
    const int protection = static_cast<int>(segment.protection & 7U);
    if (mprotect(pointerTo(segment.address + slide_), roundedUp(segment.size), protection) != 0) {
      refuse("%s cannot be protected", path_.c_str());
    }
  }
}

void Image::unload() const {
  mprotect(pointerTo(start_), end_ - start_, PROT_NONE);
}
