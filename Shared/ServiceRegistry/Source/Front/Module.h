#pragma once

/// The wiring of a program or a library: one declaration says which services it has.
///
///     struct User : srl::Tag<User, rt::String> {};
///
///     struct App : srl::Module<App,
///         srl::Bind<Clock, SystemClock>,
///         srl::Bind<Preferences(User), FilePreferences(User, Clock)>,
///         srl::Many<Importer, CsvImporter, JsonImporter>> {};
///
///     template struct srl::Linked<App>;                     // outside any namespace, in one source file
///     ...
///     rt::Ref<Preferences> preferences = App::get<Preferences>(User{"ann"_s});
///
/// Wiring.h says what a module consists of. A module does not compile if something that a service needs is
/// missing. Nor does it if services need each other in a cycle, or if a service keeps one of a narrower
/// scope. Private/Mistakes.h lists all such mistakes.
///
/// Where the module is declared, its implementations may be incomplete. Where it is linked, they are
/// complete. Linking hands the module to the registry, like a generated one (SRLBindingsModuleData.h), when
/// the program is loaded. The registry sees no difference between both.
///
/// Errors and threads: as for the functions of Service.h, which need no module.
///
/// Not for: modules that are chosen at run time.

#include <array>
#include <cstddef>
#include <cstdint>

#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Front/All.h"
#include "Shared/ServiceRegistry/Source/Front/Lazy.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Graph.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Name.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Recipe.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"
#include "Shared/ServiceRegistry/Source/Front/Wiring.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace srl {

/// The base of the module `Self`, which `Declarations` describe.
template <class Self, class... Declarations>
class Module {
 public:
  using DeclarationList = detail::Types<Declarations...>;
  static constexpr auto kGraph = detail::graphOf<Declarations...>();
  static constexpr auto kMistake = kGraph.mistake();
  static_assert(detail::explain<kMistake, Declarations...>());

  /// Like the functions of Service.h. Each takes one tag of each dimension of the interface, in any order.
  template <class Interface, class... Tags>
  [[gnu::always_inline]] static rt::Ref<Interface> get(const Tags&... tags) {
    return detail::LookUp<Interface, detail::Wired<Self, Interface>>::get(tags...);
  }
  template <class Interface, class... Tags>
  [[gnu::always_inline]] static rt::Ref<Interface> maybe(const Tags&... tags) {
    return detail::LookUp<Interface, detail::Wired<Self, Interface>>::maybe(tags...);
  }
  template <class Interface, class... Tags>
  [[gnu::always_inline]] static All<Interface> all(const Tags&... tags) {
    return detail::LookUp<Interface, detail::Wired<Self, Interface>>::all(tags...);
  }
  template <class Interface, class... Tags>
  [[gnu::always_inline]] static Lazy<Interface> lazy(const Tags&... tags) {
    return detail::LookUp<Interface, detail::Wired<Self, Interface>>::lazy(tags...);
  }
};

namespace detail {

// What a declaration binds. Null if it binds nothing.
template <class M, class Declaration>
inline constexpr const SRLImplementationRegistrationData* const* kImplementations =
    ImplementationRecords<M, NthOf<0, typename LinesOf<Declaration>::List>>::records;
template <class M, class... Services>
inline constexpr const SRLImplementationRegistrationData* const* kImplementations<M, Expects<Services...>> =
    nullptr;

template <class M, class... Declarations>
consteval auto bindingsOf(Types<Declarations...>) {
  constexpr std::size_t kCount = [] {
    std::size_t count = 0;
    for (const bool isExpected : M::kGraph.isExpected) count += isExpected ? 0 : 1;
    return count;
  }();
  const std::array<const SRLImplementationRegistrationData* const*, sizeof...(Declarations)> implementations{
      kImplementations<M, Declarations>...};
  std::array<_SRLBindingRegistrationData, kCount> bindings;
  std::size_t next = 0;
  for (const std::size_t service : M::kGraph.sorted) {
    if (M::kGraph.isExpected[service]) continue;
    bindings[next++] = _SRLBindingRegistrationData{M::kGraph.services[service].api,
                                                   implementations[M::kGraph.declarations[service]]};
  }
  return bindings;
}

template <class M>
inline constexpr auto kSelector =
    joined<12 + rt::detail::sourceName<M>().size()>({"srl_bindings", rt::detail::sourceName<M>()});

}  // namespace detail

/// Hands the module `M` to the registry when the program is loaded. Instantiate it explicitly, in one source
/// file, outside any namespace. A static library with that source file must be linked whole.
template <class M>
struct [[gnu::visibility("default")]] Linked {
  /// Returns the module's record.
  static const SRLBindingsModuleData* module() { return &kModule; }

 private:
  static constexpr auto kBindings = detail::bindingsOf<M>(typename M::DeclarationList());
  static constexpr SRLBindingsModuleData kModule{.bindingsBegin = kBindings.data(),
                                                 .bindingsEnd = kBindings.data() + kBindings.size(),
                                                 .allowsMultipleModules = 1};

  // Never called. It exists so that the explicit instantiation links the module.
  static void mention() {
    static_cast<void>(
        &rt::AddedClassMethod<SRLRegistry, rt::detail::StringLiteral(detail::kSelector<M>.characters),
                              &module>::mention);
  }
};

}  // namespace srl
