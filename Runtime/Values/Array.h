#pragma once

/// An immutable list of objects, as an object.
///
///     rt::Ref<rt::Array> names = rt::Array::of("first"_s, "second"_s);
///     for (const rt::Ref<rt::Object>& name : *names) ...
///     rt::String first = names->stringAt(0);
///
///     std::vector<rt::Ref<rt::Object>> elements;            // built piece by piece
///     elements.push_back(rt::Number::of(3));
///     rt::Ref<rt::Array> array = rt::make<rt::Array>(std::move(elements));
///
/// Holds no nulls. Two arrays are equal when their elements are, one by one. Any thread may use an array
/// whose elements bear that. Its description is that of Runtime/Values/Private/CollectionDescription.h.
///
/// Not for: lists that nobody needs as an object, which are std::vectors.

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
  /// Throws std::invalid_argument if one of the elements is null.
  explicit Array(std::vector<Ref<Object>> elements = {});

  /// An array of strings and references to objects. Throws like the constructor, and std::bad_alloc.
  template <class... Elements>
  static Ref<Array> of(const Elements&... elements) {
    return make<Array>(std::vector<Ref<Object>>{Ref<Object>(elements)...});
  }

  std::size_t count() const noexcept { return elements_.size(); }
  bool isEmpty() const noexcept { return elements_.empty(); }

  /// The element at `index`, not null, not retained. Throws std::out_of_range.
  Object* at(std::size_t index) const { return elements_.at(index).get(); }

  /// The same as a T; null where it is none.
  template <class T>
    requires(ClassType<T> || ProtocolType<T>)
  T* at(std::size_t index) const {
    return cast<T>(at(index));
  }

  /// The same as a string; null where it is none.
  String stringAt(std::size_t index) const { return String::from(at(index)); }

  /// Whether an element equals `object`; none equals null.
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
