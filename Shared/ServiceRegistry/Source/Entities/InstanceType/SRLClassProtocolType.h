#pragma once

/// The type of the instances of a class, and of the classes that derive from it, that also conform to a
/// protocol.
///
///     rt::Ref<SRLClassProtocolType> type = SRLClassProtocolType::initWithClass(
///         &rt::classInfo<View>(), /*constrainedToProtocol=*/&rt::protocolInfo<Clock>());
///     type->description();                                 // "View<Clock>"
///
/// Threads: immutable; any thread may use it.
///
/// Not for: types that require only a class or only a protocol (SRLClassType, SRLProtocolType).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

class RT_VISIBLE SRLClassProtocolType final
    : public rt::Implements<SRLClassProtocolType, rt::Object, SRLInstanceType> {
 public:
  /// Returns the type of the instances of `concreteClass` that conform to `constrainedToProtocol`.
  /// Errors: a null argument is reported and yields null. Throws what the error callback throws, and
  /// std::bad_alloc.
  static rt::Ref<SRLClassProtocolType> initWithClass(const rt::ClassInfo* concreteClass,
                                                     const rt::ProtocolInfo* constrainedToProtocol);

  const rt::ProtocolInfo& concreteProtocol() const noexcept { return concreteProtocol_; }
  const rt::ClassInfo& concreteClass() const noexcept { return concreteClass_; }

  /// Returns whether `aClass` conforms to the protocol, and is the class or derives from it.
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const override;

  /// Returns whether `other` is an SRLClassProtocolType for the same class and protocol.
  bool isEqual(const rt::Object* other) const override;
  /// Returns 41 times the hash of the protocol's name, plus the hash of the class's address.
  std::uint64_t hash() const override;
  /// Returns "CLASS<PROTOCOL>" with both names.
  rt::String description() const override;

 private:
  SRLClassProtocolType(const rt::ClassInfo& concreteClass, const rt::ProtocolInfo& concreteProtocol) noexcept
      : concreteProtocol_(concreteProtocol), concreteClass_(concreteClass) {}

  const rt::ProtocolInfo& concreteProtocol_;
  const rt::ClassInfo& concreteClass_;
};
