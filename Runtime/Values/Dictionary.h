#pragma once

/// An immutable table from keys to objects, as an object.
///
///     rt::Ref<rt::Dictionary> ages = rt::Dictionary::of({{"Ann"_s, rt::Number::of(41)}});
///     if (rt::Number* age = ages->objectForKey<rt::Number>("Ann"_s)) ...
///
///     rt::Dictionary::Builder builder(*ages);               // another one, from it
///     builder.set("Bob"_s, rt::Number::of(7));
///     builder.remove("Ann"_s);
///     ages = builder.dictionary();
///
/// Keys are strings, numbers, or any objects whose `isEqual` and `hash` never change; neither keys nor values
/// are null. Two dictionaries are equal when they have equal values for equal keys. The order of a walk over
/// the entries is not specified. Any thread may use a dictionary whose keys and values bear that. Its
/// description is that of Runtime/Values/Private/CollectionDescription.h.
///
/// Not for: tables that nobody needs as an object, which are std::unordered_maps
/// (Runtime/Objects/Private/ObjectHash.h).

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <unordered_map>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Private/ObjectHash.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE Dictionary final : public Implements<Dictionary, Object> {
 public:
  using Entries = std::unordered_map<Ref<Object>, Ref<Object>, ObjectHash, ObjectEqual>;

  /// A dictionary in the making; for one thread at a time.
  class Builder {
   public:
    Builder() = default;
    /// Starts with the entries of `dictionary`.
    explicit Builder(const Dictionary& dictionary) : entries_(dictionary.entries_) {}

    /// Has `key`, not null, stand for `value`, whatever it stood for before; for nothing, where `value` is
    /// null. Throws std::invalid_argument for a null key, what a key's `hash` or `isEqual` throws, and
    /// std::bad_alloc; nothing has changed then.
    void set(const Ref<Object>& key, const Ref<Object>& value);

    /// Has `key`, which may be null, stand for nothing.
    void remove(const Object* key);
    void remove(const String& key) { remove(key.object()); }

    std::size_t count() const noexcept { return entries_.size(); }

    /// A dictionary with the entries that there are now. Throws std::bad_alloc.
    Ref<Dictionary> dictionary() const& { return make<Dictionary>(entries_); }
    Ref<Dictionary> dictionary() && { return make<Dictionary>(std::move(entries_)); }

   private:
    Entries entries_;
  };

  /// Empty.
  Dictionary() = default;

  /// With `entries`, neither keys nor values of which are null.
  explicit Dictionary(Entries entries) noexcept : entries_(std::move(entries)) {}

  /// With these entries, of equal keys the last; one whose value is null is left out. Throws like
  /// `Builder::set`.
  static Ref<Dictionary> of(std::initializer_list<std::pair<Ref<Object>, Ref<Object>>> entries);

  std::size_t count() const noexcept { return entries_.size(); }
  bool isEmpty() const noexcept { return entries_.empty(); }

  /// What `key` stands for, not retained; null where that is nothing, and for a null key.
  Object* objectForKey(const Object* key) const;
  Object* objectForKey(const String& key) const { return objectForKey(key.object()); }

  /// The same as a T; null also where it is none.
  template <class T>
    requires(ClassType<T> || ProtocolType<T>)
  T* objectForKey(const auto& key) const {
    return cast<T>(objectForKey(key));
  }

  /// The same as a string; null also where it is none.
  String stringForKey(const auto& key) const { return String::from(objectForKey(key)); }

  /// The entries, as pairs of key and value.
  Entries::const_iterator begin() const noexcept { return entries_.begin(); }
  Entries::const_iterator end() const noexcept { return entries_.end(); }

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;
  String description() const override;

 private:
  const Entries entries_;
};

}  // namespace rt
