#pragma once

/// What an SRLRegistry knows.
///
///     SRLRegistryIvars ivars;
///     const rt::LockGuard guard(ivars.lock);
///     ivars.singleBindings.insert_or_assign(&clockAPI, implementation);
///
/// Not for: anything but the registry.

#include <cstddef>
#include <cstdint>
#include <unordered_map>
#include <vector>

#include "Runtime/Ref.h"
#include "Runtime/Set.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/SRLUnfairLock.h"

/// How far the registration of bindings modules is.
enum class SRLBindingsState : std::uint8_t { kNone = 0, kInProgress = 1, kRegistered = 2 };

struct SRLRegistryIvars {
  struct TagSetHash {
    std::size_t operator()(const SRLScopeTagSet& set) const { return SRLScopeTagSetHash(set); }
  };
  struct TagSetEqual {
    bool operator()(const SRLScopeTagSet& first, const SRLScopeTagSet& second) const {
      return SRLScopeTagSetEqual(first, second);
    }
  };
  using Scopes = std::unordered_map<SRLScopeTagSet, rt::Ref<SRLMemoizingScope>, TagSetHash, TagSetEqual>;

  SRLRegistryIvars() = default;
  /// The same, but for the scopes, of which there are none.
  SRLRegistryIvars(const SRLRegistryIvars& other) RT_REQUIRES(other.lock);
  SRLRegistryIvars& operator=(const SRLRegistryIvars&) = delete;
  ~SRLRegistryIvars();

  /// The implementation of each API that is known; null where it has none.
  std::unordered_map<const SRLAPIRegistrationData*, rt::Ref<SRLImplementation>> singleBindings
      RT_GUARDED_BY(lock);
  /// The implementations of each API that is known; null where not even a set has been made. A set is never
  /// changed but replaced, so that whoever looks at one needs no lock.
  std::unordered_map<const SRLAPIRegistrationData*, rt::Ref<rt::Set>> multiBindings RT_GUARDED_BY(lock);
  /// A key has retained its tags.
  Scopes scopes RT_GUARDED_BY(lock);
  // Written when the program is loaded, before it has a second thread.
  std::vector<const SRLBindingsModuleData*> bindingsModules;
  SRLConfigurationFactories configFactories;
  SRLBindingsState bindingsState = SRLBindingsState::kNone;
  SRLUnfairLock lock;
};
