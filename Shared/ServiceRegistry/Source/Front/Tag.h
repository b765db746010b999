#pragma once

/// A dimension of scopes, and a value of it. A service that has the dimension has an instance for each value.
///
///     struct User : srl::Tag<User, rt::String> {};
///     struct Window : srl::Tag<Window, int> {};
///
///     const User ann{"ann"_s};
///     ann.value();                                          // "ann"
///     srl::removeScopes(ann);                               // ann has logged out
///
/// The value is of any type that has `==` and a `std::hash`. Two tags are equal if they are of the same
/// dimension and have equal values. A tag never changes.
///
/// Making a tag allocates an object. Copying a tag adds a reference to it. So keep a tag that is often used.
///
/// Threads: as thread-safe as the value is when it is compared and hashed.
///
/// Not for: values that tell nothing apart. Pass those to a constructor (Factory in Dependency.h).

#include <concepts>
#include <cstdint>
#include <string_view>
#include <type_traits>
#include <utility>

#include "Runtime/Base/Private/LifetimeBound.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTag.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Name.h"

namespace srl {

namespace detail {

template <class Self>
inline constexpr auto kTagName =
    joined<rt::detail::sourceName<Self>().size() + 5>({"Tag<", rt::detail::sourceName<Self>(), ">"});

template <class Value>
concept TagValue = std::equality_comparable<Value> && requires(const Value& value) {
  { std::hash<Value>()(value) } -> std::convertible_to<std::uint64_t>;
};

// The object that stands for a tag in the registry.
template <class Self, class Value>
class [[gnu::visibility("default")]] TagObject final
    : public rt::Implements<TagObject<Self, Value>, rt::Object, SRLScopeTag> {
 public:
  static constexpr std::string_view kClassName = kTagName<Self>.view();

  explicit TagObject(Value value) : value_(std::move(value)) {}

  const Value& value() const noexcept { return value_; }

  bool isEqual(const rt::Object* other) const override {
    const auto* tag = rt::cast<TagObject>(other);
    return tag != nullptr && tag->value_ == value_;
  }
  std::uint64_t hash() const override { return std::hash<Value>()(value_); }

 private:
  const Value value_;
};

}  // namespace detail

template <class Self, class Value>
class Tag {
 public:
  using TagSelf = Self;
  using TagValue = Value;
  using TagBase = Tag;
  using TagObject = detail::TagObject<Self, Value>;

  /// Makes a tag with this value. Throws what moving the value throws, and std::bad_alloc.
  Tag(Value value) : object_(rt::make<TagObject>(std::move(value))) {}

  /// Makes a tag of what converts to a value.
  template <class Other>
    requires(std::convertible_to<Other, Value> && !std::same_as<std::remove_cvref_t<Other>, Value> &&
             !std::derived_from<std::remove_cvref_t<Other>, Tag>)
  Tag(Other&& other) : Tag(Value(std::forward<Other>(other))) {}

  /// Returns the tag that the object stands for. `object` is not null.
  explicit Tag(TagObject& object) noexcept : object_(&object) {}

  // A tag has no moved-from state, so that it always has a value.
  Tag(const Tag&) noexcept = default;
  Tag& operator=(const Tag&) noexcept = default;
  ~Tag() = default;

  const Value& value() const noexcept RT_LIFETIME_BOUND { return object_->value(); }
  operator const Value&() const noexcept RT_LIFETIME_BOUND { return object_->value(); }

  /// Returns the object for the registry's own functions. Never null. The tag retains it.
  rt::Object* object() const noexcept RT_LIFETIME_BOUND { return object_.get(); }

  friend bool operator==(const Tag& first, const Tag& second) {
    return first.object_->isEqual(second.object_.get());
  }

 private:
  static_assert(detail::TagValue<Value>, "the value of a tag must have == and a std::hash");

  rt::Ref<TagObject> object_;
};

/// A dimension: a type that derives from `Tag<T, Value>`.
template <class T>
concept TagType = requires {
  typename T::TagSelf;
  typename T::TagValue;
} && std::same_as<typename T::TagSelf, T> && std::derived_from<T, Tag<T, typename T::TagValue>>;

}  // namespace srl
