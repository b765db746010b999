#pragma once

/// Classes and protocols. A protocol is an abstract class without data. It names itself as a template
/// argument of its base. A class likewise names itself, its superclass and its protocols.
///
///     struct Clock : rt::Protocol<Clock> {
///       virtual Time now() const = 0;
///
///      protected:
///       ~Clock() = default;
///     };
///
///     struct AlarmClock : rt::Protocol<AlarmClock, Clock> { ... };        // inherits Clock
///
///     class SystemClock : public rt::Implements<SystemClock, rt::Object, Clock> {
///      public:
///       Time now() const override;
///     };
///
///     rt::Ref<rt::Object> object = rt::make<SystemClock>();               // Runtime/Objects/Ref.h
///     if (Clock* clock = rt::cast<Clock>(object.get())) clock->now();
///     rt::classNamed("SystemClock");                                      // Runtime/Objects/ClassInfo.h
///
/// A class or protocol is called as in the source, without the namespaces around it. It may state another
/// name as below. It must do so if the compiler chooses how its name is written, as with a template's
/// arguments.
///
///     static constexpr std::string_view kClassName = "SRLRegistry";       // in a protocol: kProtocolName
///
/// A class is known by name if the program makes an object of it or asks for its record. A class may also
/// have a virtual function that is neither pure nor inline. The source file that defines the first such
/// function then makes the class known. A protocol is known by name if a known class conforms to it or the
/// program asks for its record.
///
/// Inheritance is never virtual. A class may conform to two protocols that both inherit a third. It then
/// converts to the third by way of one of the two.
///
/// Not for: telling apart C++ types that are not objects.

#include <concepts>
#include <type_traits>

#include "Runtime/Objects/ClassInfo.h"
#include "Runtime/Objects/ClassRecord.h"
#include "Runtime/Objects/Object.h"

namespace rt {

/// The base class of all protocols, which leads from a protocol back to the object. Derive from
/// `rt::Protocol<Self>`, never from this class.
class AnyProtocol {
 public:
  /// Returns the object that conforms to the protocol. Never null. Does not retain it.
  virtual Object* asObject() const noexcept = 0;

  AnyProtocol(const AnyProtocol&) = delete;
  AnyProtocol& operator=(const AnyProtocol&) = delete;

 protected:
  constexpr AnyProtocol() noexcept = default;
  constexpr ~AnyProtocol() = default;
};

/// A class with a record of its own: `Object`, or a class that derives from `Implements<T, ...>`. A class
/// that inherits its superclass's record is not a ClassType. It would go by its superclass's name.
template <class T>
concept ClassType = std::derived_from<T, Object> && std::same_as<typename T::ClassSelf, std::remove_cv_t<T>>;

/// A protocol: it derives from `Protocol<T>` or `Protocol<T, Inherited>`, and from no other protocol.
template <class T>
concept ProtocolType =
    std::derived_from<T, AnyProtocol> && std::same_as<typename T::ProtocolSelf, std::remove_cv_t<T>>;

/// The base of the protocol `Self`. It inherits the protocol `Inherited`, if that is given.
template <class Self, class Inherited = AnyProtocol>
class Protocol : public Inherited {
 public:
  using ProtocolSelf = Self;
  using ProtocolInherited = Inherited;

 protected:
  // Not private with `Self` as a friend: g++ would then consider the destructor accessible.
  constexpr Protocol() noexcept = default;  // NOLINT(bugprone-crtp-constructor-accessibility)
  constexpr ~Protocol() = default;
};

namespace detail {

template <class Protocol, class... Protocols>
consteval bool isBaseOfOneOnly() {
  return (int{std::is_base_of_v<Protocol, Protocols>} + ...) == 1;
}

}  // namespace detail

/// The base of the class `Self`, which derives from the class `Super` and conforms to `Protocols`. `Self`
/// also conforms to what `Protocols` inherit and to what `Super` conforms to. It has the constructors of
/// `Super`.
template <class Self, class Super, class... Protocols>
class Implements : public Super, public Protocols... {
 public:
  using ClassSelf = Self;
  using ClassSuper = Super;
  static constexpr const ClassInfo& classRecord() noexcept {
    return detail::ClassRecord<Self, Protocols...>::get();
  }

  const ClassInfo& classInfo() const noexcept override { return classRecord(); }
  Object* asObject() const noexcept override { return const_cast<Implements*>(this); }

 protected:
  using Super::Super;
  constexpr ~Implements() override = default;

  static_assert(ClassType<Super>, "the superclass must be rt::Object or name itself by rt::Implements");
  static_assert((ProtocolType<Protocols> && ...), "a protocol must name itself by rt::Protocol");
  static_assert(!(std::is_base_of_v<Protocols, Super> || ...),
                "the superclass conforms to one of these protocols already");
  static_assert((detail::isBaseOfOneOnly<Protocols, Protocols...>() && ...),
                "one of these protocols is named twice or inherited by another");

 private:
  friend Self;
  constexpr Implements() = default;
};

/// The base of a class that adds no protocol to those of `Super`.
template <class Self, class Super>
class Implements<Self, Super> : public Super {
 public:
  using ClassSelf = Self;
  using ClassSuper = Super;
  static constexpr const ClassInfo& classRecord() noexcept { return detail::ClassRecord<Self>::get(); }

  const ClassInfo& classInfo() const noexcept override { return classRecord(); }

 protected:
  using Super::Super;
  constexpr ~Implements() override = default;

  static_assert(ClassType<Super>, "the superclass must be rt::Object or name itself by rt::Implements");

 private:
  friend Self;
  constexpr Implements() = default;
};

/// Returns the record of the class T.
template <ClassType T>
constexpr const ClassInfo& classInfo() noexcept {
  return T::classRecord();
}

/// Returns the record of the protocol T.
template <ProtocolType T>
constexpr const ProtocolInfo& protocolInfo() noexcept {
  return detail::ProtocolRecord<std::remove_cv_t<T>>::get();
}

namespace detail {

// Returns the object behind `pointer`, which is not null and points to a class or a protocol.
template <class T>
Object* objectOf(const T* pointer) noexcept {
  if constexpr (std::derived_from<T, Object>) {
    return const_cast<T*>(pointer);
  } else {
    static_assert(std::derived_from<T, AnyProtocol>, "T must derive from rt::Object or be a protocol");
    return pointer->asObject();
  }
}

template <class From, class To>
using CopyConst = std::conditional_t<std::is_const_v<From>, const To, To>;

}  // namespace detail

/// Returns `from` as a T, which is a class or a protocol. `from` points to an object or to one of its
/// protocols. Null if the object is not a T, and for null. Does not retain the object. Takes a few
/// nanoseconds, allocates nothing and takes no lock.
template <class T, class From>
detail::CopyConst<From, T>* cast(From* from) noexcept {
  static_assert(ClassType<T> || ProtocolType<T>, "rt::cast leads to a class or a protocol that names itself");
  if (from == nullptr) return nullptr;
  Object* object = detail::objectOf(from);
  if constexpr (ClassType<T>) {
    return object->isKindOf(classInfo<T>()) ? static_cast<T*>(object) : nullptr;
  } else {
    const Conformance* conformance = object->classInfo().conformance(protocolInfo<T>());
    return conformance != nullptr ? static_cast<T*>(conformance->upcast(object)) : nullptr;
  }
}

inline bool Object::isKindOf(const ClassInfo& other) const noexcept {
  return classInfo().isSubclassOf(other);
}

inline bool Object::isMemberOf(const ClassInfo& other) const noexcept {
  return &classInfo() == &other;
}

inline bool Object::conformsTo(const ProtocolInfo& protocol) const noexcept {
  return classInfo().conformsTo(protocol);
}

}  // namespace rt
