// How a registry hands out instances, and the scopes that they live in.

#include <utility>
#include <variant>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/Private/SRLScopedFactory.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingEnabled.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingMeasurement.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

using namespace rt::literals;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/SRLRegistry";

using ScopeKey = SRLRegistryIvars::ScopeKey;

// Asks an implementation for an instance while it is measured. A factory that throws leaves no mark.
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

// Reports are functions of their own so that requests, which are flat, stay small.

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

rt::Ref<rt::Object> SRLRegistry::keptInstanceOf(SRLRegistryIvars& ivars,
                                                const SRLImplementation& implementation,
                                                const SRLScopeTagSet& tags,
                                                rt::Ref<SRLMemoizingScope>& scope) {
  rt::Ref<rt::Object> instance;
  const SRLScopedFactory* scoped = implementation.scopedFactory();
  if (scoped == nullptr || !isShared_.load(std::memory_order_relaxed)) return instance;
  SRLScopeTagSet masked;
  if (const SRLScopeTagSet* scopeTags = scoped->scopeTags(tags, masked)) {
    SRLMemoizingScope& open = openScope(ivars, *scopeTags);
    open.findInstance(scoped->identifier, instance);
    if (!instance) scope = &open;
  }
  return instance;
}

// The caller keeps the implementation.
rt::Ref<rt::Object> SRLRegistry::instanceOf(SRLImplementation& implementation,
                                            const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags,
                                            rt::Ref<SRLMemoizingScope> scope) {
  if (SRLPProfilingEnabled()) [[unlikely]]
    return measuredInstance(&implementation, api, tags);
  if (const SRLScopedFactory* scoped = implementation.scopedFactory())
    return scoped->make(tags, nullptr, std::move(scope));
  bool instanceCreated = false;
  return implementation.factoryBlock().callKept(tags, &instanceCreated);
}

SRLRegistry::Found SRLRegistry::find(SRLRegistryIvars& ivars, const SRLAPIRegistrationData* api,
                                     const SRLScopeTagSet& tags) {
  Found found;
  const rt::Ref<SRLImplementation>* bound = boundTo(ivars, api);
  // Read once, so that it stays in a register.
  SRLImplementation* const implementation = bound != nullptr ? bound->get() : nullptr;
  if (implementation == nullptr || !implementation->factoryBlock()) return found;
  found.instance = keptInstanceOf(ivars, *implementation, tags, found.scope);
  if (!found.instance) found.implementation = implementation;
  return found;
}

// Flat, since most requests are for an instance that is there.
[[gnu::flatten]] rt::Ref<rt::Object> SRLRegistry::internalService(const SRLAPIRegistrationData* api,
                                                                  const SRLScopeTagSet& scopeTags) {
  constexpr const char* kFunction = "-[SRLRegistry internalService:scopeTags:]";
  Found found = [&, &ivars = *ivars_] {
    const rt::LockGuard guard(ivars.lock);
    Found all = find(ivars, api, scopeTags);
    if (!all.instance && !all.implementation) [[unlikely]] {
      if (ivars.bindingsState == SRLBindingsState::kRegistered) {
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
  Found found = [&, &ivars = *ivars_] {
    const rt::LockGuard guard(ivars.lock);
    Found all = find(ivars, api, scopeTags);
    if (!all.instance && !all.implementation && ivars.bindingsState == SRLBindingsState::kInProgress)
      reportEarlyRequest("-[SRLRegistry internalOptionalService:scopeTags:]", api);
    return all;
  }();
  if (found.instance || !found.implementation) return std::move(found.instance);
  return instanceOf(*found.implementation, api, scopeTags, std::move(found.scope));
}

rt::Ref<SRLImplementation> SRLRegistry::implementationForSingleBoundService(
    const SRLAPIRegistrationData* api) {
  const rt::Ref<SRLImplementation>* bound = boundTo(*ivars_, api);
  return bound != nullptr ? *bound : nullptr;
}

const rt::Ref<SRLImplementation>* SRLRegistry::boundTo(SRLRegistryIvars& ivars,
                                                       const SRLAPIRegistrationData* api) {
  if (const auto* known = ivars.singleBindings.find(api)) return &known->second;
  return ivars.isUnknown(api) ? nullptr : newlyBound(api);
}

[[gnu::noinline]] const rt::Ref<SRLImplementation>* SRLRegistry::newlyBound(
    const SRLAPIRegistrationData* api) {
  ivars_->lock.assertOwner();
  if (api == nullptr) [[unlikely]] {
    PECReport({kFile, "-[SRLRegistry implementationForSingleBoundService:]"},
              "|apiIdentifier| cannot be nil!"_s);
    return nullptr;
  }
  if (!registersBindingsFor(api)) return nullptr;
  // Made known even where registration has refused what there was.
  return &ivars_->singleBindings[api];
}

// Modules never change once they are registered, so one that none of them knows is looked for among them
// once.
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
    const rt::LockGuard guard(ivars_->lock);
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
    // Those that are there, up to the first that is to be made: its factory may do anything, such as end a
    // scope.
    for (next = implementations->begin(); next != implementations->end(); ++next) {
      rt::Ref<rt::Object> kept =
          keptInstanceOf(*ivars_, static_cast<const SRLImplementation&>(**next), scopeTags, scope);
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
  const rt::LockGuard guard(ivars_->lock);
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
  const rt::LockGuard guard(ivars_->lock);
  return &openScope(*ivars_, tags);
}

SRLMemoizingScope& SRLRegistry::openScope(SRLRegistryIvars& ivars, const SRLScopeTagSet& tags) {
  if (SRLMemoizingScope* open = ivars.findScope(tags)) return *open;
  return newScope(ivars, tags);
}

[[gnu::noinline]] SRLMemoizingScope& SRLRegistry::newScope(SRLRegistryIvars& ivars,
                                                           const SRLScopeTagSet& tags) {
  const auto& opened = ivars.scopes.insert(ScopeKey(tags), SRLMemoizingScope::init());
  SRLScopeTagSetRetain(tags);
  return *opened.second;
}

void SRLRegistry::removeScopesWithTag(const rt::Ref<rt::Object>& tag) {
  if (!tag) {
    PECReport({kFile, "-[SRLRegistry removeScopesWithTag:]"}, "tag cannot be nil!"_s);
    return;
  }
  // What the caller's reference is a part of may end with a scope.
  const rt::Ref<rt::Object> keptTag = tag;  // NOLINT(performance-unnecessary-copy-initialization)
  const bool isDelegateSet = scopeLifecycleDelegate() != nullptr;
  std::vector<rt::Weak<rt::Object>> instances;
  {
    // Entries that are taken out keep their scopes, and the tags that their keys have retained, until the
    // lock is let go.
    struct Removed {
      ~Removed() {
        for (const auto& entry : entries) SRLScopeTagSetRelease(entry.key().tags);
      }
      std::vector<SRLRegistryIvars::Scopes::Entries::node_type> entries;
    } removed;
    std::vector<SRLRegistryIvars::Scopes::Entries::const_iterator> entries;
    const rt::LockGuard guard(ivars_->lock);
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

// Asked of a registry, whichever registry the instances are to live in.
// NOLINTNEXTLINE(readability-convert-member-functions-to-static)
SRLFactoryBlock SRLRegistry::scopedBlockForFactory(
    rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags),
    const SRLImplementationRegistrationData* implementationIdentifier, SRLScopeType apiScope,
    SRLScopeType implScope, std::uint64_t lifetime) {
  return SRLScopedFactory{factory, implementationIdentifier, apiScope, implScope, lifetime};
}
