#pragma once

/// Function objects with which the standard library's hash tables compare objects by `isEqual` and `hash`.
/// Such a table may be searched by pointer, without a reference.
///
///     std::unordered_set<rt::Ref<rt::Object>, rt::ObjectHash, rt::ObjectEqual> objects;
///     objects.find(object.get());
///
/// Not for: tables that go by identity. std::hash and == of references do that.

#include <cstddef>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

struct ObjectHash {
  using is_transparent = void;
  std::size_t operator()(const Object* object) const { return object->hash(); }
  std::size_t operator()(const Ref<Object>& object) const { return object->hash(); }
};

struct ObjectEqual {
  using is_transparent = void;
  bool operator()(const Object* first, const Object* second) const { return isEqual(first, second); }
  bool operator()(const Ref<Object>& first, const Ref<Object>& second) const {
    return isEqual(first.get(), second.get());
  }
  bool operator()(const Ref<Object>& first, const Object* second) const {
    return isEqual(first.get(), second);
  }
  bool operator()(const Object* first, const Ref<Object>& second) const {
    return isEqual(first, second.get());
  }
};

}  // namespace rt
