#pragma once

/// Services: an interface with the dimensions of its scope, written like a function.
///
///     | Clock                                      one instance for the program
///     | Preferences(User)                          one for each user
///
///     struct User : srl::Tag<User, rt::String> {};
///
///     rt::Ref<Preferences> preferences = srl::get<Preferences(User)>(User{"ann"_s});
///     for (Importer& importer : srl::all<Importer>()) importer.run();
///
/// The interface is a protocol or a class of the runtime (Runtime/Objects/Class.h). It knows nothing of the
/// registry. The order of the dimensions does not matter, and neither does that of the tags.
///
/// These functions are for code that sees no module. A module has the same functions, which take the
/// interface only (Module.h).
///
/// Threads: any thread may use them.
///
/// Errors: a wrong, missing or extra tag does not compile. A service to which nothing is bound is reported
/// (PECErrorHandler.h) and yields null, as is a factory that returns null or has thrown. The functions throw
/// what factories, tags and the error callback throw, and std::bad_alloc.

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <utility>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Front/All.h"
#include "Shared/ServiceRegistry/Source/Front/Lazy.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Name.h"
#include "Shared/ServiceRegistry/Source/Front/Tag.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace srl {

/// What a service may be known by: a protocol or a class of the runtime.
template <class T>
concept Interface = rt::ProtocolType<T> || rt::ClassType<T>;

namespace detail {

template <class... T>
struct Types {};

// The dimensions of a scope, sorted by name, so that their order in the source does not matter. They take
// the bits of the scope type from the lowest one.
struct Dimensions {
  std::array<const char*, SRLScopeTagSet::kCapacity> identities{};
  std::size_t count = 0;
  bool isRepeated = false;

  // Returns the index of a dimension, or `count` if the scope lacks it.
  constexpr std::size_t indexOf(const char* identity) const noexcept {
    std::size_t index = 0;
    while (index < count && identities[index] != identity) ++index;
    return index;
  }

  constexpr bool hasAllOf(const Dimensions& other) const noexcept {
    for (std::size_t index = 0; index < other.count; ++index) {
      if (indexOf(other.identities[index]) == count) return false;
    }
    return true;
  }

  constexpr SRLScopeType scopeType() const noexcept { return (SRLScopeType{1} << count) - 1; }
};

template <class... Tags>
consteval Dimensions dimensionsOf() {
  static_assert((TagType<Tags> && ...), "a dimension of a service must be a type that derives from srl::Tag");
  static_assert(sizeof...(Tags) <= SRLScopeTagSet::kCapacity, "a service has at most four dimensions");
  Dimensions all;
  std::array<std::string_view, SRLScopeTagSet::kCapacity> names;
  const auto add = [&](const char* identity, std::string_view name) {
    if (all.indexOf(identity) != all.count) all.isRepeated = true;
    std::size_t index = all.count++;
    for (; index > 0 && name < names[index - 1]; --index) {
      names[index] = names[index - 1];
      all.identities[index] = all.identities[index - 1];
    }
    names[index] = name;
    all.identities[index] = identity;
  };
  (add(&kIdentity<Tags>, kTagName<Tags>.view()), ...);
  return all;
}

template <std::size_t index, class First, class... Rest>
struct TypeAt : TypeAt<index - 1, Rest...> {};
template <class First, class... Rest>
struct TypeAt<0, First, Rest...> {
  using Type = First;
};

// The service `I` with the dimensions `Tags`, which are sorted. `isMany` if any number of implementations may
// be bound to it.
template <class I, bool isMany, class... Tags>
struct [[gnu::visibility("default")]] Service {
  static constexpr SRLAPIRegistrationData record{
      .identifier = kName<I>.characters,
      .instanceType = {.names = {.protocolName = rt::ProtocolType<I> ? kName<I>.characters : nullptr,
                                 .className = rt::ProtocolType<I> ? nullptr : kName<I>.characters}},
      .scopeType = (SRLScopeType{1} << sizeof...(Tags)) - 1,
      .identifierLength = kName<I>.view().size(),
      .isMultibound = isMany,
  };
};

// Where the tag of each dimension is among the tags that are given.
struct Places {
  std::array<std::size_t, SRLScopeTagSet::kCapacity> places{};
  bool isMissing = false;
  bool isRepeated = false;
  bool isForeign = false;
};

consteval Places placesIn(const Dimensions& scope, const Dimensions& given) {
  Places all;
  for (std::size_t index = 0; index < scope.count; ++index) {
    all.places[index] = given.indexOf(scope.identities[index]);
    if (all.places[index] == given.count) all.isMissing = true;
  }
  all.isForeign = !scope.hasAllOf(given);
  all.isRepeated = given.isRepeated;
  return all;
}

// Returns the dimensions in their order in the source.
template <class... Tags>
consteval Dimensions unsortedDimensionsOf() {
  Dimensions all;
  ((all.isRepeated = all.isRepeated || all.indexOf(&kIdentity<Tags>) != all.count,
    all.identities[all.count++] = &kIdentity<Tags>),
   ...);
  return all;
}

template <class I, bool isMany, class... Tags, std::size_t... index>
consteval const SRLAPIRegistrationData* sortedRecordOf(std::index_sequence<index...>) {
  constexpr Places kPlaces = placesIn(dimensionsOf<Tags...>(), unsortedDimensionsOf<Tags...>());
  return &Service<I, isMany, typename TypeAt<kPlaces.places[index], Tags...>::Type...>::record;
}

// Returns the record of a service. It is the same for each order of the dimensions.
template <class I, bool isMany, class... Tags>
consteval const SRLAPIRegistrationData* recordOf() {
  if constexpr (sizeof...(Tags) <= 1) {
    return &Service<I, isMany, Tags...>::record;
  } else if constexpr (unsortedDimensionsOf<Tags...>().isRepeated) {
    return nullptr;
  } else {
    return sortedRecordOf<I, isMany, Tags...>(std::index_sequence_for<Tags...>());
  }
}

// What is known of a service while compiling.
struct ServiceData {
  std::string_view name;
  const char* identity = nullptr;
  const SRLAPIRegistrationData* api = nullptr;
  Dimensions scope;
  bool isMany = false;
};

// Reads `I` and `I(Tags...)`.
template <class Signature>
struct SignatureOf {
  using Interface = Signature;

  template <bool isMany>
  static consteval ServiceData service() {
    static_assert(srl::Interface<Signature>,
                  "a service must be a protocol (rt::Protocol) or a class (rt::Implements)");
    return {kName<Signature>.view(), &kIdentity<Signature>, recordOf<Signature, isMany>(), {}, isMany};
  }
};
template <class I, class... Tags>
struct SignatureOf<I(Tags...)> {
  using Interface = I;

  template <bool isMany>
  static consteval ServiceData service() {
    static_assert(srl::Interface<I>,
                  "a service must be a protocol (rt::Protocol) or a class (rt::Implements)");
    return {kName<I>.view(), &kIdentity<I>, recordOf<I, isMany, Tags...>(), dimensionsOf<Tags...>(), isMany};
  }
};

// Returns the tags as a set of the registry. It does not retain them.
template <class Source, class... Tags>
SRLScopeTagSet tagSet(const Tags&... tags) {
  static_assert((TagType<Tags> && ...),
                "an argument is not a tag: it must be of a type that derives from srl::Tag");
  static_assert(sizeof...(Tags) <= SRLScopeTagSet::kCapacity, "there are more tags than a service can have");
  SRLScopeTagSet set;
  if constexpr ((TagType<Tags> && ...) && sizeof...(Tags) <= SRLScopeTagSet::kCapacity) {
    constexpr Places kPlaces = placesIn(Source::kService.scope, unsortedDimensionsOf<Tags...>());
    static_assert(!kPlaces.isForeign, "a tag is of a dimension that the service lacks");
    static_assert(!kPlaces.isMissing, "a tag is missing: the service needs one of each of its dimensions");
    static_assert(!kPlaces.isRepeated, "two tags are of one dimension");
    if constexpr (sizeof...(Tags) > 0 && !kPlaces.isForeign && !kPlaces.isMissing && !kPlaces.isRepeated) {
      rt::Object* const given[] = {tags.object()...};
      for (std::size_t index = 0; index < sizeof...(Tags); ++index)
        set.tags[index] = given[kPlaces.places[index]];
    }
  }
  return set;
}

// The look-ups of an interface by its record. There is one function for each interface, whoever asks.
template <class I>
rt::Ref<I> one(const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags) {
  return rt::cast<I>(SRLRegistry::sharedInstance()->internalService(api, tags));
}
template <class I>
rt::Ref<I> oneOrNull(const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags) {
  return rt::cast<I>(SRLRegistry::sharedInstance()->internalOptionalService(api, tags));
}
template <class I>
All<I> allOf(const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags) {
  return All<I>(SRLRegistry::sharedInstance()->internalMultiBoundService(api, tags));
}

// The look-ups of the interface `I`. `Source::kService` describes the service.
template <class I, class Source>
struct LookUp {
  template <class... Tags>
  static rt::Ref<I> get(const Tags&... tags) {
    static_assert(!Source::kService.isMany,
                  "one instance is asked for of a service that many are bound to; use all");
    return one<I>(Source::kService.api, set(tags...));
  }
  template <class... Tags>
  static rt::Ref<I> maybe(const Tags&... tags) {
    static_assert(!Source::kService.isMany,
                  "one instance is asked for of a service that many are bound to; use all");
    return oneOrNull<I>(Source::kService.api, set(tags...));
  }
  template <class... Tags>
  static All<I> all(const Tags&... tags) {
    static_assert(Source::kService.isMany,
                  "all instances are asked for of a service that only one is bound to; use get");
    return allOf<I>(Source::kService.api, set(tags...));
  }
  template <class... Tags>
  static Lazy<I> lazy(const Tags&... tags) {
    static_assert(!Source::kService.isMany,
                  "one instance is asked for of a service that many are bound to; use all");
    return Lazy<I>(Source::kService.api, set(tags...));
  }

 private:
  template <class... Tags>
  static SRLScopeTagSet set(const Tags&... tags) {
    return tagSet<Source>(tags...);
  }
};

template <class Signature, bool isMany>
struct Stated {
  static constexpr ServiceData kService = SignatureOf<Signature>::template service<isMany>();
};

template <class Signature, bool isMany>
using StatedLookUp = LookUp<typename SignatureOf<Signature>::Interface, Stated<Signature, isMany>>;

}  // namespace detail

/// Returns the instance of a service for these tags, one of each dimension.
template <class Signature, class... Tags>
auto get(const Tags&... tags) {
  return detail::StatedLookUp<Signature, false>::get(tags...);
}

/// Like `get`, but null without a report if nothing is bound or the factory returns null.
template <class Signature, class... Tags>
auto maybe(const Tags&... tags) {
  return detail::StatedLookUp<Signature, false>::maybe(tags...);
}

/// Returns an instance of each implementation, in unspecified order.
template <class Signature, class... Tags>
auto all(const Tags&... tags) {
  return detail::StatedLookUp<Signature, true>::all(tags...);
}

/// Returns a reference that asks for the instance when it is used.
template <class Signature, class... Tags>
auto lazy(const Tags&... tags) {
  return detail::StatedLookUp<Signature, false>::lazy(tags...);
}

/// Ends all scopes that have this tag, and releases their instances.
template <TagType T>
void removeScopes(const T& tag) {
  SRLRegistry::sharedInstance()->removeScopesWithTag(tag.object());
}

}  // namespace srl
