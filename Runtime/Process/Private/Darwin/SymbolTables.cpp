#include "Runtime/Process/Private/SymbolTables.h"

namespace rt::detail {

// The system's own function finds what an image does not export, too.
std::optional<SymbolTables::Symbol> SymbolTables::find(std::uint64_t) {
  return std::nullopt;
}

}  // namespace rt::detail
