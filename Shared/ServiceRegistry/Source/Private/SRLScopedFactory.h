#pragma once

/// How an implementation's instance is had for the tags of a request: from its factory each time, or from the
/// scope that keeps it. Requests and factory blocks have it by the same function, `make`.
///
///     const SRLScopedFactory factory{systemClock.factory, &systemClock, clockAPI.scopeType,
///                                    systemClock.scopeType, systemClock.lifetime};
///     rt::Ref<rt::Object> instance = factory.make(tags, /*instanceCreated=*/nullptr, /*scope=*/nullptr);
///     SRLFactoryBlock block = factory;
///
/// Immutable: any thread may use it.
///
/// Not for: anything but the registry.

#include <cstdint>
#include <utility>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"

struct SRLScopedFactory {
  /// Makes an instance for the tags that belong to `implScope`.
  rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags);
  /// What a scope knows the instance by.
  const SRLImplementationRegistrationData* identifier;
  /// What the tags of a request are for, and the part of it that the implementation wants.
  SRLScopeType apiScope;
  SRLScopeType implScope;
  /// 1 for a new instance each time, anything else for one in a scope.
  std::uint64_t lifetime;

  /// An instance, new or kept; null where the factory gives none, and where one is to be kept and there is no
  /// shared registry. Where `scope` is not null, it is the one that keeps the instance; otherwise that is the
  /// shared registry's with the tags, opened if there is none. `instanceCreated` may be null; otherwise it
  /// points to true afterwards if the instance is new. Tags that do not fit `apiScope` are reported, and
  /// count as none. Throws what the factory and the error callback throw, and std::bad_alloc.
  rt::Ref<rt::Object> make(const SRLScopeTagSet& tags, bool* instanceCreated,
                           rt::Ref<SRLMemoizingScope> scope) const {
    if (lifetime == 1) {
      if (instanceCreated != nullptr) *instanceCreated = true;
      return factory(SRLScopeTagSetMaskingWithScopes(tags, apiScope, implScope));
    }
    const SRLScopeTagSet masked = SRLScopeTagSetMaskingWithScopes(tags, apiScope, implScope);
    if (!scope) scope = openSharedScope(masked);
    if (!scope) return nullptr;
    return scope->instanceForIdentifier(identifier, instanceCreated, [&] { return factory(masked); });
  }

  /// What a factory block does.
  rt::Ref<rt::Object> operator()(const SRLScopeTagSet& tags, bool* instanceCreated) const {
    return make(tags, instanceCreated, nullptr);
  }

  /// The tags of the scope that keeps the instance for a request with `tags`: these, or `masked`, which has
  /// become a part of them. Null where no scope keeps it, and where `make` would report the tags.
  const SRLScopeTagSet* scopeTags(const SRLScopeTagSet& tags, SRLScopeTagSet& masked) const {
    if (lifetime == 1 || !SRLScopeTagSetDetail::hasOneTagForEachBit(tags, apiScope)) return nullptr;
    if (implScope == apiScope) [[likely]]
      return &tags;
    if ((implScope & ~apiScope) != 0) return nullptr;
    masked = SRLScopeTagSetMaskingWithScopes(tags, apiScope, implScope);
    return &masked;
  }

 private:
  // Null where there is no shared registry.
  static rt::Ref<SRLMemoizingScope> openSharedScope(const SRLScopeTagSet& tags);
};
