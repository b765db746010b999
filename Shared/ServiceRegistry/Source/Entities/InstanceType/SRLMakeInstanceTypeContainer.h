#pragma once

/// Makes the instance type for a class, a protocol, or both.
///
///     rt::Ref<SRLInstanceType> type = SRLMakeInstanceTypeContainer(rt::classNamed("SystemClock"), nullptr);
///
/// Not for: code that knows which of the three types it needs. Each has an initialiser of its own.

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

/// Returns a new SRLClassType for a class, SRLProtocolType for a protocol, or SRLClassProtocolType for both.
/// Either argument may be null. Any thread may call this.
/// Errors: two nulls are reported and yield null. Throws what the error callback throws, and std::bad_alloc.
rt::Ref<SRLInstanceType> SRLMakeInstanceTypeContainer(const rt::ClassInfo* instanceClass,
                                                      const rt::ProtocolInfo* instanceProtocol);
