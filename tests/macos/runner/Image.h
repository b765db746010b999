#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "MachO.h"

/// The bytes of a file. They stay mapped for ever, because names of symbols point into them.
using FileBytes = std::span<const std::byte>;

/// Maps a file. Returns no bytes if there is no such file, or if it cannot be read.
FileBytes bytesOfFile(const std::string& path);

/// Returns whether the bytes begin as a Mach-O file for this processor does.
bool isMachO(FileBytes file);

/// Returns the value of the type T at `offset` of the bytes. Refuses the file if it ends earlier.
template <class T>
T valueAt(FileBytes bytes, std::size_t offset);

/// A Mach-O file in memory: a program, a library or a bundle.
///
/// The constructor reads the load commands and maps the segments, all of them writable, so that they can be
/// fixed up. It refuses a file with a load command that it does not know.
///
/// Threads: not thread-safe until `protect` has returned; afterwards thread-safe.
class Image {
 public:
  struct Export {
    std::uint64_t address;
    bool isWeak;
  };

  struct Library {
    std::string name;
    bool mayBeMissing;
  };

  /// Where an initialised thread-local variable gets its value from: `data`, then zeros up to `size`.
  struct ThreadLocals {
    FileBytes data;
    std::size_t size = 0;
    std::size_t alignment = 1;
  };

  Image(std::string path, FileBytes file);
  Image(const Image&) = delete;
  Image& operator=(const Image&) = delete;

  const std::string& path() const { return path_; }
  const std::string& installName() const { return installName_; }
  macho::FileType type() const { return header_.type; }
  bool sharesWeakSymbols() const {
    return (header_.flags & (macho::kDefinesWeakSymbols | macho::kBindsToWeakSymbols)) != 0;
  }

  /// The libraries that the image needs, in the order of their ordinals, of which the first is 1.
  const std::vector<Library>& libraries() const { return libraries_; }
  /// Where "@rpath" of this image's libraries leads.
  const std::vector<std::string>& searchPaths() const { return searchPaths_; }

  /// The address at which the image begins.
  std::uint64_t start() const { return start_; }
  const void* header() const;
  /// What to add to an address in the file to get the address in memory.
  std::uint64_t slide() const { return slide_; }
  bool contains(std::uint64_t address) const { return address >= start_ && address < end_; }
  bool contains(const void* address) const;

  /// All segments but __PAGEZERO have memory.
  const std::vector<macho::Segment>& segments() const { return segments_; }
  const std::vector<macho::Section>& sections() const { return sections_; }
  /// Returns the section's bytes in memory, or nothing if there is no such section.
  std::span<std::byte> section(std::string_view segment, std::string_view name) const;
  std::span<std::byte> memory(const macho::Section& section) const;

  const std::optional<macho::DataCommand>& chainedFixups() const { return chainedFixups_; }
  const std::optional<macho::FixupOpcodesCommand>& fixupOpcodes() const { return fixupOpcodes_; }
  /// A part of the file. Refuses the file if it ends earlier.
  FileBytes bytes(std::uint64_t offset, std::uint64_t size) const;

  /// Names begin with the underscore of C.
  std::optional<Export> exported(std::string_view name) const;

  /// The last symbol at or before the address, without C's underscore. Null if there is none.
  struct NearestSymbol {
    const char* name;
    std::uint64_t address;
  };
  std::optional<NearestSymbol> symbolBefore(std::uint64_t address) const;

  /// Empty if the image has no thread-local variables.
  ThreadLocals threadLocals() const;

  /// The address of `main`. The image must be a program.
  std::uint64_t entry() const;

  /// Gives the segments the protection that they ask for.
  void protect() const;
  /// Makes every access to the image fail. It keeps its addresses.
  void unload() const;

 private:
  void readCommands();
  void readCommand(const macho::Command& command, std::size_t offset);
  std::string text(std::size_t commandOffset) const;
  void map();
  void readExports(FileBytes trie);

  std::string path_;
  FileBytes file_;
  macho::Header header_;
  std::string installName_;
  std::vector<Library> libraries_;
  std::vector<std::string> searchPaths_;
  std::vector<macho::Segment> segments_;
  std::vector<macho::Section> sections_;
  std::optional<macho::DataCommand> chainedFixups_;
  std::optional<macho::FixupOpcodesCommand> fixupOpcodes_;
  std::optional<macho::SymbolTableCommand> symbols_;
  std::optional<macho::Extent> exportsExtent_;
  std::optional<std::uint64_t> entry_;
  std::unordered_map<std::string, Export> exports_;
  std::uint64_t start_ = 0;
  std::uint64_t end_ = 0;
  std::uint64_t slide_ = 0;
};

[[noreturn]] void refuseShortFile();

template <class T>
T valueAt(FileBytes bytes, std::size_t offset) {
  if (offset > bytes.size() || bytes.size() - offset < sizeof(T)) refuseShortFile();
  T value;
  std::memcpy(&value, bytes.data() + offset, sizeof(T));
  return value;
}
