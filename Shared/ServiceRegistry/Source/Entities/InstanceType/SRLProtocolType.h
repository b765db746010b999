#pragma once

/// The type of the instances that conform to a protocol, whatever their class.
///
///     rt::Ref<SRLProtocolType> type = SRLProtocolType::initWithProtocol(&rt::protocolInfo<Clock>());
///     type->description();                                 // "id<Clock>"
///
/// Threads: immutable; any thread may use it.
///
/// Not for: types that require a class (SRLClassType, SRLClassProtocolType).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

class RT_VISIBLE SRLProtocolType final : public rt::Implements<SRLProtocolType, rt::Object, SRLInstanceType> {
 public:
  /// Returns the type of the instances that conform to `concreteProtocol`.
  /// Errors: null is reported and yields null. Throws what the error callback throws, and std::bad_alloc.
  static rt::Ref<SRLProtocolType> initWithProtocol(const rt::ProtocolInfo* concreteProtocol);

  const rt::ProtocolInfo& concreteProtocol() const noexcept { return concreteProtocol_; }

  /// Returns whether `aClass` or one of its superclasses conforms to the protocol.
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const override;

  /// Returns whether `other` is an SRLProtocolType for the same protocol.
  bool isEqual(const rt::Object* other) const override;
  /// Returns the hash of the protocol's name.
  std::uint64_t hash() const override;
  /// Returns "id<NAME>" with the protocol's name.
  rt::String description() const override;

 private:
  explicit SRLProtocolType(const rt::ProtocolInfo& concreteProtocol) noexcept
      : concreteProtocol_(concreteProtocol) {}

  const rt::ProtocolInfo& concreteProtocol_;
};
