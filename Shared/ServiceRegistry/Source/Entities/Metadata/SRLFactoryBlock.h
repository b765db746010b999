#pragma once

/// A block from which the registry gets an implementation's instance. It takes the tags of the request. It
/// returns a new instance, an existing one, or null.
///
///     SRLFactoryBlock block = [](const SRLScopeTagSet& tags, bool* instanceCreated) -> rt::Ref<rt::Object> {
///       if (instanceCreated != nullptr) *instanceCreated = true;
///       return rt::make<SystemClock>();
///     };
///
/// `instanceCreated` may be null. Otherwise the caller sets `*instanceCreated` to false, and the block sets
/// it to true if the instance is new.
///
/// Not for: the generated functions that make instances (SRLImplementationRegistrationData). Factory blocks
/// call these.

#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"

using SRLFactoryBlock = rt::Block<rt::Ref<rt::Object>(SRLScopeTagSet tags, bool* instanceCreated)>;
