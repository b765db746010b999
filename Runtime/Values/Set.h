#pragma once

/// An immutable set of objects, as an object.
///
///     rt::Ref<rt::Set> tags = rt::Set::of("one"_s, "two"_s);
///     if (tags->contains("one"_s)) ...
///
///     rt::Set::Builder builder(*tags);                      // another one, from it
///     builder.add("three"_s);
///     tags = builder.set();
///
/// No two elements are equal, and none is null; their `isEqual` and `hash` must never change. Two sets are
/// equal when they have equal elements. The order of a walk over the elements is not specified. Any thread
/// may use a set whose elements bear that. Its description is that of
/// Runtime/Values/Private/CollectionDescription.h.
///
/// Not for: sets that nobody needs as an object, which are std::unordered_sets
/// (Runtime/Objects/Private/ObjectHash.h).

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

  /// A set in the making; for one thread at a time.
  class Builder {
   public:
    Builder() = default;
    /// Starts with the elements of `set`.
    explicit Builder(const Set& set) : elements_(set.elements_) {}

    /// Adds `object`, not null, unless there is an equal one, which stays; returns whether it was added.
    /// Throws std::invalid_argument for null, what an element's `hash` or `isEqual` throws, and
    /// std::bad_alloc; nothing has changed then.
    bool add(const Ref<Object>& object);

    /// Removes the element that equals `object`, which may be null; returns whether there was one.
    bool remove(const Object* object);
    bool remove(const String& string) { return remove(string.object()); }

    std::size_t count() const noexcept { return elements_.size(); }

    /// A set with the elements that there are now. Throws std::bad_alloc.
    Ref<Set> set() const& { return make<Set>(elements_); }
    Ref<Set> set() && { return make<Set>(std::move(elements_)); }

   private:
    Elements elements_;
  };

  /// Empty.
  Set() = default;

  /// With `elements`, none of which is null.
  explicit Set(Elements elements) noexcept : elements_(std::move(elements)) {}

  /// A set of strings and references to objects, of equal ones the first. Throws like `Builder::add`.
  template <class... Objects>
  static Ref<Set> of(const Objects&... objects) {
    Builder builder;
    (builder.add(Ref<Object>(objects)), ...);
    return std::move(builder).set();
  }

  std::size_t count() const noexcept { return elements_.size(); }
  bool isEmpty() const noexcept { return elements_.empty(); }

  /// The element that equals `object`, not retained; null where there is none, and for null.
  Object* member(const Object* object) const;

  /// Whether an element equals `object`; none equals null.
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
