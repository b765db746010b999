#pragma once

/// The instance type for a class, a protocol, or both, whichever there are.
///
///     rt::Ref<SRLInstanceType> type = SRLMakeInstanceTypeContainer(rt::classNamed("SystemClock"), nullptr);
///
/// Not for: who knows which it is; the classes have initialisers of their own.

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

/// A new SRLClassProtocolType for both, an SRLProtocolType for a protocol, an SRLClassType for a class. That
/// both are null is reported, and yields null. Any thread may call it. Throws what the error callback throws,
/// and std::bad_alloc.
rt::Ref<SRLInstanceType> SRLMakeInstanceTypeContainer(const rt::ClassInfo* instanceClass,
                                                      const rt::ProtocolInfo* instanceProtocol);
