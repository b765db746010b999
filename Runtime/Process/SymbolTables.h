#pragma once

// The names of functions that their images do not export. For the call stacks only.
//
// On Linux, `dladdr` knows exported functions alone, and nothing in a program that is linked statically. A
// program exports none of its own functions unless it is linked for that, so a logged call stack would have
// numbers where people look for names. CallStack_test and CallStack_static_test ask for the names of static
// functions.

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace rt::detail {

/// Reads the symbol tables in the files that the process's images were loaded from, each once, when it is
/// needed. A file that is no longer the one that was loaded, is damaged, or has no table, has no names. One
/// thread at a time.
class SymbolTables {
 public:
  struct Symbol {
    /// The path of the image; "" for the program itself.
    std::string image;
    /// Where the image was loaded.
    std::uint64_t imageStart = 0;
    /// The function, as the linker knows it, and where it starts; "" where it is not known.
    std::string function;
    std::uint64_t functionStart = 0;
  };

  /// What is known of `address`; none where it is in no image, and on systems that say by other means what
  /// there is to say. Throws std::bad_alloc.
  std::optional<Symbol> find(std::uint64_t address);

 private:
  struct Function {
    std::uint64_t start;
    std::uint64_t size;
    // Within `names`.
    std::uint32_t name;
  };
  struct Table {
    std::vector<Function> functions;
    std::string names;
  };
  struct Image;

  static Table read(const Image& image);

  // By where their images were loaded.
  std::map<std::uint64_t, Table> tables_;
};

}  // namespace rt::detail
