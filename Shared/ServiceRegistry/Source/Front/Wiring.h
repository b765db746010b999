#pragma once

/// What a module says: which implementations are bound to which services.
///
///     | Bind<Session(User, Window), WindowSession(Preferences, Window)>     one instance for each scope
///     | New<Draft, TextDraft>                                               a new instance each time
///     | Many<Importer, CsvImporter, JsonImporter(Clock)>                    any number of implementations
///     | Expects<Clock, Log(User), Many<Exporter>>                           bound by other modules
///
/// The left side is a service (Service.h): an interface with the dimensions of its scope. The right side is a
/// class with the parameters of the constructor to use (Dependency.h). It may be incomplete, but not where
/// the module is linked.
///
/// Instances live in the scope of their interface. A class that is bound to two interfaces has an instance
/// for each.

#include <array>
#include <cstddef>
#include <type_traits>
#include <utility>

#include "Shared/ServiceRegistry/Source/Front/Dependency.h"
#include "Shared/ServiceRegistry/Source/Front/Graph.h"
#include "Shared/ServiceRegistry/Source/Front/Mistakes.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"

namespace srl {

template <class Service, class Implementation>
struct Bind;
template <class Service, class Implementation>
struct New;
template <class Service, class... Implementations>
struct Many;
template <class... Services>
struct Expects;

namespace detail {

template <class Implementation>
struct MadeBy {
  using Class = Implementation;
  using Parameters = Types<>;
};
template <class Implementation, class... Parameter>
struct MadeBy<Implementation(Parameter...)> {
  using Class = Implementation;
  using Parameters = Types<Parameter...>;
};

// What the constructor of an implementation takes. There is one element more, since an array is never empty.
template <class Parameters>
inline constexpr std::array<Need, 1> kNeeds{};
template <class... Parameter>
inline constexpr std::array<Need, sizeof...(Parameter) + 1> kNeeds<Types<Parameter...>>{
    NeedOf<Parameter>::need()...};

// What one line of a module says.
template <bool isMany_, bool isNew_, bool isExpected_, class Service, class... Implementations>
struct Line {
  using Interface = typename SignatureOf<Service>::Interface;
  using Makers = Types<Implementations...>;
  static constexpr bool kIsMany = isMany_;
  static constexpr bool kIsNew = isNew_;
  static constexpr bool kIsExpected = isExpected_;
  static constexpr std::size_t kMakers = sizeof...(Implementations);

  static consteval ServiceData service() { return SignatureOf<Service>::template service<isMany_>(); }
};

// The lines of each kind of declaration.
template <class Declaration>
struct LinesOf {
  static_assert(mistake::kNever<Declaration>, "a module consists of Bind, New, Many and Expects");
  using Lines = Types<>;
};
template <class Service, class Implementation>
struct LinesOf<Bind<Service, Implementation>> {
  using Lines = Types<Line<false, false, false, Service, Implementation>>;
};
template <class Service, class Implementation>
struct LinesOf<New<Service, Implementation>> {
  using Lines = Types<Line<false, true, false, Service, Implementation>>;
};
template <class Service, class... Implementations>
struct LinesOf<Many<Service, Implementations...>> {
  using Lines = Types<Line<true, false, false, Service, Implementations...>>;
};
template <class Service>
struct ExpectedLine {
  using Line = detail::Line<false, false, true, Service>;
};
template <class Service>
struct ExpectedLine<Many<Service>> {
  using Line = detail::Line<true, false, true, Service>;
};
template <class... Services>
struct LinesOf<Expects<Services...>> {
  using Lines = Types<typename ExpectedLine<Services>::Line...>;
};

template <class... Each, class... More>
Types<Each..., More...> operator+(Types<Each...>, Types<More...>);

// The type at an index, without nesting templates as deep as the index.
template <std::size_t>
using Skipped = const void*;
template <class Indices>
struct Nth;
template <std::size_t... index>
struct Nth<std::index_sequence<index...>> {
  template <class T>
  static Types<T> at(Skipped<index>..., Types<T>*, ...);
};
template <class T>
T onlyOf(Types<T>);
template <class T>
struct Box {
  using Type = T;
};
template <std::size_t index, class... T>
auto nth(Types<T...>)
    -> decltype(onlyOf(Nth<std::make_index_sequence<index>>::at(static_cast<Types<Box<T>>*>(nullptr)...)));
template <std::size_t index, class List>
using NthOf = typename decltype(nth<index>(List()))::Type;

template <class... Lines>
consteval auto graphOf(Types<Lines...>) {
  Graph<sizeof...(Lines), (std::size_t{0} + ... + Lines::kMakers)> graph;
  std::size_t service = 0;
  std::size_t maker = 0;
  const auto addMakers = [&]<class... Implementations>(Types<Implementations...>,
                                                       [[maybe_unused]] bool isDeferred) {
    ((graph.makers[maker++] =
          Maker{service, kNeeds<typename MadeBy<Implementations>::Parameters>.data(),
                kNeeds<typename MadeBy<Implementations>::Parameters>.size() - 1, isDeferred}),
     ...);
  };
  ((graph.services[service] = Lines::service(), graph.isExpected[service] = Lines::kIsExpected,
    addMakers(typename Lines::Makers(), kIsFactory<typename Lines::Interface>), ++service),
   ...);
  graph.sort();
  return graph;
}

// The interface of the line at an index.
template <std::size_t index, class Lines>
using InterfaceAt = typename NthOf<index, Lines>::Interface;

// The type that a constructor's parameter stands for. `maker` is the index among all makers of the module.
template <std::size_t maker, std::size_t need, class... Lines>
auto needAt(Types<Lines...>) {
  using Makers = decltype((Types<>() + ... + typename Lines::Makers()));
  using Parameters = typename MadeBy<NthOf<maker, Makers>>::Parameters;
  return Box<typename NeedOf<NthOf<need, Parameters>>::Type>();
}
template <std::size_t maker, std::size_t need, class Lines>
using NeedAt = typename decltype(needAt<maker, need>(Lines()))::Type;

template <const auto& found, class Lines, std::size_t... step>
consteval std::size_t explainCycle(std::index_sequence<step...>) {
  return sizeof(mistake::Cycle<InterfaceAt<found.path[step], Lines>...>);
}

// Instantiates the type that explains the mistake.
template <const auto& found, class Lines>
consteval bool explain() {
  using enum MistakeKind;
  if constexpr (found.kind == kNone) {
    return true;
  } else if constexpr (found.kind == kCycle) {
    return explainCycle<found, Lines>(std::make_index_sequence<found.pathLength>()) == 0;
  } else {
    using Service = InterfaceAt<found.service, Lines>;
    if constexpr (found.kind == kBoundTwice) {
      return sizeof(mistake::BoundTwice<Service>) == 0;
    } else if constexpr (found.kind == kOneName) {
      return sizeof(mistake::OneName<Service, InterfaceAt<found.need, Lines>>) == 0;
    } else if constexpr (found.kind == kDimensionTwice) {
      return sizeof(mistake::DimensionTwice<Service>) == 0;
    } else {
      using Needed = NeedAt<found.maker, found.need, Lines>;
      if constexpr (found.kind == kNothingBound) return sizeof(mistake::NothingIsBound<Service, Needed>) == 0;
      if constexpr (found.kind == kOneOfMany) return sizeof(mistake::OneOfMany<Service, Needed>) == 0;
      if constexpr (found.kind == kManyOfOne) return sizeof(mistake::ManyOfOne<Service, Needed>) == 0;
      if constexpr (found.kind == kNoSuchDimension)
        return sizeof(mistake::NoSuchDimension<Service, Needed>) == 0;
      if constexpr (found.kind == kNarrowerScope)
        return sizeof(mistake::KeepsNarrowerScope<Service, Needed>) == 0;
    }
  }
}

}  // namespace detail
}  // namespace srl
