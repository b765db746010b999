#pragma once

/// What an SRLRegistry knows.
///
///     SRLRegistryIvars ivars;
///     const rt::LockGuard guard(ivars.lock);
///     ivars.singleBindings[&clockAPI] = implementation;
///
/// Not for: anything but the registry.

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

/// How far the registration of bindings modules is.
enum class SRLBindingsState : std::uint8_t { kNone = 0, kInProgress = 1, kRegistered = 2 };

struct SRLRegistryIvars {
  /// The key of a scope: its tags, whose hash is asked for once.
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
  /// The same bindings and modules, and no scopes.
  SRLRegistryIvars(const SRLRegistryIvars& other) RT_REQUIRES(other.lock);
  SRLRegistryIvars& operator=(const SRLRegistryIvars&) = delete;
  ~SRLRegistryIvars();

  /// The scope with these tags; null where there is none.
  SRLMemoizingScope* findScope(const SRLScopeTagSet& tags) RT_REQUIRES(lock) {
    if (lastScope == nullptr || !areLast(tags) || !SRLScopeTagSetEqual(lastScope->first.tags, tags)) {
      const Scopes::Entry* found = scopes.find(ScopeKey(tags));
      if (found == nullptr) return nullptr;
      lastScope = found;
      lastTags = tags.tags;
    }
    return lastScope->second.get();
  }

  /// Whether an API is in one of the tables of what is bound.
  bool isKnown(const SRLAPIRegistrationData* api) const RT_REQUIRES(lock) {
    return singleBindings.find(api) != nullptr || multiBindings.find(api) != nullptr;
  }

  /// Whether it is known that no module knows an API.
  bool isUnknown(const SRLAPIRegistrationData* api) const RT_REQUIRES(lock) {
    return unknownAPIs.find(api) != nullptr;
  }

  /// The implementation of each API that is known; null where it has none.
  SRLTable<const SRLAPIRegistrationData*, rt::Ref<SRLImplementation>> singleBindings RT_GUARDED_BY(lock);
  /// The implementations of each API that is known; null where not even a set has been made. A set is never
  /// changed but replaced, so that whoever looks at one needs no lock.
  SRLTable<const SRLAPIRegistrationData*, rt::Ref<rt::Set>> multiBindings RT_GUARDED_BY(lock);
  /// A key has retained its tags.
  Scopes scopes RT_GUARDED_BY(lock);
  // Written when the program is loaded, before it has a second thread.
  std::vector<const SRLBindingsModuleData*> bindingsModules;
  SRLConfigurationFactories configFactories;
  SRLBindingsState bindingsState = SRLBindingsState::kNone;
  SRLUnfairLock lock;

  // What requests have found out, so that the next ones need not. No copy has it.

  /// The scope that was asked for last, if it is still there.
  const Scopes::Entry* lastScope RT_GUARDED_BY(lock) = nullptr;
  /// The tags that it was asked for with, which may be gone. A request with the same ones most likely wants
  /// the same scope.
  decltype(SRLScopeTagSet::tags) lastTags RT_GUARDED_BY(lock){};
  /// The APIs that no module knows, asked for when all modules were registered, which never change.
  SRLTable<const SRLAPIRegistrationData*, std::monostate> unknownAPIs RT_GUARDED_BY(lock);
  /// The APIs that were asked for by identifier, which is in their records. Changed under the lock, and
  /// looked into without it.
  SRLTable<std::string_view, const SRLAPIRegistrationData*, SRLIdentifierHash> apisByIdentifier;

 private:
  // Whether these are the tags of the last request, without asking them. Not by `==`, which is a call.
  bool areLast(const SRLScopeTagSet& tags) const noexcept RT_REQUIRES(lock) {
    for (std::size_t i = 0; i < SRLScopeTagSet::kCapacity; ++i) {
      if (lastTags[i] != tags.tags[i]) return false;
      if (tags.tags[i] == nullptr) return true;
    }
    return true;
  }
};
