#pragma once

/// An immutable list of objects, as an object.
///
///     rt::Ref<rt::Array> names = rt::Array::of("first"_s, "second"_s);
///     for (const rt::Ref<rt::Object>& name : *names) ...
///     rt::String first = names->stringAt(0);
///
///     std::vector<rt::Ref<rt::Object>> elements;            // built element by element
///     elements.push_back(rt::Number::of(3));
///     rt::Ref<rt::Array> array = rt::make<rt::Array>(std::move(elements));
///
/// No element is null. Two arrays are equal if their elements are equal, in order.
///
/// The descriptions of all collections have one layout:
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
/// Ownership: an array retains its elements.
/// Threads: thread-safe if the elements are.
/// Not for: lists that need not be objects. Use std::vector for those.

#include <cstddef>
#include <cstdint>
#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE Array : public Implements<Array, Object> {
 public:
  /// Throws std::invalid_argument if an element is null.
  explicit Array(std::vector<Ref<Object>> elements = {});

  /// Returns an array of strings and references to objects. Throws as the constructor does, and
  /// std::bad_alloc.
  template <class... Elements>
  static Ref<Array> of(const Elements&... elements) {
    return make<Array>(std::vector<Ref<Object>>{Ref<Object>(elements)...});
  }

  std::size_t count() const noexcept { return elements_.size(); }
  bool isEmpty() const noexcept { return elements_.empty(); }

  /// Returns the element at `index`, never null. The array retains it. Throws std::out_of_range.
  Object* at(std::size_t index) const { return elements_.at(index).get(); }

  /// Returns the element at `index` as a T, or null if it is not a T. Throws std::out_of_range.
  template <class T>
    requires(ClassType<T> || ProtocolType<T>)
  T* at(std::size_t index) const {
    return cast<T>(at(index));
  }

  /// Returns the element at `index` as a string, or null if it is not a string. Throws std::out_of_range.
  String stringAt(std::size_t index) const { return String::from(at(index)); }

  /// Returns whether an element equals `object`. False for null.
  bool contains(const Object* object) const;

  using Iterator = std::vector<Ref<Object>>::const_iterator;
  Iterator begin() const noexcept { return elements_.begin(); }
  Iterator end() const noexcept { return elements_.end(); }

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;
  String description() const override;

 private:
  const std::vector<Ref<Object>> elements_;
};

}  // namespace rt
