#pragma once

/// How the registry gets an instance: a block that takes the tags of the request, and returns an instance,
/// new or kept, or null.
///
///     SRLFactoryBlock block = [](const SRLScopeTagSet& tags, bool* instanceCreated) -> rt::Ref<rt::Object> {
///       if (instanceCreated != nullptr) *instanceCreated = true;
///       return rt::make<SystemClock>();
///     };
///
/// Where `instanceCreated` is not null, it points to false, and to true afterwards if the instance is new.
///
/// Not for: the functions of generated code that make instances (SRLImplementationRegistrationData), which
/// blocks of this kind call.

#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"

using SRLFactoryBlock = rt::Block<rt::Ref<rt::Object>(SRLScopeTagSet tags, bool* instanceCreated)>;
