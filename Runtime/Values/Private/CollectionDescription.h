#pragma once

/// How collections describe themselves. All of them, whatever holds them, go by one rule:
///
///     | (                            an array in parentheses, one element a line, in its order
///     |     first,
///     |     "second one",
///     |     {                        a dictionary in braces, one entry a line, ordered by key
///     |         count = 3;
///     |         "full name" = "A \"B\"\n";
///     |     },
///     |     {(                       a set in both, one element a line, ordered
///     |         1,
///     |         10
///     |     )},
///     |     (                        an empty collection has no line of its own between its brackets
///     |     )
///     | )
///
/// An element is described by its `description`, and what follows a line end in it is indented by four
/// blanks, so that collections nest. A string is written as it is if it is made of A-Z a-z 0-9 _ . / - only
/// and not empty. Otherwise it stands in double quotes, with \" \\ \n \r \t for these characters and \xNN
/// for other control characters. Keys of dictionaries and elements of sets are ordered: numbers by value,
/// then strings by their bytes, then others by their descriptions; so equal collections of strings and
/// numbers have equal descriptions.
///
/// Not for: callers of collections, who ask for `description`.

#include <span>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt::detail {

/// An element of a set, or a key of a dictionary with its value. Neither is retained.
struct DescribedEntry {
  const Object* key;
  const Object* value = nullptr;
};

/// The descriptions of the collections with these elements, none of which is null, in any order. Throw what
/// the elements' descriptions throw, and std::bad_alloc.
String describeArray(std::span<const Ref<Object>> elements);
String describeSet(std::span<const DescribedEntry> elements);
String describeDictionary(std::span<const DescribedEntry> entries);

}  // namespace rt::detail
