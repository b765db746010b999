#include "Runtime/Process/SymbolTables.h"

namespace rt::detail {

// On this system `dladdr` also finds functions that an image does not export.
std::optional<SymbolTables::Symbol> SymbolTables::find(std::uint64_t) {
  return std::nullopt;
}

}  // namespace rt::detail
