#pragma once

// How an object of a module is made, and the record that says so. A recipe is named by the module, the
// interface and the implementation, so that names of functions stay short in modules with many lines.

#include <concepts>
#include <cstddef>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <utility>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Front/Dependency.h"
#include "Shared/ServiceRegistry/Source/Front/Lazy.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"
#include "Shared/ServiceRegistry/Source/Front/Wiring.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace srl::detail {

// A service of a module, found by its interface.
template <class M, class I>
struct Wired {
  static constexpr std::size_t kIndex = M::kGraph.find(kName<I>.view(), &kIdentity<I>);
  static_assert(kIndex != M::kGraph.kNone, "the module neither binds nor expects this interface");
  // A reference, since a copy would make the compiler copy the whole graph.
  static constexpr const ServiceData& kService = M::kGraph.services[kIndex != M::kGraph.kNone ? kIndex : 0];
};

// Returns those tags of a service that another one has, which it needs.
inline SRLScopeTagSet partOf(const SRLScopeTagSet& tags, const Places& places, std::size_t count) {
  SRLScopeTagSet part;
  for (std::size_t index = 0; index < count; ++index) part.tags[index] = tags.tags[places.places[index]];
  return part;
}

// What is passed to the constructor for one parameter of the kind `Parameter`.
template <class M, class Owner, class Parameter>
struct Argument {
  using I = typename NeedOf<Parameter>::Type;
  static constexpr NeedKind kKind = NeedOf<Parameter>::need().kind;

  static consteval const ServiceData& service() {
    if constexpr (kKind == NeedKind::kMaybe &&
                  M::kGraph.find(kName<I>.view(), &kIdentity<I>) == M::kGraph.kNone) {
      return Stated<I, false>::kService;
    } else {
      return Wired<M, I>::kService;
    }
  }

  [[gnu::always_inline]] static auto get(const SRLScopeTagSet& tags) {
    constexpr const SRLAPIRegistrationData* kAPI = service().api;
    constexpr std::size_t kCount = service().scope.count;
    constexpr Places kPlaces = placesIn(service().scope, Wired<M, Owner>::kService.scope);
    const SRLScopeTagSet part = partOf(tags, kPlaces, kCount);
    if constexpr (kKind == NeedKind::kLazy) {
      return Lazy<I>(kAPI, part);
    } else if constexpr (kKind == NeedKind::kAll) {
      return allOf<I>(kAPI, part);
    } else if constexpr (kKind == NeedKind::kMaybe) {
      return oneOrNull<I>(kAPI, part);
    } else {
      return one<I>(kAPI, part);
    }
  }
};

template <class M, class Owner, TagType T>
struct Argument<M, Owner, T> {
  // Null if there is no such tag, because a caller gave another one.
  static auto* object(const SRLScopeTagSet& tags) {
    constexpr std::size_t kIndex = Wired<M, Owner>::kService.scope.indexOf(&kIdentity<T>);
    return rt::cast<typename T::TagObject>(tags.tags[kIndex]);
  }
  static T get(const SRLScopeTagSet& tags) { return T{typename T::TagBase(*object(tags))}; }
};

// Returns whether all tags that the constructor takes are there.
template <class M, class Owner, class Parameter>
bool hasTag(const SRLScopeTagSet& tags) {
  if constexpr (TagType<Parameter>) {
    return Argument<M, Owner, Parameter>::object(tags) != nullptr;
  } else {
    return true;
  }
}

template <class T>
inline constexpr bool kIsGiven = false;
template <class T>
inline constexpr bool kIsGiven<Given<T>> = true;

template <class... T>
struct GivenTypes {
  using List = decltype((Types<>() + ... + T()));
};
template <class Parameter>
struct GivenType {
  using List = Types<>;
};
template <class T>
struct GivenType<Given<T>> {
  using List = Types<T>;
};

// The object behind a Factory. It makes another object for each call.
template <class M, class I, class Implementation, class Signature = I>
class FactoryObject;

template <class M, class I, class Class, class... Parameters, class Made, class... Arguments>
class FactoryObject<M, I, Class(Parameters...), Factory<Made(Arguments...)>> final
    : public rt::Implements<FactoryObject<M, I, Class(Parameters...), Factory<Made(Arguments...)>>,
                            rt::Object, I> {
  static constexpr auto kText = joined<runtimeName<Class>().size() + runtimeName<I>().size() + 4>(
      {runtimeName<I>(), " of ", runtimeName<Class>()});

 public:
  static constexpr std::string_view kClassName = kText.view();

  explicit FactoryObject(const SRLScopeTagSet& tags) noexcept : tags_(tags) {}

  rt::Ref<Made> make(Arguments... arguments) override {
    static_assert(std::derived_from<Class, Made>, "the class does not implement what the Factory makes");
    using GivenOnes = typename GivenTypes<typename GivenType<Parameters>::List...>::List;
    static_assert(std::same_as<GivenOnes, Types<Arguments...>>,
                  "the Given parameters of the constructor differ from the arguments of the Factory");
    std::tuple<Arguments&...> given(arguments...);
    return [&]<std::size_t... index>(std::index_sequence<index...>) -> rt::Ref<Made> {
      return rt::make<Class>(argument<index, Parameters>(given)...);
    }(std::index_sequence_for<Parameters...>());
  }

 private:
  template <std::size_t index, class Parameter>
  decltype(auto) argument(std::tuple<Arguments&...>& given) {
    if constexpr (kIsGiven<Parameter>) {
      constexpr bool kGiven[] = {kIsGiven<Parameters>...};
      constexpr std::size_t kPlace = [&] {
        std::size_t place = 0;
        for (std::size_t before = 0; before < index; ++before) place += kGiven[before] ? 1 : 0;
        return place;
      }();
      return std::forward<std::tuple_element_t<kPlace, std::tuple<Arguments...>>>(std::get<kPlace>(given));
    } else {
      return Argument<M, I, Parameter>::get(tags_.tags());
    }
  }

  const KeptTags tags_;
};

template <class M, class I, class Implementation>
struct Recipe : Recipe<M, I, Implementation()> {};

template <class M, class I, class Implementation, class... Parameters>
struct Recipe<M, I, Implementation(Parameters...)> {
  static constexpr auto classOf() {
    if constexpr (kIsFactory<I>) {
      return Box<FactoryObject<M, I, Implementation(Parameters...)>>();
    } else {
      return Box<Implementation>();
    }
  }
  using Class = typename decltype(classOf())::Type;

  static rt::Ref<rt::Object> make(SRLScopeTagSet tags) {
    static_assert(std::derived_from<Class, I>,
                  "the class does not implement the interface that it is bound to");
    static_assert(rt::ClassType<Class>, "the class must name itself by rt::Implements");
    if (!(hasTag<M, I, Parameters>(tags) && ...)) return nullptr;
    if constexpr (kIsFactory<I>) {
      return rt::make<Class>(tags);
    } else {
      static_assert((!kIsGiven<Parameters> && ...), "only a Factory has arguments from its caller");
      constexpr bool kFits =
          std::is_constructible_v<Class, decltype(Argument<M, I, Parameters>::get(tags))...>;
      static_assert(kFits, "the class has no constructor that takes what its line lists");
      if constexpr (kFits) return rt::make<Class>(Argument<M, I, Parameters>::get(tags)...);
    }
  }
};

template <class M, class Line, class Implementation>
struct [[gnu::visibility("default")]] ImplementationRecord {
  using Made = Recipe<M, typename Line::Interface, Implementation>;
  static constexpr SRLImplementationRegistrationData record{
      .identifier = kName<typename Made::Class>.characters,
      .instanceType = {.className = kName<typename Made::Class>.characters},
      .factory = &Made::make,
      .scopeType = Wired<M, typename Line::Interface>::kService.api->scopeType,
      .lifetime = Line::kIsNew,
  };
};

template <class M, class Line, class Implementations = typename Line::Makers>
struct ImplementationRecords;
template <class M, class Line, class... Implementations>
struct ImplementationRecords<M, Line, Types<Implementations...>> {
  static constexpr const SRLImplementationRegistrationData* records[] = {
      &ImplementationRecord<M, Line, Implementations>::record..., nullptr};
};

}  // namespace srl::detail
