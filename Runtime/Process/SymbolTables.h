#pragma once

// Finds the names of functions that their images do not export. Internal to Runtime/Process/CallStack.h.

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace rt::detail {

/// Reads the symbol tables in the files of the images that this process has loaded. Reads each file at most
/// once, when it is first needed. Finds no names in a file that is damaged, has no symbol table, or is not
/// the one that was loaded. Threads: not thread-safe.
class SymbolTables {
 public:
  struct Symbol {
    /// The path of the image; "" for the program itself.
    std::string image;
    /// The address at which the image was loaded.
    std::uint64_t imageStart = 0;
    /// The function's mangled name, or "" if it is unknown, and its address.
    std::string function;
    std::uint64_t functionStart = 0;
  };

  /// Returns the image and the function that contain `address`. Returns std::nullopt if no image contains it,
  /// and always on macOS, where `dladdr` finds such functions itself. Throws std::bad_alloc.
  std::optional<Symbol> find(std::uint64_t address);

 private:
  struct Function {
    std::uint64_t start;
    std::uint64_t size;
    // An index in `names`.
    std::uint32_t name;
  };
  struct Table {
    std::vector<Function> functions;
    std::string names;
  };
  struct Image;

  static Table read(const Image& image);

  // The key is the address at which the image was loaded.
  std::map<std::uint64_t, Table> tables_;
};

}  // namespace rt::detail
