#pragma once

/// An immutable set of objects, as an object.
///
///     rt::Ref<rt::Set> tags = rt::Set::of("one"_s, "two"_s);
///     if (tags->contains("one"_s)) ...
///
///     rt::Set::Builder builder(*tags);                      // builds a changed copy
///     builder.add("three"_s);
///     tags = builder.set();
///
/// No two elements are equal, and no element is null. Their `isEqual` and `hash` must never change. Two sets
/// are equal if they have equal elements. The order of iteration is unspecified.
/// Runtime/Values/Array.h has the layout of the description.
///
/// Ownership: a set retains its elements.
/// Threads: thread-safe if the elements are.
/// Not for: sets that need not be objects. Use std::unordered_set for those, with the hash and equality of
/// Runtime/Objects/Private/ObjectHash.h.

#include <cstddef>
#include <cstdint>
#include <unordered_set>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Private/ObjectHash.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE Set final : public Implements<Set, Object> {
 public:
  using Elements = std::unordered_set<Ref<Object>, ObjectHash, ObjectEqual>;

  /// Builds a set. Threads: not thread-safe.
  class Builder {
   public:
    Builder() = default;
    /// Starts with the elements of `set`.
    explicit Builder(const Set& set) : elements_(set.elements_) {}

    /// Adds `object` and returns true. If an element equals it, keeps that element and returns false.
    /// Errors: throws std::invalid_argument for null, what an element's `hash` or `isEqual` throws, and
    /// std::bad_alloc. The builder is unchanged then.
    bool add(const Ref<Object>& object);

    /// Removes the element that equals `object`. Returns whether there was such an element. False for null.
    bool remove(const Object* object);
    bool remove(const String& string) { return remove(string.object()); }

    std::size_t count() const noexcept { return elements_.size(); }

    /// Returns a set with the present elements. Throws std::bad_alloc.
    Ref<Set> set() const& { return make<Set>(elements_); }
    Ref<Set> set() && { return make<Set>(std::move(elements_)); }

   private:
    Elements elements_;
  };

  /// Makes an empty set.
  Set() = default;

  /// Makes a set of `elements`. Precondition: no element is null.
  explicit Set(Elements elements) noexcept : elements_(std::move(elements)) {}

  /// Returns a set of strings and references to objects. It has the first of several equal objects. Throws
  /// what `Builder::add` throws.
  template <class... Objects>
  static Ref<Set> of(const Objects&... objects) {
    Builder builder;
    (builder.add(Ref<Object>(objects)), ...);
    return std::move(builder).set();
  }

  std::size_t count() const noexcept { return elements_.size(); }
  bool isEmpty() const noexcept { return elements_.empty(); }

  /// Returns the element that equals `object`. Returns null if there is no such element, and for null. The
  /// set retains the element.
  Object* member(const Object* object) const;

  /// Returns whether an element equals `object`. False for null.
  bool contains(const Object* object) const { return member(object) != nullptr; }
  bool contains(const String& string) const { return contains(string.object()); }

  Elements::const_iterator begin() const noexcept { return elements_.begin(); }
  Elements::const_iterator end() const noexcept { return elements_.end(); }

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;
  String description() const override;

 private:
  const Elements elements_;
};

}  // namespace rt
