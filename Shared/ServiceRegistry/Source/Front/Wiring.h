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
#include <span>
#include <type_traits>
#include <utility>

#include "Shared/ServiceRegistry/Source/Front/Dependency.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Graph.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Mistakes.h"
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

// What one line of a module says, as plain data.
struct MakerData {
  const Need* needs = nullptr;
  std::size_t needCount = 0;
};
struct LineData {
  ServiceData service;
  const MakerData* makers = nullptr;
  std::size_t makerCount = 0;
  bool isDeferred = false;
  bool isExpected = false;
};

template <bool isMany, bool isNew, bool isExpected, class Service, class... Implementations>
struct Line {
  using Interface = typename SignatureOf<Service>::Interface;
  using Makers = Types<Implementations...>;
  static constexpr bool kIsNew = isNew;

  // There is one element more, since an array is never empty.
  static constexpr std::array<MakerData, sizeof...(Implementations) + 1> kMakers{
      MakerData{kNeeds<typename MadeBy<Implementations>::Parameters>.data(),
                kNeeds<typename MadeBy<Implementations>::Parameters>.size() - 1}...};

  static consteval LineData data() {
    return {SignatureOf<Service>::template service<isMany>(), kMakers.data(), sizeof...(Implementations),
            kIsFactory<Interface>, isExpected};
  }
};

template <class... Line>
struct Lines {
  using List = Types<Line...>;
  static constexpr std::array<LineData, sizeof...(Line)> kData{Line::data()...};
};

// The lines of each kind of declaration.
template <class Declaration>
struct LinesOf : Lines<> {
  static_assert(mistake::kNever<Declaration>, "a module consists of Bind, New, Many and Expects");
};
template <class Service, class Implementation>
struct LinesOf<Bind<Service, Implementation>> : Lines<Line<false, false, false, Service, Implementation>> {};
template <class Service, class Implementation>
struct LinesOf<New<Service, Implementation>> : Lines<Line<false, true, false, Service, Implementation>> {};
template <class Service, class... Implementations>
struct LinesOf<Many<Service, Implementations...>>
    : Lines<Line<true, false, false, Service, Implementations...>> {};
template <class Service>
struct ExpectedLine {
  using Type = Line<false, false, true, Service>;
};
template <class Service>
struct ExpectedLine<Many<Service>> {
  using Type = Line<true, false, true, Service>;
};
template <class... Services>
struct LinesOf<Expects<Services...>> : Lines<typename ExpectedLine<Services>::Type...> {};

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

// Reads the lines as data, so that the compiler makes no type for each step.
template <class... Declarations>
consteval auto graphOf() {
  using All = std::array<std::span<const LineData>, sizeof...(Declarations)>;
  // Loops, since clang limits the length of fold expressions.
  constexpr auto lineCount = [](const All& all) {
    std::size_t count = 0;
    for (const std::span<const LineData> lines : all) count += lines.size();
    return count;
  };
  constexpr auto makerCount = [](const All& all) {
    std::size_t count = 0;
    for (const std::span<const LineData> lines : all) {
      for (const LineData& line : lines) count += line.makerCount;
    }
    return count;
  };
  constexpr All all{LinesOf<Declarations>::kData...};
  Graph<lineCount(all), makerCount(all)> graph;
  std::size_t service = 0;
  std::size_t maker = 0;
  for (std::size_t declaration = 0; declaration < all.size(); ++declaration) {
    for (const LineData& line : all[declaration]) {
      graph.services[service] = line.service;
      graph.isExpected[service] = line.isExpected;
      graph.declarations[service] = declaration;
      for (std::size_t index = 0; index < line.makerCount; ++index) {
        graph.makers[maker++] = {service, line.makers[index].needs, line.makers[index].needCount,
                                 line.isDeferred};
      }
      ++service;
    }
  }
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
consteval bool explainIn() {
  using enum MistakeKind;
  if constexpr (found.kind == kCycle) {
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

template <const auto& found, class... Declarations>
consteval bool explain() {
  if constexpr (found.kind == MistakeKind::kNone) {
    return true;
  } else {
    return explainIn<found, decltype((Types<>() + ... + typename LinesOf<Declarations>::List()))>();
  }
}

}  // namespace detail
}  // namespace srl
