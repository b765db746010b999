// How a registry hands out instances, and the scopes that they live in.
//
// A request first looks for an existing instance: the binding, its scope and the instance, all under the
// registry's lock. It changes no reference count but the instance's. If there is no instance,
// `SRLScopedFactory::make` makes one. A factory block wraps the same `SRLScopedFactory`, so there is one way
// to an instance. The request passes on the scope that it has found or opened. If it has none, `make` opens
// one in the shared registry. This happens in a registry that is not the shared one, since all scoped
// instances live in the shared one. It also happens if the tags do not fit. Then `make` reports them.
//
// A request calls a host's own factory block without retaining it (`Block::callKept`), because it retains the
// implementation that owns the block.
//
// A request for a multi-bound API uses the instances that it finds under the lock until the first factory
// runs. That factory may end scopes or replace the shared registry.
//
// SRLRegistry_ways_test runs random programs by requests and by blocks, and compares their traces.
//
// A registry remembers which APIs no module knows, and which API an identifier names. Modules never change
// once they are registered, so one search suffices. Remembering an API does not make it known. A copy of a
// registry remembers nothing. Without memory, nothing is remembered.
//
// A request with the same tags as the previous one tries that request's scope first. It compares the tags
// with those of the scope, which needs no hash.
//
// When scopes end, their entries leave the table as whole nodes. Tags and instances are released after the
// lock, so that destructors may call the registry.

#include <utility>
#include <variant>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Set.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/Private/SRLRegistryIvars.h"
#include "Shared/ServiceRegistry/Source/Private/SRLScopedFactory.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingEnabled.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingMeasurement.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

using namespace rt::literals;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/SRLRegistry";

using ScopeKey = SRLRegistryIvars::ScopeKey;

// Gets an instance from the factory block, and measures that. Nothing is recorded if the factory throws.
[[gnu::noinline]] rt::Ref<rt::Object> measuredInstance(const rt::Ref<SRLImplementation>& implementation,
                                                       const SRLAPIRegistrationData* api,
                                                       const SRLScopeTagSet& tags) {
  const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
  bool instanceCreated = false;
  rt::Ref<rt::Object> instance;
  try {
    instance = implementation->factoryBlock().callKept(tags, &instanceCreated);
  } catch (...) {
    SRLPCaptureInjectionCancel();
    throw;
  }
  if (instanceCreated) {
    SRLPCaptureInjectionEnd(partial, api, implementation);
  } else {
    SRLPCaptureInjectionCancel();
  }
  return instance;
}

rt::String instanceTypeOf(const SRLImplementation& implementation) {
  const rt::Ref<SRLInstanceType>& type = implementation.instanceType();
  return type ? type->asObject()->description() : rt::String();
}

// Reports are functions of their own, so that the flattened requests stay small.

[[gnu::cold, gnu::noinline]] void reportNoBinding(const char* function, const SRLAPIRegistrationData* api) {
  PECReport({kFile, function}, "No binding was found for required, single-bound service: %@"_s,
            SRLAPIIdentifier(api));
}

[[gnu::cold, gnu::noinline]] void reportEarlyRequest(const char* function,
                                                     const SRLAPIRegistrationData* api) {
  PECReport({kFile, function},
            "A service injector was called prior to service bindings being registered.\n\nService: %@"_s,
            SRLAPIIdentifier(api));
}

[[gnu::cold, gnu::noinline]] void reportNoInstance(const char* function,
                                                   const SRLImplementation& implementation,
                                                   const SRLAPIRegistrationData* api) {
  PECReport({kFile, function},
            "Implementation of %@, bound to required service %@, returned nil.\nImplementation metadata: %@"
            "\nSee docs/registry.md#initializer-return-nil."_s,
            instanceTypeOf(implementation), SRLAPIIdentifier(api), implementation.description());
}

[[gnu::cold, gnu::noinline]] void reportNoInstanceOfMany(const char* function,
                                                         const SRLImplementation& implementation,
                                                         const SRLAPIRegistrationData* api) {
  PECReport(
      {kFile, function},
      "Implementation of %@, bound to multi-bound service %@, returned nil.\nImplementation metadata: %@"
      "\nSee docs/registry.md#initializer-return-nil."_s,
      instanceTypeOf(implementation), SRLAPIIdentifier(api), implementation.description());
}

}  // namespace

rt::Ref<rt::Object> SRLRegistry::keptInstanceOf(const SRLImplementation& implementation,
                                                const SRLScopeTagSet& tags,
                                                rt::Ref<SRLMemoizingScope>& scope) {
  rt::Ref<rt::Object> instance;
  const SRLScopedFactory* scoped = implementation.scopedFactory();
  if (scoped == nullptr || !isShared_.load(std::memory_order_relaxed)) return instance;
  SRLScopeTagSet masked;
  if (const SRLScopeTagSet* scopeTags = scoped->scopeTags(tags, masked)) {
    SRLMemoizingScope& open = openScope(*scopeTags);
    open.findInstance(scoped->identifier, instance);
    if (!instance) scope = &open;
  }
  return instance;
}

// Precondition: the caller retains the implementation. Not inlined, since the code for a missing instance
// slows down the requests that find one.
[[gnu::noinline]] rt::Ref<rt::Object> SRLRegistry::instanceOf(SRLImplementation& implementation,
                                                              const SRLAPIRegistrationData* api,
                                                              const SRLScopeTagSet& tags,
                                                              rt::Ref<SRLMemoizingScope> scope) {
  if (SRLPProfilingEnabled()) [[unlikely]]
    return measuredInstance(&implementation, api, tags);
  if (const SRLScopedFactory* scoped = implementation.scopedFactory())
    return scoped->make(tags, nullptr, std::move(scope));
  bool instanceCreated = false;
  return implementation.factoryBlock().callKept(tags, &instanceCreated);
}

// The result of a search: an existing instance, or else the implementation. `scope` is the scope of this
// registry that is to keep the instance, if any.
struct SRLRegistry::Found {
  rt::Ref<rt::Object> instance;
  rt::Ref<SRLImplementation> implementation;
  rt::Ref<SRLMemoizingScope> scope;
};

SRLRegistry::Found SRLRegistry::find(const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags) {
  Found found;
  const rt::Ref<SRLImplementation>* bound = boundTo(api);
  // Read once, so that it stays in a register.
  SRLImplementation* const implementation = bound != nullptr ? bound->get() : nullptr;
  if (implementation == nullptr || !implementation->factoryBlock()) return found;
  found.instance = keptInstanceOf(*implementation, tags, found.scope);
  if (!found.instance) found.implementation = implementation;
  return found;
}

// Flattened for speed, since most requests are for an existing instance.
[[gnu::flatten]] rt::Ref<rt::Object> SRLRegistry::internalService(const SRLAPIRegistrationData* api,
                                                                  const SRLScopeTagSet& scopeTags) {
  constexpr const char* kFunction = "-[SRLRegistry internalService:scopeTags:]";
  Found found = [&] {
    const rt::LockGuard guard(*lock_);
    Found all = find(api, scopeTags);
    if (!all.instance && !all.implementation) [[unlikely]] {
      if (ivars_->bindingsState == SRLBindingsState::kRegistered) {
        reportNoBinding(kFunction, api);
      } else {
        reportEarlyRequest(kFunction, api);
      }
    }
    return all;
  }();
  if (found.instance || !found.implementation) return std::move(found.instance);
  rt::Ref<rt::Object> instance = instanceOf(*found.implementation, api, scopeTags, std::move(found.scope));
  if (!instance) [[unlikely]]
    reportNoInstance(kFunction, *found.implementation, api);
  return instance;
}

[[gnu::flatten]] rt::Ref<rt::Object> SRLRegistry::internalOptionalService(const SRLAPIRegistrationData* api,
                                                                          const SRLScopeTagSet& scopeTags) {
  Found found = [&] {
    const rt::LockGuard guard(*lock_);
    Found all = find(api, scopeTags);
    if (!all.instance && !all.implementation && ivars_->bindingsState == SRLBindingsState::kInProgress)
      reportEarlyRequest("-[SRLRegistry internalOptionalService:scopeTags:]", api);
    return all;
  }();
  if (found.instance || !found.implementation) return std::move(found.instance);
  return instanceOf(*found.implementation, api, scopeTags, std::move(found.scope));
}

rt::Ref<SRLImplementation> SRLRegistry::implementationForSingleBoundService(
    const SRLAPIRegistrationData* api) {
  const rt::Ref<SRLImplementation>* bound = boundTo(api);
  return bound != nullptr ? *bound : nullptr;
}

const rt::Ref<SRLImplementation>* SRLRegistry::boundTo(const SRLAPIRegistrationData* api) {
  if (const auto* known = ivars_->singleBindings.find(api)) return &known->second;
  return ivars_->isUnknown(api) ? nullptr : newlyBound(api);
}

[[gnu::noinline]] const rt::Ref<SRLImplementation>* SRLRegistry::newlyBound(
    const SRLAPIRegistrationData* api) {
  if (api == nullptr) [[unlikely]] {
    PECReport({kFile, "-[SRLRegistry implementationForSingleBoundService:]"},
              "|apiIdentifier| cannot be nil!"_s);
    return nullptr;
  }
  if (!registersBindingsFor(api)) return nullptr;
  // Makes the API known even if registration has refused its implementation.
  return &ivars_->singleBindings[api];
}

// Remembers an API that no module knows. Registered modules never change, so one search suffices.
bool SRLRegistry::registersBindingsFor(const SRLAPIRegistrationData* api) {
  if (lazilyRegisterBindingsForAPI(api)) return true;
  if (ivars_->bindingsState == SRLBindingsState::kRegistered)
    ivars_->unknownAPIs.tryInsert(api, std::monostate());
  return false;
}

[[gnu::flatten]] rt::Ref<rt::Array> SRLRegistry::internalMultiBoundService(const SRLAPIRegistrationData* api,
                                                                           const SRLScopeTagSet& scopeTags) {
  constexpr const char* kFunction = "-[SRLRegistry internalMultiBoundService:scopeTags:]";
  if (api == nullptr) [[unlikely]] {
    PECReport({kFile, kFunction}, "|apiIdentifier| cannot be nil!"_s);
    return nullptr;
  }
  rt::Ref<rt::Set> implementations;
  std::vector<rt::Ref<rt::Object>> instances;
  rt::Ref<SRLMemoizingScope> scope;
  decltype(implementations->begin()) next;
  {
    const rt::LockGuard guard(*lock_);
    if (const auto* known = ivars_->multiBindings.find(api)) {
      implementations = known->second;
    } else if (!ivars_->isUnknown(api) && registersBindingsFor(api)) {
      implementations = ivars_->multiBindings[api];
    }
    if (!implementations) {
      if (ivars_->bindingsState == SRLBindingsState::kInProgress) {
        reportEarlyRequest(kFunction, api);
      }
      return nullptr;
    }
    instances.reserve(implementations->count());
    // Takes the existing instances up to the first missing one. The factory of that one may do anything, for
    // example end a scope.
    for (next = implementations->begin(); next != implementations->end(); ++next) {
      rt::Ref<rt::Object> kept =
          keptInstanceOf(static_cast<const SRLImplementation&>(**next), scopeTags, scope);
      if (!kept) break;
      instances.push_back(std::move(kept));
    }
  }
  for (; next != implementations->end(); ++next) {
    auto& implementation = static_cast<SRLImplementation&>(**next);
    if (rt::Ref<rt::Object> instance =
            instanceOf(implementation, api, scopeTags, std::exchange(scope, nullptr))) {
      instances.push_back(std::move(instance));
    } else {
      reportNoInstanceOfMany(kFunction, implementation, api);
    }
  }
  return rt::make<rt::Array>(std::move(instances));
}

bool SRLRegistry::internalHasImplementationForService(const SRLAPIRegistrationData* api) {
  if (api == nullptr) [[unlikely]] {
    PECReport({kFile, "-[SRLRegistry internalHasImplementationForService:]"},
              "|apiIdentifier| cannot be nil!"_s);
    return false;
  }
  const rt::LockGuard guard(*lock_);
  return implementationForSingleBoundService(api) != nullptr;
}

rt::Ref<rt::Object> SRLRegistry::eg_internalService(const rt::String& identifier,
                                                    const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags) {
  constexpr const char* kFunction = "-[SRLRegistry eg_internalService:scopeTags:]";
  if (!scopeTags) {
    PECReport({kFile, kFunction}, "Missing tag set for service:\n%@."_s, identifier);
    return nullptr;
  }
  const SRLAPIRegistrationData* api = apiIdentifierFromString(identifier);
  if (api == nullptr) {
    PECReport({kFile, kFunction}, "Unknown API %@"_s, identifier);
    return nullptr;
  }
  const rt::Ref<rt::Array> tags = scopeTags->tags();
  return internalService(api, SRLScopeTagSetCreateWithTags(tags.get()));
}

rt::Ref<rt::Object> SRLRegistry::eg_internalOptionalService(
    const rt::String& identifier, const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags) {
  if (!scopeTags) {
    PECReport({kFile, "-[SRLRegistry eg_internalOptionalService:scopeTags:]"},
              "Missing tag set for service:\n%@."_s, identifier);
    return nullptr;
  }
  const SRLAPIRegistrationData* api = apiIdentifierFromString(identifier);
  if (api == nullptr) return nullptr;
  const rt::Ref<rt::Array> tags = scopeTags->tags();
  return internalOptionalService(api, SRLScopeTagSetCreateWithTags(tags.get()));
}

rt::Ref<rt::Array> SRLRegistry::eg_internalMultiBoundService(
    const rt::String& identifier, const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags) {
  if (!scopeTags) {
    PECReport({kFile, "-[SRLRegistry eg_internalMultiBoundService:scopeTags:]"},
              "Missing tag set for service:\n%@."_s, identifier);
    return nullptr;
  }
  const SRLAPIRegistrationData* api = apiIdentifierFromString(identifier);
  if (api == nullptr) return rt::make<rt::Array>();
  const rt::Ref<rt::Array> tags = scopeTags->tags();
  return internalMultiBoundService(api, SRLScopeTagSetCreateWithTags(tags.get()));
}

bool SRLRegistry::eg_internalHasImplementationForService(const rt::String& identifier) {
  const SRLAPIRegistrationData* api = apiIdentifierFromString(identifier);
  if (api == nullptr) {
    PECReport({kFile, "-[SRLRegistry eg_internalHasImplementationForService:]"}, "Unknown API %@"_s,
              identifier);
    return false;
  }
  return internalHasImplementationForService(api);
}

rt::Ref<SRLMemoizingScope> SRLRegistry::scopeWithTags(const SRLScopeTagSet& tags) {
  const rt::LockGuard guard(*lock_);
  return &openScope(tags);
}

SRLMemoizingScope& SRLRegistry::openScope(const SRLScopeTagSet& tags) {
  if (SRLMemoizingScope* open = ivars_->findScope(tags)) return *open;
  return newScope(tags);
}

[[gnu::noinline]] SRLMemoizingScope& SRLRegistry::newScope(const SRLScopeTagSet& tags) {
  const auto& opened = ivars_->scopes.insert(ScopeKey(tags), SRLMemoizingScope::init());
  SRLScopeTagSetRetain(tags);
  return *opened.second;
}

void SRLRegistry::removeScopesWithTag(const rt::Ref<rt::Object>& tag) {
  if (!tag) {
    PECReport({kFile, "-[SRLRegistry removeScopesWithTag:]"}, "tag cannot be nil!"_s);
    return;
  }
  // The caller's reference may be a part of an object that is destroyed with a scope.
  const rt::Ref<rt::Object> keptTag = tag;  // NOLINT(performance-unnecessary-copy-initialization)
  const bool isDelegateSet = scopeLifecycleDelegate() != nullptr;
  std::vector<rt::Weak<rt::Object>> instances;
  {
    // Removed entries retain their scopes, and the tags of their keys, until the lock is released.
    struct Removed {
      ~Removed() {
        for (const auto& entry : entries) SRLScopeTagSetRelease(entry.key().tags);
      }
      std::vector<SRLRegistryIvars::Scopes::Entries::node_type> entries;
    } removed;
    std::vector<SRLRegistryIvars::Scopes::Entries::const_iterator> entries;
    const rt::LockGuard guard(*lock_);
    const auto& scopes = ivars_->scopes.entries();
    for (auto entry = scopes.begin(); entry != scopes.end(); ++entry) {
      if (!SRLScopeTagSetContainsTag(entry->first.tags, keptTag.get())) continue;
      entries.push_back(entry);
      if (!isDelegateSet) continue;
      const rt::Ref<rt::Array> kept = entry->second->instances();
      instances.insert(instances.end(), kept->begin(), kept->end());
    }
    ivars_->lastScope = nullptr;
    removed.entries = ivars_->scopes.extract(entries);
  }
  if (const rt::Ref<SRLScopeLifecycleDelegate> delegate = scopeLifecycleDelegate()) {
    delegate->didRemoveScopesWithTag(keptTag, instances);
  }
}

rt::Ref<SRLScopeLifecycleDelegate> SRLRegistry::scopeLifecycleDelegate() const {
  const rt::LockGuard guard(delegateLock_);
  return scopeLifecycleDelegate_.lock();
}

void SRLRegistry::setScopeLifecycleDelegate(const rt::Ref<SRLScopeLifecycleDelegate>& delegate) {
  rt::Weak<SRLScopeLifecycleDelegate> weak = delegate;
  const rt::LockGuard guard(delegateLock_);
  scopeLifecycleDelegate_ = std::move(weak);
}

// Not static, since callers call it on a registry. Scoped instances live in the shared registry in any case.
// NOLINTNEXTLINE(readability-convert-member-functions-to-static)
SRLFactoryBlock SRLRegistry::scopedBlockForFactory(
    rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags),
    const SRLImplementationRegistrationData* implementationIdentifier, SRLScopeType apiScope,
    SRLScopeType implScope, std::uint64_t lifetime) {
  return SRLScopedFactory{factory, implementationIdentifier, apiScope, implScope, lifetime};
}
