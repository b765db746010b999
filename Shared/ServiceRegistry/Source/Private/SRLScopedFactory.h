#pragma once

/// Gets an implementation's instance for the tags of a request: from its factory each time, or from the scope
/// that keeps it. Requests and factory blocks both call `make`.
///
///     const SRLScopedFactory factory{systemClock.factory, &systemClock, clockAPI.scopeType,
///                                    systemClock.scopeType, systemClock.lifetime};
///     rt::Ref<rt::Object> instance = factory.make(tags, /*instanceCreated=*/nullptr, /*scope=*/nullptr);
///     SRLFactoryBlock block = factory;
///
/// Threads: immutable; any thread may use it.
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
  /// The identifier of the instance in its scope.
  const SRLImplementationRegistrationData* identifier;
  /// The scope type of the tags of a request, and the subset of it that the implementation uses.
  SRLScopeType apiScope;
  SRLScopeType implScope;
  /// 1 for a new instance each time, any other value for one instance per scope.
  std::uint64_t lifetime;

  /// Returns an instance, new or kept. Null if the factory returns null, or if a scope is needed and there is
  /// no shared registry. `scope` is the scope that keeps the instance. If it is null, the shared registry's
  /// scope with the tags is used, and opened if there is none. Sets `*instanceCreated` to true if the
  /// instance is new; `instanceCreated` may be null. Errors: tags that do not fit `apiScope` are reported,
  /// and count as no tags. Throws what the factory and the error callback throw, and std::bad_alloc.
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

  /// Makes this a factory block. Calls `make` without a scope.
  rt::Ref<rt::Object> operator()(const SRLScopeTagSet& tags, bool* instanceCreated) const {
    return make(tags, instanceCreated, nullptr);
  }

  /// Returns the tags of the scope that keeps the instance for a request with `tags`. That is `&tags`, or
  /// `&masked` after it has been set to a subset. Null if no scope keeps the instance, and if `make` would
  /// report the tags.
  const SRLScopeTagSet* scopeTags(const SRLScopeTagSet& tags, SRLScopeTagSet& masked) const {
    if (lifetime == 1 || !SRLScopeTagSetDetail::hasOneTagForEachBit(tags, apiScope)) return nullptr;
    if (implScope == apiScope) [[likely]]
      return &tags;
    if ((implScope & ~apiScope) != 0) return nullptr;
    masked = SRLScopeTagSetMaskingWithScopes(tags, apiScope, implScope);
    return &masked;
  }

 private:
  // Returns null if there is no shared registry.
  static rt::Ref<SRLMemoizingScope> openSharedScope(const SRLScopeTagSet& tags);
};
