#pragma once

/// The records that stand for classes and protocols at run time, and how to find them by name.
///
///     const rt::ClassInfo* info = rt::classNamed("SystemClock");       // null: no such class
///     if (info != nullptr && info->conformsTo(rt::protocolInfo<Clock>())) ...
///     info == &rt::classInfo<SystemClock>();                           // identity is the address
///
/// There is one constant record for each class and each protocol, which is there as long as the program is. A
/// library that defines or uses classes is never unloaded, however it was compiled: `dlclose` leaves it
/// where it is.
///
/// Not for: making records. Classes get theirs from `rt::Implements`, protocols from `rt::Protocol`
/// (Runtime/Objects/Class.h).

#include <span>
#include <string_view>

namespace rt {

class Object;

/// The record of one protocol. Constant; any thread may read it.
struct ProtocolInfo {
  /// The protocol's name, for the life of the record. No NUL follows it.
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
  /// Takes an object of the class, not null; returns the base of it that has the protocol's type.
  void* (*upcast)(Object* object);
};

/// The record of one class. Constant; any thread may read it.
struct ClassInfo {
  /// The class's name, for the life of the record. No NUL follows it.
  std::string_view name;
  /// The record of the superclass; null for `Object`.
  const ClassInfo* superclass;
  /// The protocols that the class itself states, each followed by those that it inherits. What the
  /// superclass conforms to is in the superclass's record.
  std::span<const Conformance> conformances;

  /// Whether this is `other` or derives from it, directly or not.
  bool isSubclassOf(const ClassInfo& other) const noexcept {
    for (const ClassInfo* each = this; each != nullptr; each = each->superclass) {
      if (each == &other) return true;
    }
    return false;
  }

  /// How this class, or else the nearest one that it derives from, conforms to `protocol`; null where
  /// none does.
  const Conformance* conformance(const ProtocolInfo& protocol) const noexcept {
    for (const ClassInfo* each = this; each != nullptr; each = each->superclass) {
      for (const Conformance& conformance : each->conformances) {
        if (conformance.protocol == &protocol) return &conformance;
      }
    }
    return nullptr;
  }

  /// Whether this class, or one that it derives from, conforms to `protocol`.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept { return conformance(protocol) != nullptr; }
};

/// The class that bears `name` in what has been loaded of the program so far, or null. Where two classes
/// bear one name, the one that was loaded first is found, and the clash is reported once, as a line on
/// standard error. Any thread may call it at any time, also while the program is being loaded: a
/// library's own classes are known before its first static object is made, the program's own and those
/// of all libraries that it links before the first load hook runs.
const ClassInfo* classNamed(std::string_view name) noexcept;

/// The same for protocols.
const ProtocolInfo* protocolNamed(std::string_view name) noexcept;

}  // namespace rt
