#pragma once

/// Describes collections as text. All collections use one layout:
///
///     | (                            an array has parentheses, and one element a line, in order
///     |     first,
///     |     "second one",
///     |     {                        a dictionary has braces, and one entry a line, sorted by key
///     |         count = 3;
///     |         "full name" = "A \"B\"\n";
///     |     },
///     |     {(                       a set has both brackets, and one element a line, sorted
///     |         1,
///     |         10
///     |     )},
///     |     (                        an empty collection has no line between its brackets
///     |     )
///     | )
///
/// An element appears as its `description`. Each further line of it is indented by four blanks, so that
/// collections nest. A string appears as it is if it is not empty and consists of A-Z a-z 0-9 _ . / - only.
/// Other strings are in double quotes. In them \" and \\ stand for a quote and a backslash, and \n \r \t and
/// \xNN for control characters.
///
/// The keys of dictionaries and the elements of sets are sorted. Numbers come first, by value, then strings,
/// by their bytes, then other objects, by their descriptions. So equal collections of strings and numbers
/// have equal descriptions.
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
