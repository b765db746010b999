#pragma once

/// An immutable table from keys to objects, as an object.
///
///     rt::Ref<rt::Dictionary> ages = rt::Dictionary::of({{"Ann"_s, rt::Number::of(41)}});
///     if (rt::Number* age = ages->objectForKey<rt::Number>("Ann"_s)) ...
///
///     rt::Dictionary::Builder builder(*ages);               // builds a changed copy
///     builder.set("Bob"_s, rt::Number::of(7));
///     builder.remove("Ann"_s);
///     ages = builder.dictionary();
///
/// A key is a string, a number, or any object whose `isEqual` and `hash` never change. No key and no value is
/// null. Two dictionaries are equal if they have equal values for equal keys. The order of iteration is
/// unspecified. Runtime/Values/Array.h has the layout of the description.
///
/// Ownership: a dictionary retains its keys and values.
/// Threads: thread-safe if the keys and values are.
/// Not for: tables that need not be objects. Use std::unordered_map for those, with the hash and equality of
/// Runtime/Objects/Private/ObjectHash.h.

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

  /// Builds a dictionary. Threads: not thread-safe.
  class Builder {
   public:
    Builder() = default;
    /// Starts with the entries of `dictionary`.
    explicit Builder(const Dictionary& dictionary) : entries_(dictionary.entries_) {}

    /// Sets the value for `key`, and replaces the previous value. A null `value` removes the entry.
    /// Errors: throws std::invalid_argument for a null key, what a key's `hash` or `isEqual` throws, and
    /// std::bad_alloc. The builder is unchanged then.
    void set(const Ref<Object>& key, const Ref<Object>& value);

    /// Removes the entry for `key`, if there is one. Does nothing for null.
    void remove(const Object* key);
    void remove(const String& key) { remove(key.object()); }

    std::size_t count() const noexcept { return entries_.size(); }

    /// Returns a dictionary with the present entries. Throws std::bad_alloc.
    Ref<Dictionary> dictionary() const& { return make<Dictionary>(entries_); }
    Ref<Dictionary> dictionary() && { return make<Dictionary>(std::move(entries_)); }

   private:
    Entries entries_;
  };

  /// Makes an empty dictionary.
  Dictionary() = default;

  /// Makes a dictionary of `entries`. Precondition: no key and no value is null.
  explicit Dictionary(Entries entries) noexcept : entries_(std::move(entries)) {}

  /// Returns a dictionary that is built by calling `Builder::set` for each entry in order. So the last value
  /// for a key counts, and a null value removes the key. Throws what `Builder::set` throws.
  static Ref<Dictionary> of(std::initializer_list<std::pair<Ref<Object>, Ref<Object>>> entries);

  std::size_t count() const noexcept { return entries_.size(); }
  bool isEmpty() const noexcept { return entries_.empty(); }

  /// Returns the value for `key`. Returns null if there is no such entry, and for a null key. The dictionary
  /// retains the value.
  Object* objectForKey(const Object* key) const;
  Object* objectForKey(const String& key) const { return objectForKey(key.object()); }

  /// Returns the value for `key` as a T. Also null if it is not a T.
  template <class T>
    requires(ClassType<T> || ProtocolType<T>)
  T* objectForKey(const auto& key) const {
    return cast<T>(objectForKey(key));
  }

  /// Returns the value for `key` as a string. Also null if it is not a string.
  String stringForKey(const auto& key) const { return String::from(objectForKey(key)); }

  /// Iterate over the entries, which are pairs of key and value.
  Entries::const_iterator begin() const noexcept { return entries_.begin(); }
  Entries::const_iterator end() const noexcept { return entries_.end(); }

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;
  String description() const override;

 private:
  const Entries entries_;
};

}  // namespace rt
