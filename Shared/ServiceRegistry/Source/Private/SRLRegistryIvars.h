#pragma once

// The state of an SRLRegistry. The registry owns it, and guards most of it with its lock.

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <variant>
#include <vector>

#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Set.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/Private/SRLTable.h"
#include "Shared/ServiceRegistry/Source/SRLUnfairLock.h"

/// The progress of the registration of bindings modules.
enum class SRLBindingsState : std::uint8_t { kNone = 0, kInProgress = 1, kRegistered = 2 };

/// The part of the state that may be used without the lock.
struct SRLRegistryUnguardedIvars {
  // Written when the program is loaded, before it has a second thread.
  std::vector<const SRLBindingsModuleData*> bindingsModules;
  SRLConfigurationFactories configFactories;
  SRLBindingsState bindingsState = SRLBindingsState::kNone;

  /// The APIs found so far by identifier. Keys are the identifiers in their records. Written under the lock.
  SRLTable<std::string_view, const SRLAPIRegistrationData*, SRLIdentifierHash> apisByIdentifier;

  SRLUnfairLock lock;
};

/// All of the state. The registry reaches it only with the lock held.
struct SRLRegistryIvars : SRLRegistryUnguardedIvars {
  /// The key of a scope: its tags, and their hash, which is computed once.
  struct ScopeKey {
    explicit ScopeKey(const SRLScopeTagSet& set) : tags(set), hash(SRLScopeTagSetHash(set)) {}

    SRLScopeTagSet tags;
    std::uint64_t hash;
  };
  struct ScopeKeyHash {
    std::size_t operator()(const ScopeKey& key) const noexcept { return key.hash; }
  };
  struct ScopeKeyEqual {
    bool operator()(const ScopeKey& first, const ScopeKey& second) const {
      return first.hash == second.hash && SRLScopeTagSetEqual(first.tags, second.tags);
    }
  };
  using Scopes = SRLTable<ScopeKey, rt::Ref<SRLMemoizingScope>, ScopeKeyHash, ScopeKeyEqual>;

  SRLRegistryIvars() = default;
  /// Copies bindings and modules, but no scopes.
  SRLRegistryIvars(const SRLRegistryIvars& other);
  SRLRegistryIvars& operator=(const SRLRegistryIvars&) = delete;
  ~SRLRegistryIvars();

  /// Returns the scope with these tags. Null if there is none.
  SRLMemoizingScope* findScope(const SRLScopeTagSet& tags) {
    if (lastScope == nullptr || !areLast(tags) || !SRLScopeTagSetEqual(lastScope->first.tags, tags)) {
      const Scopes::Entry* found = scopes.find(ScopeKey(tags));
      if (found == nullptr) return nullptr;
      lastScope = found;
      lastTags = tags.tags;
    }
    return lastScope->second.get();
  }

  /// Returns whether an API is in one of the tables of bindings.
  bool isKnown(const SRLAPIRegistrationData* api) const {
    return singleBindings.find(api) != nullptr || multiBindings.find(api) != nullptr;
  }

  /// Returns whether an earlier search has found that no module has the API.
  bool isUnknown(const SRLAPIRegistrationData* api) const { return unknownAPIs.find(api) != nullptr; }

  /// The implementation of each single-bound API that is known. Null if it has none.
  SRLTable<const SRLAPIRegistrationData*, rt::Ref<SRLImplementation>> singleBindings;
  /// The implementations of each multi-bound API that is known. Null if no set has been made yet. A set is
  /// never changed but replaced, so that it can be read without the lock.
  SRLTable<const SRLAPIRegistrationData*, rt::Ref<rt::Set>> multiBindings;
  /// Each key retains its tags.
  Scopes scopes;
  // The next three remember results of earlier requests. They are not copied.
  /// The scope of the latest request, if it has not ended.
  const Scopes::Entry* lastScope = nullptr;
  /// The tags of that request, which may be gone. A request with the same tags most likely wants the same
  /// scope.
  decltype(SRLScopeTagSet::tags) lastTags{};
  /// The APIs that no module has. Filled only after all modules are registered, which then never change.
  SRLTable<const SRLAPIRegistrationData*, std::monostate> unknownAPIs;

 private:
  // Returns whether these are the tags of the latest request, by address. Not with `==`, which is a call.
  bool areLast(const SRLScopeTagSet& tags) const noexcept {
    for (std::size_t i = 0; i < SRLScopeTagSet::kCapacity; ++i) {
      if (lastTags[i] != tags.tags[i]) return false;
      if (tags.tags[i] == nullptr) return true;
    }
    return true;
  }
};
