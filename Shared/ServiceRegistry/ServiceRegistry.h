#pragma once

/// The front door of the service registry: the registry, the records of generated code, scopes and profiling.
///
///     #include "Shared/ServiceRegistry/ServiceRegistry.h"
///
///     const SRLScopeTagSet noTags{};
///     rt::Ref<rt::Object> clock = SRLRegistry::sharedInstance()->internalService(&clockAPI, noTags);
///
/// It includes every public header of the library, and those of the runtime that its interface needs. To
/// parse less, include single headers instead.
///
/// Not for: the headers of this project, which include what they use.

// IWYU pragma: begin_exports
#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Set.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassProtocolType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLMakeInstanceTypeContainer.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLFactoryBlock.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementationConfiguration.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTag.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEventProtocol.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEventProtocol.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorageProtocol.h"
#include "Shared/ServiceRegistry/Source/SRLProviderFromFunction.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"
#include "Shared/ServiceRegistry/Source/SRLScopeLifecycleDelegate.h"
#include "Shared/ServiceRegistry/Source/SRLStartUpHook.h"
#include "Shared/ServiceRegistry/Source/SRLUnfairLock.h"
// IWYU pragma: end_exports
