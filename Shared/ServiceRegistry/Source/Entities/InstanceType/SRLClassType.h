#pragma once

/// Instances of a class, or of one that derives from it.
///
///     rt::Ref<SRLClassType> type = SRLClassType::initWithClass(rt::classNamed("SystemClock"));
///     if (!type) return;                                   // reported: there is no such class
///
/// Immutable: any thread may use it.
///
/// Not for: types that a protocol says something about (SRLProtocolType, SRLClassProtocolType).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

class RT_VISIBLE SRLClassType final : public rt::Implements<SRLClassType, rt::Object, SRLInstanceType> {
 public:
  /// For `concreteClass`. Null is reported, and yields null. Throws what the error callback throws, and
  /// std::bad_alloc.
  static rt::Ref<SRLClassType> initWithClass(const rt::ClassInfo* concreteClass);

  const rt::ClassInfo& concreteClass() const noexcept { return concreteClass_; }

  /// Whether `aClass` is the class or derives from it.
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const override;

  /// Whether `other` is for the same class.
  bool isEqual(const rt::Object* other) const override;
  /// That of the class's address.
  std::uint64_t hash() const override;
  /// The class's name.
  rt::String description() const override;

 private:
  explicit SRLClassType(const rt::ClassInfo& concreteClass) noexcept : concreteClass_(concreteClass) {}

  const rt::ClassInfo& concreteClass_;
};
