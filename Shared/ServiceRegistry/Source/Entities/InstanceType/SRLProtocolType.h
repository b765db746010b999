#pragma once

/// Instances of any class that conforms to a protocol.
///
///     rt::Ref<SRLProtocolType> type = SRLProtocolType::initWithProtocol(&rt::protocolInfo<Clock>());
///     type->description();                                 // "id<Clock>"
///
/// Immutable: any thread may use it.
///
/// Not for: types that a class says something about (SRLClassType, SRLClassProtocolType).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

class RT_VISIBLE SRLProtocolType final : public rt::Implements<SRLProtocolType, rt::Object, SRLInstanceType> {
 public:
  /// For `concreteProtocol`. Null is reported, and yields null. Throws what the error callback throws, and
  /// std::bad_alloc.
  static rt::Ref<SRLProtocolType> initWithProtocol(const rt::ProtocolInfo* concreteProtocol);

  const rt::ProtocolInfo& concreteProtocol() const noexcept { return concreteProtocol_; }

  /// Whether `aClass` conforms to the protocol, by itself or by a superclass.
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const override;

  /// Whether `other` is for the same protocol.
  bool isEqual(const rt::Object* other) const override;
  /// That of the protocol's name.
  std::uint64_t hash() const override;
  /// "id<NAME>" with the protocol's name.
  rt::String description() const override;

 private:
  explicit SRLProtocolType(const rt::ProtocolInfo& concreteProtocol) noexcept
      : concreteProtocol_(concreteProtocol) {}

  const rt::ProtocolInfo& concreteProtocol_;
};
