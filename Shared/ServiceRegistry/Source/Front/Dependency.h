#pragma once

/// What a constructor in a module's wiring may take, besides `Lazy` and `All`:
///
///     | Preferences             rt::Ref<Preferences>       the instance, made first if there is none
///     | Maybe<Telemetry>        rt::Ref<Telemetry>         null if nothing is bound
///     | All<Importer>           srl::All<Importer>         all instances
///     | Lazy<Preferences>       srl::Lazy<Preferences>     asks when it is used
///     | User                    User                       the tag of the scope, which converts to its value
///     | Given<rt::String>       rt::String                 an argument from the caller of a Factory
///
/// A factory is a service whose `make` takes arguments from the caller. Its objects are new each time:
///
///     | Bind<Factory<Draft(rt::String)>, TextDraft(Clock, Given<rt::String>)>
///     | ...
///     | rt::Ref<Draft> draft = App::get<Factory<Draft(rt::String)>>()->make("Letter"_s);
///
/// Threads: any thread may call `make`.

#include <concepts>
#include <cstddef>
#include <string_view>
#include <type_traits>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Front/All.h"
#include "Shared/ServiceRegistry/Source/Front/Lazy.h"
#include "Shared/ServiceRegistry/Source/Front/Private/Name.h"
#include "Shared/ServiceRegistry/Source/Front/Service.h"
#include "Shared/ServiceRegistry/Source/Front/Tag.h"

namespace srl {

/// A parameter that is null if nothing is bound.
template <class Interface>
struct Maybe;

/// A parameter that the caller of a factory gives.
template <class T>
struct Given;

/// The interface of objects that make others. `Signature` is the interface of those and what the caller
/// gives.
template <class Signature>
struct Factory;

template <class Made, class... Arguments>
struct [[gnu::visibility("default")]] Factory<Made(Arguments...)>
    : rt::Protocol<Factory<Made(Arguments...)>> {
 private:
  static constexpr auto kText = detail::joined<((rt::detail::sourceName<Made>().size() + 11) + ... +
                                                (rt::detail::sourceName<Arguments>().size() + 1))>(
      {"Factory<", rt::detail::sourceName<Made>(), "("}, {rt::detail::sourceName<Arguments>()...}, {")>"});

 public:
  static constexpr std::string_view kProtocolName = kText.view();

  /// Makes an object. Throws what its constructor and the services that it needs throw.
  virtual rt::Ref<Made> make(Arguments... arguments) = 0;

 protected:
  ~Factory() = default;
};

namespace detail {

template <class T>
inline constexpr bool kIsFactory = false;
template <class Signature>
inline constexpr bool kIsFactory<Factory<Signature>> = true;

// What a parameter takes.
enum class NeedKind : unsigned char { kOne, kMaybe, kAll, kLazy, kTag, kGiven, kUnknown };

struct Need {
  NeedKind kind = NeedKind::kUnknown;
  std::string_view name;
  const char* identity = nullptr;
};

template <NeedKind kind_, class I>
struct NeedOfService {
  using Type = I;
  static consteval Need need() {
    static_assert(srl::Interface<I>,
                  "a constructor's parameter is neither a service nor a tag: it must be a protocol "
                  "(rt::Protocol), a class (rt::Implements) or a type that derives from srl::Tag");
    if constexpr (srl::Interface<I>) return {kind_, kName<I>.view(), &kIdentity<I>};
    return {};
  }
};

template <class Parameter>
struct NeedOf : NeedOfService<NeedKind::kOne, Parameter> {};
template <class I>
struct NeedOf<Maybe<I>> : NeedOfService<NeedKind::kMaybe, I> {};
template <class I>
struct NeedOf<All<I>> : NeedOfService<NeedKind::kAll, I> {};
template <class I>
struct NeedOf<Lazy<I>> : NeedOfService<NeedKind::kLazy, I> {};
template <TagType T>
struct NeedOf<T> {
  using Type = T;
  static consteval Need need() { return {NeedKind::kTag, kTagName<T>.view(), &kIdentity<T>}; }
};
template <class T>
struct NeedOf<Given<T>> {
  using Type = T;
  static consteval Need need() { return {NeedKind::kGiven, {}, &kIdentity<T>}; }
};

}  // namespace detail
}  // namespace srl
