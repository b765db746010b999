#pragma once

/// Classes and protocols: what each is called, what it derives from and conforms to, found by name.
///
///     struct Clock : rt::Protocol<Clock> {                 // a protocol is an abstract class
///       virtual Time now() const = 0;
///      protected:
///       ~Clock() = default;
///     };
///     struct AlarmClock : rt::Protocol<AlarmClock, Clock> { ... };   // and may inherit one other
///
///     class SystemClock : public rt::Implements<SystemClock, rt::Object, Clock> { ... };
///
///     rt::Ref<rt::Object> object = rt::make<SystemClock>();
///     if (Clock* clock = rt::cast<Clock>(object.get())) clock->now();
///     rt::classNamed("SystemClock") == &rt::classInfo<SystemClock>();
///
/// One constant record stands for each class and each protocol; records are compared by address and
/// live as long as the image they are in, so an image that defines classes is never unloaded. A class
/// is known by name once its image has been loaded, if the program makes objects of it anywhere or it
/// has a virtual function that is neither inline nor pure; a protocol, once a class conforms to it.
///
/// A class is called as it is written in the source, without the namespaces around it. One that wants
/// another name states it, and so does a protocol:
///
///     static constexpr std::string_view kClassName = "SRLRegistry";
///
/// Not for: telling C++ types apart that are no objects; calling functions by name.

#include <array>
#include <concepts>
#include <cstddef>
#include <span>
#include <string_view>
#include <type_traits>

#include "Runtime/Object.h"

namespace rt {

/// The record of one protocol. Constant; any thread may read it.
struct ProtocolInfo {
  /// The protocol's name.
  std::string_view name;
  /// The protocol that this one inherits, or null.
  const ProtocolInfo* inherited;

  /// Whether this is `protocol` or inherits it, directly or not.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept {
    for (const ProtocolInfo* each = this; each != nullptr; each = each->inherited) {
      if (each == &protocol) return true;
    }
    return false;
  }
};

/// That a class conforms to a protocol, and how to reach it.
struct Conformance {
  const ProtocolInfo* protocol;
  /// Takes an object of the class; returns its base of the protocol's type.
  void* (*upcast)(Object* object);
};

/// The record of one class. Constant; any thread may read it.
struct ClassInfo {
  /// The class's name.
  std::string_view name;
  /// The record of its superclass; null for `Object`.
  const ClassInfo* superclass;
  /// The protocols that the class itself states, each followed by those that it inherits. What the
  /// superclass conforms to is in the superclass's record.
  std::span<const Conformance> conformances;

  /// Whether this is `other` or derives from it.
  bool isSubclassOf(const ClassInfo& other) const noexcept {
    for (const ClassInfo* each = this; each != nullptr; each = each->superclass) {
      if (each == &other) return true;
    }
    return false;
  }

  /// How this class or one that it derives from conforms to `protocol`; null where none does.
  const Conformance* conformance(const ProtocolInfo& protocol) const noexcept {
    for (const ClassInfo* each = this; each != nullptr; each = each->superclass) {
      for (const Conformance& conformance : each->conformances) {
        if (conformance.protocol == &protocol) return &conformance;
      }
    }
    return nullptr;
  }

  /// Whether this class or one that it derives from conforms to `protocol`.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept { return conformance(protocol) != nullptr; }
};

/// The class that bears `name` in the parts of the program that have been loaded so far, or null.
/// Where two classes bear one name, the first that was loaded is found; the other is reported in one
/// line on standard error. Any thread may call it, also while the program is being loaded.
const ClassInfo* classNamed(std::string_view name) noexcept;

/// The same for protocols.
const ProtocolInfo* protocolNamed(std::string_view name) noexcept;

/// The root of all protocols: what leads from a protocol back to the object. Write
/// `rt::Protocol<Self>`, never this.
class AnyProtocol {
 public:
  /// The object that conforms to the protocol. Never null; not retained.
  virtual Object* asObject() const noexcept = 0;

 protected:
  constexpr AnyProtocol() noexcept = default;
  constexpr AnyProtocol(const AnyProtocol&) noexcept {}
  constexpr AnyProtocol& operator=(const AnyProtocol&) noexcept { return *this; }
  constexpr ~AnyProtocol() = default;
};

/// A class with a record of its own, that is `Object` or one that derives from `Implements<T, ...>`.
/// A class that only inherits another's record is none: it would go by its superclass's name.
template <class T>
concept ClassType = std::derived_from<T, Object> && std::same_as<typename T::ClassSelf, std::remove_cv_t<T>>;

/// A protocol: it derives from `Protocol<T>` or `Protocol<T, Inherited>`, and from no other protocol.
template <class T>
concept ProtocolType =
    std::derived_from<T, AnyProtocol> && std::same_as<typename T::ProtocolSelf, std::remove_cv_t<T>>;

namespace detail {

/// A record as the tables of names hold it.
template <class Record>
struct Named {
  const Record* record;
  Named* next = nullptr;
  bool isReported = false;
};

void announce(Named<ClassInfo>& entry) noexcept;
void announce(Named<ProtocolInfo>& entry) noexcept;

/// The name of T as it is written in the source, without the namespaces around it.
template <class T>
consteval std::string_view sourceName() {
  std::string_view text = __PRETTY_FUNCTION__;
  text.remove_prefix(text.find("T = ") + 4);
  // g++ goes on with "; std::string_view = ...", clang ends with "]".
  text = text.substr(0, text.find(';'));
  if (text.ends_with(']')) text.remove_suffix(1);
  std::size_t start = 0;
  int depth = 0;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '<' || text[i] == '(' || text[i] == '{') ++depth;
    if (text[i] == '>' || text[i] == ')' || text[i] == '}') --depth;
    if (text[i] == ':' && depth == 0) start = i + 1;
  }
  return text.substr(start);
}

/// `kClassName` where T itself states it; one that T inherits names the superclass.
template <class T>
consteval std::string_view nameOfClass() {
  if constexpr (requires { T::ClassSuper::kClassName; }) {
    if constexpr (&T::kClassName == &T::ClassSuper::kClassName) {
      return sourceName<T>();
    } else {
      return T::kClassName;
    }
  } else if constexpr (requires { T::kClassName; }) {
    return T::kClassName;
  } else {
    return sourceName<T>();
  }
}

template <class T>
consteval std::string_view nameOfProtocol() {
  if constexpr (requires { T::ProtocolInherited::kProtocolName; }) {
    if constexpr (&T::kProtocolName == &T::ProtocolInherited::kProtocolName) {
      return sourceName<T>();
    } else {
      return T::kProtocolName;
    }
  } else if constexpr (requires { T::kProtocolName; }) {
    return T::kProtocolName;
  } else {
    return sourceName<T>();
  }
}

/// How many protocols T names: itself and all that it inherits.
template <class T>
consteval std::size_t protocolDepth() {
  if constexpr (std::same_as<T, AnyProtocol>) {
    return 0;
  } else {
    return 1 + protocolDepth<typename T::ProtocolInherited>();
  }
}

}  // namespace detail

/// The base of the protocol `Self`, which inherits the protocol `Inherited` where that is given.
template <class Self, class Inherited = AnyProtocol>
class Protocol : public Inherited {
 public:
  using ProtocolSelf = Self;
  using ProtocolInherited = Inherited;

 protected:
  constexpr Protocol() noexcept = default;
  constexpr ~Protocol() = default;
};

namespace detail {

/// The record of the protocol T. That the record is mentioned anywhere makes it known by name.
template <class T>
struct ProtocolRecord {
  static const ProtocolInfo info;
  static constinit Named<ProtocolInfo> entry;

  [[gnu::constructor(101)]] static void announceSelf() { announce(entry); }

  static constexpr const ProtocolInfo* inherited() {
    if constexpr (std::same_as<typename T::ProtocolInherited, AnyProtocol>) {
      return nullptr;
    } else {
      return &ProtocolRecord<typename T::ProtocolInherited>::get();
    }
  }

  static constexpr const ProtocolInfo& get() noexcept {
    static_cast<void>(&announceSelf);
    return info;
  }
};

template <class T>
constinit const ProtocolInfo ProtocolRecord<T>::info{nameOfProtocol<T>(), inherited()};

template <class T>
constinit Named<ProtocolInfo> ProtocolRecord<T>::entry{&info};

template <class Class, class Stated, class Protocol>
void* upcast(Object* object) {
  return static_cast<Protocol*>(static_cast<Stated*>(static_cast<Class*>(object)));
}

template <class Class, class Stated, class Protocol = Stated>
constexpr void fillConformances([[maybe_unused]] Conformance* next) {
  if constexpr (!std::same_as<Protocol, AnyProtocol>) {
    *next = {&ProtocolRecord<Protocol>::get(), &upcast<Class, Stated, Protocol>};
    fillConformances<Class, Stated, typename Protocol::ProtocolInherited>(next + 1);
  }
}

template <class Class, class... Protocols>
constexpr auto conformancesOf() {
  std::array<Conformance, (std::size_t{0} + ... + protocolDepth<Protocols>())> all{};
  [[maybe_unused]] Conformance* next = all.data();
  ((fillConformances<Class, Protocols>(next), next += protocolDepth<Protocols>()), ...);
  return all;
}

/// The record of the class T. That the record is mentioned anywhere makes it known by name.
template <class T, class... Protocols>
struct ClassRecord {
  static const ClassInfo info;
  static constinit Named<ClassInfo> entry;

  [[gnu::constructor(101)]] static void announceSelf() { announce(entry); }

  static constexpr const ClassInfo& get() noexcept {
    static_cast<void>(&announceSelf);
    return info;
  }
};

template <class T, class... Protocols>
inline constexpr auto kConformances = conformancesOf<T, Protocols...>();

template <class T, class... Protocols>
constinit const ClassInfo ClassRecord<T, Protocols...>::info{nameOfClass<T>(), &T::ClassSuper::classRecord(),
                                                             kConformances<T, Protocols...>};

template <class T, class... Protocols>
constinit Named<ClassInfo> ClassRecord<T, Protocols...>::entry{&info};

}  // namespace detail

/// The base of the class `Self`: it derives from the class `Super` and conforms to `Protocols`, and
/// to all that these inherit and `Super` conforms to. The constructors are those of `Super`.
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
  constexpr Implements() = default;
  constexpr ~Implements() override = default;

  static_assert(ClassType<Super>, "the superclass must be rt::Object or name itself by rt::Implements");
  static_assert((ProtocolType<Protocols> && ...), "a protocol must name itself by rt::Protocol");
  static_assert(!(std::derived_from<Super, Protocols> || ...),
                "the superclass conforms to one of these protocols already");
};

/// The same for a class that adds no protocol.
template <class Self, class Super>
class Implements<Self, Super> : public Super {
 public:
  using ClassSelf = Self;
  using ClassSuper = Super;
  static constexpr const ClassInfo& classRecord() noexcept { return detail::ClassRecord<Self>::get(); }

  const ClassInfo& classInfo() const noexcept override { return classRecord(); }

 protected:
  using Super::Super;
  constexpr Implements() = default;
  constexpr ~Implements() override = default;

  static_assert(ClassType<Super>, "the superclass must be rt::Object or name itself by rt::Implements");
};

/// The record of the class T.
template <ClassType T>
constexpr const ClassInfo& classInfo() noexcept {
  return T::classRecord();
}

/// The record of the protocol T.
template <ProtocolType T>
constexpr const ProtocolInfo& protocolInfo() noexcept {
  return detail::ProtocolRecord<std::remove_cv_t<T>>::get();
}

namespace detail {

/// The object behind a pointer, not null, to a class or to a protocol.
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

/// `from`, a pointer to an object or to one of its protocols, as a T, which is a class or a protocol;
/// null where the object is none, and for null. Takes a few nanoseconds, allocates and locks nothing.
/// The result is not retained.
template <class T, class From>
  requires(ClassType<T> || ProtocolType<T>)
detail::CopyConst<From, T>* cast(From* from) noexcept {
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
