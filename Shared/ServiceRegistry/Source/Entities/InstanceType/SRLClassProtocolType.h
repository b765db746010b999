#pragma once

/// Instances of a class, or of one that derives from it, that conform to a protocol besides.
///
///     rt::Ref<SRLClassProtocolType> type = SRLClassProtocolType::initWithClass(
///         &rt::classInfo<View>(), /*constrainedToProtocol=*/&rt::protocolInfo<Clock>());
///     type->description();                                 // "View<Clock>"
///
/// Immutable: any thread may use it.
///
/// Not for: types of which only one is known (SRLClassType, SRLProtocolType).

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
  /// For both. If either is null, that is reported, and yields null. Throws what the error callback throws,
  /// and std::bad_alloc.
  static rt::Ref<SRLClassProtocolType> initWithClass(const rt::ClassInfo* concreteClass,
                                                     const rt::ProtocolInfo* constrainedToProtocol);

  const rt::ProtocolInfo& concreteProtocol() const noexcept { return concreteProtocol_; }
  const rt::ClassInfo& concreteClass() const noexcept { return concreteClass_; }

  /// Whether `aClass` conforms to the protocol, and is the class or derives from it.
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const override;

  /// Whether `other` is for the same two.
  bool isEqual(const rt::Object* other) const override;
  /// 41 times that of the protocol's name, plus that of the class's address.
  std::uint64_t hash() const override;
  /// "CLASS<PROTOCOL>" with both names.
  rt::String description() const override;

 private:
  SRLClassProtocolType(const rt::ClassInfo& concreteClass, const rt::ProtocolInfo& concreteProtocol) noexcept
      : concreteProtocol_(concreteProtocol), concreteClass_(concreteClass) {}

  const rt::ProtocolInfo& concreteProtocol_;
  const rt::ClassInfo& concreteClass_;
};
