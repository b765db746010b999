#pragma once

// The sentences that the compiler shows for mistakes in a module's wiring. The compiler also names the type
// whose assertion fails, such as `Cycle<Store, Preferences, Store>`. So each type's arguments say where the
// mistake is.

namespace srl::mistake {

template <class...>
inline constexpr bool kNever = false;

template <class Service, class Needed>
struct NothingIsBound {
  static_assert(kNever<Service, Needed>,
                "nothing is bound to what a service needs: bind it in the module, or name it in Expects");
};

template <class... Services>
struct Cycle {
  static_assert(kNever<Services...>,
                "services need each other in a cycle, so none can be made first: make one of them Lazy");
};

template <class Service, class Kept>
struct KeepsNarrowerScope {
  static_assert(
      kNever<Service, Kept>,
      "a service keeps one of a narrower scope: what it needs has a dimension that it lacks itself");
};

template <class Service, class Dimension>
struct NoSuchDimension {
  static_assert(kNever<Service, Dimension>,
                "a constructor takes a tag of a dimension that the interface lacks");
};

template <class Service>
struct DimensionTwice {
  static_assert(kNever<Service>, "a service has one dimension twice");
};

template <class Service>
struct BoundTwice {
  static_assert(kNever<Service>,
                "two implementations are bound to one interface, or it is bound and expected: use Many for "
                "several, or remove one");
};

template <class First, class Second>
struct OneName {
  static_assert(kNever<First, Second>,
                "two interfaces have one name in the runtime: state another as kProtocolName or kClassName");
};

template <class Service, class Needed>
struct OneOfMany {
  static_assert(kNever<Service, Needed>,
                "a service needs one instance of what many are bound to: take All of them");
};

template <class Service, class Needed>
struct ManyOfOne {
  static_assert(kNever<Service, Needed>,
                "a service needs all instances of what only one is bound to: take the interface itself");
};

}  // namespace srl::mistake
