#pragma once

#include <cstdint>
#include <functional>
#include <string_view>

#include "Image.h"

/// A name that an image takes from another image.
struct Import {
  std::string_view name;
  /// The number of a library of the importing image, or one of `macho::ordinal`.
  int ordinal;
  bool mayBeMissing;
};

/// Returns the address of an import. Returns 0 if it may be missing and is.
using Resolve = std::function<std::uint64_t(const Import&)>;

/// Writes the addresses into the image that depend on where it and others lie. A linker writes what to do in
/// one of two forms: as chains, in which each place says where the next one is, or as a program of opcodes.
/// `resolve` is called for each import.
///
/// Refuses a form or an opcode that it does not know.
void fixUp(const Image& image, const Resolve& resolve);
