#pragma once

/// The type of the instances of a class and of the classes that derive from it.
///
///     rt::Ref<SRLClassType> type = SRLClassType::initWithClass(rt::classNamed("SystemClock"));
///     if (!type) return;                                   // reported: there is no such class
///
/// Threads: immutable; any thread may use it.
///
/// Not for: types that require a protocol (SRLProtocolType, SRLClassProtocolType).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

class RT_VISIBLE SRLClassType final : public rt::Implements<SRLClassType, rt::Object, SRLInstanceType> {
 public:
  /// Returns the type of the instances of `concreteClass`.
  /// Errors: null is reported and yields null. Throws what the error callback throws, and std::bad_alloc.
  static rt::Ref<SRLClassType> initWithClass(const rt::ClassInfo* concreteClass);

  const rt::ClassInfo& concreteClass() const noexcept { return concreteClass_; }

  /// Returns whether `aClass` is the class or derives from it.
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const override;

  /// Returns whether `other` is an SRLClassType for the same class.
  bool isEqual(const rt::Object* other) const override;
  /// Returns the hash of the class's address.
  std::uint64_t hash() const override;
  /// Returns the class's name.
  rt::String description() const override;

 private:
  explicit SRLClassType(const rt::ClassInfo& concreteClass) noexcept : concreteClass_(concreteClass) {}

  const rt::ClassInfo& concreteClass_;
};
