#pragma once

/// What an instance is known to be: of a class, of a protocol, or both.
///
///     rt::Ref<SRLInstanceType> type =
///         SRLMakeInstanceTypeContainer(nullptr, &rt::protocolInfo<Clock>());
///     type->doesRepresentSupertypeOfClass(rt::classInfo<SystemClock>());       // true: it is a Clock
///
/// The registry's own are SRLClassType, SRLProtocolType and SRLClassProtocolType; generated code may bring
/// others. Whatever they are, they are immutable, equal when they stand for the same type, and described by
/// what people call it: the registry compares them and puts them into its reports.
///
/// Not for: asking an object what it is (`rt::cast`, Runtime/Objects/Class.h).

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE SRLInstanceType : rt::Protocol<SRLInstanceType> {
  /// Whether every instance of `aClass` is of this type. Any thread may ask.
  virtual bool doesRepresentSupertypeOfClass(const rt::ClassInfo& aClass) const = 0;

 protected:
  ~SRLInstanceType() = default;
};
