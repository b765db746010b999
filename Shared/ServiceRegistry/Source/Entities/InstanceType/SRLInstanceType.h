#pragma once

/// A type of instances: those of a class, those that conform to a protocol, or those that do both.
///
///     rt::Ref<SRLInstanceType> type =
///         SRLMakeInstanceTypeContainer(nullptr, &rt::protocolInfo<Clock>());
///     type->doesRepresentSupertypeOfClass(rt::classInfo<SystemClock>());       // true: it is a Clock
///
/// The library defines SRLClassType, SRLProtocolType and SRLClassProtocolType. Generated code may define
/// others. The registry compares instance types and prints them in its reports. So each must be immutable,
/// equal to every other object for the same type, and described by the name that people call the type.
///
/// Not for: finding out the class of an object (`rt::cast`, Runtime/Objects/Class.h).

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE SRLInstanceType : rt::Protocol<SRLInstanceType> {
  /// Returns whether every instance of `aClass` is of this type. Any thread may call this.
  virtual bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const = 0;

 protected:
  ~SRLInstanceType() = default;
};
