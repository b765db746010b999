#pragma once

/// Describes collections as text, as Runtime/Values/Array.h says.
///
/// Not for: users of collections. They call `description`.

#include <span>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt::detail {

/// An element of a set, or a key and its value in a dictionary. Neither object is retained.
struct DescribedEntry {
  const Object* key;
  const Object* value = nullptr;
};

/// Return the description of a collection with these elements, which must not be null. The elements of sets
/// and dictionaries may be in any order. Throw what the elements' descriptions throw, and std::bad_alloc.
String describeArray(std::span<const Ref<Object>> elements);
String describeSet(std::span<const DescribedEntry> elements);
String describeDictionary(std::span<const DescribedEntry> entries);

}  // namespace rt::detail
