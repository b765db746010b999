#pragma once

/// Records that represent classes and protocols at run time, and functions that find them by name.
///
///     const rt::ClassInfo* info = rt::classNamed("SystemClock");       // null: no such class
///     if (info != nullptr && info->conformsTo(rt::protocolInfo<Clock>())) ...
///     info == &rt::classInfo<SystemClock>();                           // identity is the address
///
/// Each class and each protocol has one constant record, which lives as long as the program.
/// (Runtime/Base/Visibility.h says what that takes where libraries hide their symbols.) A library that
/// defines or uses classes is never unloaded, however it was compiled: `dlclose` leaves it loaded.
///
/// Not for: making records. `rt::Implements` makes those of classes, `rt::Protocol` those of protocols
/// (Runtime/Objects/Class.h).

#include <span>
#include <string_view>

namespace rt {

class Object;

/// The record of one protocol. Threads: any thread may read it, since it is constant.
struct ProtocolInfo {
  /// The protocol's name, which lives as long as the record. No NUL follows it.
  std::string_view name;
  /// The protocol that this one inherits, or null.
  const ProtocolInfo* inherited;

  /// Returns whether this is `protocol` or inherits it, directly or not.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept {
    for (const ProtocolInfo* each = this; each != nullptr; each = each->inherited) {
      if (each == &protocol) return true;
    }
    return false;
  }
};

/// Says that a class conforms to a protocol, and converts its objects to that protocol.
struct Conformance {
  const ProtocolInfo* protocol;
  /// Converts an object of the class, which is not null, to the protocol. The result points to the base of
  /// the protocol's type.
  void* (*upcast)(Object* object);
};

/// The record of one class. Threads: any thread may read it, since it is constant.
struct ClassInfo {
  /// The class's name, which lives as long as the record. No NUL follows it.
  std::string_view name;
  /// The record of the superclass. Null for `Object`.
  const ClassInfo* superclass;
  /// The protocols that the class itself states. Each is followed by those that it inherits. The superclass's
  /// record has those of the superclass.
  std::span<const Conformance> conformances;

  /// Returns whether this is `other` or derives from it, directly or not.
  bool isSubclassOf(const ClassInfo& other) const noexcept {
    for (const ClassInfo* each = this; each != nullptr; each = each->superclass) {
      if (each == &other) return true;
    }
    return false;
  }

  /// Returns how this class, or else its nearest superclass, conforms to `protocol`. Null if none of them
  /// does.
  const Conformance* conformance(const ProtocolInfo& protocol) const noexcept {
    for (const ClassInfo* each = this; each != nullptr; each = each->superclass) {
      for (const Conformance& conformance : each->conformances) {
        if (conformance.protocol == &protocol) return &conformance;
      }
    }
    return nullptr;
  }

  /// Returns whether this class, or one of its superclasses, conforms to `protocol`.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept { return conformance(protocol) != nullptr; }
};

/// Returns the class called `name` among those loaded so far, or null. If two classes have the same name, the
/// one loaded first is found. The clash is reported once, as a line on standard error.
///
/// A library's own classes are known before its first static object is made. The classes of the program and
/// of all libraries that it links are known before the first load hook runs.
///
/// Threads: any thread may call this at any time, also while the program is being loaded.
const ClassInfo* classNamed(std::string_view name) noexcept;

/// Returns the protocol called `name`, by the same rules.
const ProtocolInfo* protocolNamed(std::string_view name) noexcept;

}  // namespace rt
