#pragma once

/// The service registry. It knows which implementation is bound to a service interface (an API), and returns
/// instances of it.
///
///     rt::Ref<Clock> injectClock(const SRLScopeTagSet& tags) {             // as a generator writes it
///       return rt::cast<Clock>(SRLRegistry::sharedInstance()->internalService(&clockAPI, tags));
///     }
///     ...
///     SRLRegistry::sharedInstance()->removeScopesWithTag(account);         // the account has logged out
///
/// Bindings are constant records in bindings modules (SRLBindingsModuleData.h). The shared registry collects
/// the modules of the program, and of the libraries that it links, before `main`. It never sees the modules
/// of a library that is opened later. It registers and checks the bindings of an API at the first request for
/// it.
///
/// An API is identified by the address of its record, not by the record's content.
///
/// Threads: all operations are thread-safe. The registry's lock is not recursive (SRLUnfairLock.h). It is not
/// held while a factory runs, while an instance is destroyed, or while the delegate is called. So a factory
/// may ask for other services. The lock is held
///
///     | while tags are hashed and compared,
///     | while the bindings of an API are registered, which calls generated functions and instance types,
///     | while an implementation that was bound by hand is replaced,
///     | and during some reports.
///
/// Code that the registry calls while it holds the lock must not call the registry: that ends the program.
/// Error callbacks, log filters and loggers must never call a registry.
///
/// Errors: misuse is reported (PECErrorHandler.h), and the operation returns null, false or nothing.
/// Exceptions from error callbacks, factories, generated functions, the delegate, tags and instance types
/// pass to the caller, as does std::bad_alloc. The registry stays usable. After an exception:
///
///     | Some bindings of an API that was being registered may be missing. After std::bad_alloc, the next
///     | request registers all of them again.
///     | If a factory has thrown, its instance stays pending until the scope ends. Threads that
///     | wait for the instance, and later requests for it, get a report and null.
///
/// Not for: dependencies that a constructor argument can carry.

#include <atomic>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Set.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLFactoryBlock.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeType.h"
#include "Shared/ServiceRegistry/Source/SRLScopeLifecycleDelegate.h"
#include "Shared/ServiceRegistry/Source/SRLUnfairLock.h"

class SRLImplementation;
class SRLMemoizingScope;
struct SRLBindingsModuleData;
struct SRLRegistryIvars;
struct SRLRegistryUnguardedIvars;

class RT_VISIBLE SRLRegistry : public rt::Implements<SRLRegistry, rt::Object> {
 public:
  /// @name For hosts
  /// @{

  /// Returns the registry that injectors use. The first call makes it. Null if null was set.
  static rt::Ref<SRLRegistry> sharedInstance();

  /// Replaces the shared registry by `registry`, which may be null, and returns the previous one. Without a
  /// shared registry, requests for instances in scopes return null. For tests.
  static rt::Ref<SRLRegistry> setSharedInstance(const rt::Ref<SRLRegistry>& registry);

  /// Returns a new registry without modules and bindings.
  static rt::Ref<SRLRegistry> initPrivate();

  /// Returns a registry with the same modules, bindings and configuration factories. Later changes to either
  /// registry do not affect the other. The copy has no scopes and no delegate. Instances in scopes are still
  /// shared: every registry keeps them in the scopes of the shared registry.
  rt::Ref<SRLRegistry> mutableCopy() const;

  /// Returns "<SRLRegistry: ADDRESS>" and the implementations of all APIs registered so far.
  rt::String description() const override;

  /// Ends every scope that has a tag equal to `tag`. These scopes release their instances, and the delegate
  /// is called. Errors: reports a null `tag`.
  void removeScopesWithTag(const rt::Ref<rt::Object>& tag);

  /// The delegate is called when scopes end. Null for none. Ownership: not retained.
  rt::Ref<SRLScopeLifecycleDelegate> scopeLifecycleDelegate() const;
  void setScopeLifecycleDelegate(const rt::Ref<SRLScopeLifecycleDelegate>& delegate);

  /// Returns the identifiers, as strings, of all APIs in the modules, requested so far or not.
  rt::Ref<rt::Set> registeredAPIIdentifiers() const;

  /// @}
  /// @name For generated code
  /// @{

  /// Returns an instance of the implementation that is bound to `api`, for the scope given by `scopeTags`.
  /// Precondition: `api` is not null. Errors: reports an API without a binding, a request made before modules
  /// are registered, a factory that returns null, and an instance whose factory has thrown. All return null.
  /// Reports a wrong number of tags; the factory then gets none.
  rt::Ref<rt::Object> internalService(const SRLAPIRegistrationData* api, const SRLScopeTagSet& scopeTags);

  /// Like `internalService`, but the API may have no implementation, and its factory may return null. Neither
  /// is reported. Errors: reports a request made while modules are being registered. Also reports a wrong
  /// number of tags, and an instance whose factory has thrown.
  rt::Ref<rt::Object> internalOptionalService(const SRLAPIRegistrationData* api,
                                              const SRLScopeTagSet& scopeTags);

  /// Returns an instance of each implementation of `api`, a multi-bound API, in unspecified order. Returns
  /// null if no module has the API. Errors: reports a null `api`, and a request made while modules are being
  /// registered; both return null. Reports a factory that returns null, and omits its instance.
  rt::Ref<rt::Array> internalMultiBoundService(const SRLAPIRegistrationData* api,
                                               const SRLScopeTagSet& scopeTags);

  /// Returns whether `api` has an implementation. False for a multi-bound API. Errors: reports a null `api`.
  bool internalHasImplementationForService(const SRLAPIRegistrationData* api);

  /// The same four operations for a caller that has the API's identifier and the tags as an object. Errors:
  /// all report a null `identifier`. The first three report null `scopeTags` and return null. The first and
  /// the last report an identifier that no module has. For such an identifier, the second returns null and
  /// the third an empty array, without a report.
  rt::Ref<rt::Object> eg_internalService(const rt::String& identifier,
                                         const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags);
  rt::Ref<rt::Object> eg_internalOptionalService(const rt::String& identifier,
                                                 const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags);
  rt::Ref<rt::Array> eg_internalMultiBoundService(const rt::String& identifier,
                                                  const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags);
  bool eg_internalHasImplementationForService(const rt::String& identifier);

  /// Returns the configuration for the address `identifier`. The first call makes it. Null if no module has a
  /// factory for it.
  rt::Ref<rt::Object> internalImplementationConfigForIdentifier(const void* identifier);

  /// Returns whether every module allows other modules beside it. The first answer, of any registry, is kept
  /// for the process.
  bool multipleBindingsModulesAllowed() const;

  /// Returns the lock. It lives as long as the registry. The operations of the last group need it.
  SRLUnfairLock* lock() const noexcept RT_RETURN_CAPABILITY(*lock_) { return lock_; }

  /// Returns the scope with these tags, and opens it if there is none. A set without tags is a scope, too.
  /// To use the result, include ServiceRegistry.h, which declares SRLMemoizingScope.
  rt::Ref<SRLMemoizingScope> scopeWithTags(const SRLScopeTagSet& tags);

  /// Returns the scope of the registry's configurations. It never ends.
  const rt::Ref<SRLMemoizingScope>& configScope() const noexcept { return configScope_; }

  /// Returns a block that makes instances with `factory`. The block passes on those tags of a request that
  /// belong to `implScope`, a subset of `apiScope`. With a `lifetime` of 1, it calls `factory` each time.
  /// With any other, it keeps one instance in the shared registry's scope with those tags.
  SRLFactoryBlock scopedBlockForFactory(rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags),
                                        const SRLImplementationRegistrationData* implementationIdentifier,
                                        SRLScopeType apiScope, SRLScopeType implScope,
                                        std::uint64_t lifetime);

  /// @}
  /// @name For tools and tests that hold the lock, and for the start of the program
  /// @{

  /// The load hook. It calls `initialize`.
  static void load();

  /// Passes all bindings modules to the shared registry. These are the non-null results of the class methods
  /// whose selector begins with "srl_bindings" and is longer, in the order of the selectors. Methods of
  /// another signature are ignored. Does nothing if `receiver` is a subclass. A second call ends the process.
  static void initialize(const rt::ClassInfo& receiver);

  /// Adds `modules`, none of them null. If two modules have a configuration factory for one address, the
  /// first one is used. Errors: a second call is reported and ends the process. Threads: call it while the
  /// program is loaded, before it has a second thread.
  void internalRegisterBindings(std::span<const SRLBindingsModuleData* const> modules);

  /// Returns the API whose record has this identifier. Null if no module has one. Errors: reports null. The
  /// first search for an identifier looks at one binding after another and takes the lock: the program ends
  /// if the caller holds it.
  const SRLAPIRegistrationData* apiIdentifierFromString(const rt::String& apiIdentifierString) const;

  /// Returns the implementation that is bound to `api`, a single-bound API. Null if there is none. Errors:
  /// reports a null `api`.
  rt::Ref<SRLImplementation> implementationForSingleBoundService(const SRLAPIRegistrationData* api)
      RT_REQUIRES(*lock_);

  /// Registers all bindings of `api` in the modules. Returns whether a module has the API. Precondition:
  /// `api` is not null.
  bool lazilyRegisterBindingsForAPI(const SRLAPIRegistrationData* api) RT_REQUIRES(*lock_);

  /// Returns each module's binding whose API has the identifier of `api`. Precondition: `api` is not null.
  std::vector<const _SRLBindingRegistrationData*> registrationDatasForAPI(
      const SRLAPIRegistrationData* api) const RT_REQUIRES(*lock_);

  /// Registers the implementations of `binding`. A binding without implementations makes the API known, and
  /// removes the implementation of a single-bound API. Ends the program if the caller does not hold the lock.
  void registerBindings(const _SRLBindingRegistrationData& binding) RT_REQUIRES(*lock_);

  /// Binds `implementation` to `api`. Errors: only reports if either is null, if the implementation's class
  /// is not of the API's type, or if the implementation has a scope that the API lacks. The two operations
  /// below report more.
  void internalRegisterServiceAPI(const SRLAPIRegistrationData* api,
                                  const rt::Ref<SRLImplementation>& implementation) RT_REQUIRES(*lock_);

  /// Binds `implementation`, not null, to a single-bound API. Errors: does nothing but report if the API is
  /// multi-bound, or if it has an implementation and `allowOverridingExistingBinding` is false.
  void internalRegisterImplementation(const rt::Ref<SRLImplementation>& implementation,
                                      const SRLAPIRegistrationData* forSingleboundAPI,
                                      bool allowOverridingExistingBinding) RT_REQUIRES(*lock_);

  /// Adds `implementation`, not null, to a multi-bound API, unless that has an equal one. Errors: does
  /// nothing but report if the API is single-bound.
  void internalRegisterImplementation(const rt::Ref<SRLImplementation>& implementation,
                                      const SRLAPIRegistrationData* forMultiboundAPI) RT_REQUIRES(*lock_);

  /// Returns the API whose type is the name of `protocol` and no class. Null if no module has one. Looks at
  /// one binding after another. Ends the program if the caller does not hold the lock.
  const SRLAPIRegistrationData* apiIdentifierForProtocol(const rt::ProtocolInfo* protocol) const
      RT_REQUIRES(*lock_);

  /// @}

  /// Releases bindings and scopes on the main thread. On another thread, it queues a task of the main queue
  /// for that. Without memory for the task, it releases them on the calling thread. It releases
  /// configurations at once, on the calling thread.
  ~SRLRegistry() override;

 protected:
  explicit SRLRegistry(std::unique_ptr<SRLRegistryIvars> ivars);

 private:
  struct Found;

  // Searches for an instance that a scope keeps already, and else for the implementation that makes it.
  Found find(const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags) RT_REQUIRES(*lock_);

  // Returns the table's entry for a single-bound API, whose implementation may be null. Null if no module has
  // the API. Reports a null API.
  const rt::Ref<SRLImplementation>* boundTo(const SRLAPIRegistrationData* api) RT_REQUIRES(*lock_);
  // Does this for an API that is not in the table yet.
  const rt::Ref<SRLImplementation>* newlyBound(const SRLAPIRegistrationData* api) RT_REQUIRES(*lock_);

  // Calls `lazilyRegisterBindingsForAPI`, and remembers an API that no module has.
  bool registersBindingsFor(const SRLAPIRegistrationData* api) RT_REQUIRES(*lock_);

  SRLMemoizingScope& openScope(const SRLScopeTagSet& tags) RT_REQUIRES(*lock_);
  SRLMemoizingScope& newScope(const SRLScopeTagSet& tags) RT_REQUIRES(*lock_);

  // Returns the instance that a scope of this registry keeps. If there is none, returns null and sets `scope`
  // to the scope that is to keep it, if any.
  rt::Ref<rt::Object> keptInstanceOf(const SRLImplementation& implementation, const SRLScopeTagSet& tags,
                                     rt::Ref<SRLMemoizingScope>& scope) RT_REQUIRES(*lock_);

  // Returns an instance, new or kept. Null if the factory returns null. The caller retains `implementation`.
  // `scope` is the scope that keeps the instance, if the caller knows it.
  static rt::Ref<rt::Object> instanceOf(SRLImplementation& implementation, const SRLAPIRegistrationData* api,
                                        const SRLScopeTagSet& tags, rt::Ref<SRLMemoizingScope> scope);

  // The state that may be used without the lock.
  SRLRegistryUnguardedIvars& unguarded() const noexcept;

  std::unique_ptr<SRLRegistryIvars> ivars_ RT_POINTER_GUARDED_BY(*lock_);
  // In the ivars.
  SRLUnfairLock* const lock_;
  const rt::Ref<SRLMemoizingScope> configScope_;
  // Written together with the shared registry itself.
  std::atomic<bool> isShared_{false};
  mutable rt::UnfairLock delegateLock_;
  rt::Weak<SRLScopeLifecycleDelegate> scopeLifecycleDelegate_ RT_GUARDED_BY(delegateLock_);
};
