#pragma once

/// The service registry: finds, for a service interface (an API), what implements it, and hands out
/// instances, one for each scope or a new one each time.
///
///     rt::Ref<Clock> injectClock(const SRLScopeTagSet& tags) {             // as a generator writes it
///       return rt::cast<Clock>(SRLRegistry::sharedInstance()->internalService(&clockAPI, tags));
///     }
///     ...
///     SRLRegistry::sharedInstance()->removeScopesWithTag(account);         // the account is logged out
///
/// What is bound to what is said by constant records in bindings modules (SRLBindingsModuleData.h). The
/// shared registry knows all modules of the program, and of the libraries that it links, before `main`; those
/// of a library that is opened later it never sees. It looks into an API's bindings, and checks them, when
/// the API is first asked for.
///
/// Any thread may use a registry. Its lock, which is not recursive, is never held while an instance is made
/// or destroyed or the delegate is told, so that factories may ask for other services. It is held while tags
/// are hashed and compared, while an API's bindings are looked at for the first time, with its generated
/// functions and instance types, while an implementation that was bound by hand is given up for another, and
/// during some reports. What these ask the registry for then ends the program. Error callbacks, log filters
/// and loggers must not ask a registry for anything at any time (SRLUnfairLock.h).
///
/// Misuse is reported (PECErrorHandler) and yields null, false or nothing. Throughout, an API is named by the
/// address of its record, and what is thrown is what the error callback, the factories, the generated
/// functions, the delegate, tags and instance types throw, and std::bad_alloc. The registry is usable then;
/// but of an API whose bindings were being looked at, some may be bound and the others not, and the instance
/// for a scope whose factory has thrown stays pending as long as the scope is there: whoever waits for it, or
/// asks for it later, gets a report and null. After std::bad_alloc, an API's bindings are looked at anew by
/// the next request, and all of them are bound.
///
/// Not for: what a constructor's argument can do.

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
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLFactoryBlock.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSet.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/Private/SRLRegistryIvars.h"
#include "Shared/ServiceRegistry/Source/SRLScopeLifecycleDelegate.h"
#include "Shared/ServiceRegistry/Source/SRLUnfairLock.h"

class RT_VISIBLE SRLRegistry : public rt::Implements<SRLRegistry, rt::Object> {
 public:
  /// @name The shared registry
  /// @{

  /// The load hook: has the class initialised.
  static void load();

  /// Hands all bindings modules to the shared registry, those whose class methods' selectors begin with
  /// "srl_bindings" and do not end there, in the order of the selectors. A method of another type is passed
  /// over, as is one that returns null. Does nothing where `receiver` is a subclass. The second time in a
  /// process ends it.
  static void initialize(const rt::ClassInfo& receiver);

  /// The registry that injectors ask; made when it is first asked for. Null where null was set.
  static rt::Ref<SRLRegistry> sharedInstance();

  /// Makes `registry`, which may be null, the shared one, and returns the one that was. Without one, services
  /// that live in scopes are null. For tests.
  static rt::Ref<SRLRegistry> setSharedInstance(const rt::Ref<SRLRegistry>& registry);

  /// @}
  /// @name Life
  /// @{

  /// A registry that knows nothing.
  static rt::Ref<SRLRegistry> initPrivate();

  /// Bindings and scopes are released on the main thread: at once there, by way of the main queue elsewhere
  /// (here only where there is no memory for a task). Configurations are released at once, anywhere.
  ~SRLRegistry() override;

  /// A registry with the same modules, bindings and configuration factories, which change independently of
  /// this one's. It has neither scopes nor delegate. (Instances that live in scopes are shared nevertheless:
  /// all registries keep them in those of the shared one.)
  rt::Ref<SRLRegistry> mutableCopy() const;

  /// "<SRLRegistry: ADDRESS>", and the implementations of the APIs that are known so far.
  rt::String description() const override;

  /// @}
  /// @name Services
  /// @{

  /// An instance of what is bound to `api`, not null, for the scope `scopeTags`. That nothing is bound is
  /// reported, as is a factory that returns null; both yield null.
  rt::Ref<rt::Object> internalService(const SRLAPIRegistrationData* api, const SRLScopeTagSet& scopeTags);

  /// The same for an API that may have no implementation, and for a factory that may return null. Only a
  /// request while modules are being registered is reported.
  rt::Ref<rt::Object> internalOptionalService(const SRLAPIRegistrationData* api,
                                              const SRLScopeTagSet& scopeTags);

  /// An instance of each implementation of `api`, which may have many, in no particular order; null where no
  /// module knows the API. Reported: a null `api`, a request while modules are being registered (both yield
  /// null), and a factory that returns null (which is left out).
  rt::Ref<rt::Array> internalMultiBoundService(const SRLAPIRegistrationData* api,
                                               const SRLScopeTagSet& scopeTags);

  /// Whether an implementation is bound to `api`; false for an API that may have many. Null is reported.
  bool internalHasImplementationForService(const SRLAPIRegistrationData* api);

  /// What is bound to `api`, which may have one implementation; null where that is nothing. Null is reported.
  /// The caller holds the lock.
  rt::Ref<SRLImplementation> implementationForSingleBoundService(const SRLAPIRegistrationData* api)
      RT_REQUIRES(ivars_->lock);

  /// The four for those who have the API's identifier only, and the tags as an object. Reported: null
  /// `scopeTags`, which yields null; a null identifier; and an identifier that no module knows, where a
  /// service is required or asked about. To those who ask for optional ones the latter is null, and for many
  /// an empty array.
  rt::Ref<rt::Object> eg_internalService(const rt::String& identifier,
                                         const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags);
  rt::Ref<rt::Object> eg_internalOptionalService(const rt::String& identifier,
                                                 const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags);
  rt::Ref<rt::Array> eg_internalMultiBoundService(const rt::String& identifier,
                                                  const rt::Ref<SRLScopeTagSetCodableWrapper>& scopeTags);
  bool eg_internalHasImplementationForService(const rt::String& identifier);

  /// @}
  /// @name Scopes
  /// @{

  /// The scope with these tags, opened if there is none. No tags make a scope, too.
  rt::Ref<SRLMemoizingScope> scopeWithTags(const SRLScopeTagSet& tags);

  /// Ends the scopes among whose tags is one that equals `tag`: they give up their instances, and the
  /// delegate is told. Null is reported.
  void removeScopesWithTag(const rt::Ref<rt::Object>& tag);

  /// The scope in which configurations are kept. It never ends.
  const rt::Ref<SRLMemoizingScope>& configScope() const noexcept { return configScope_; }

  /// Who is told of scopes that end; null for nobody. Not retained.
  rt::Ref<SRLScopeLifecycleDelegate> scopeLifecycleDelegate() const;
  void setScopeLifecycleDelegate(const rt::Ref<SRLScopeLifecycleDelegate>& delegate);

  /// How an instance is got for the tags of a request: with a `lifetime` of 1, from `factory`, which is given
  /// those of the tags that belong to `implScope`, a part of `apiScope`; with any other, from the shared
  /// registry's scope with those tags, where `factory` makes it once.
  SRLFactoryBlock scopedBlockForFactory(rt::Ref<rt::Object> (*factory)(SRLScopeTagSet tags),
                                        const SRLImplementationRegistrationData* implementationIdentifier,
                                        SRLScopeType apiScope, SRLScopeType implScope,
                                        std::uint64_t lifetime);

  /// @}
  /// @name Bindings
  /// @{

  /// Takes the program's modules, none of them null, when the program is loaded. The second call is reported,
  /// and ends the program. Of two configurations for one address the first module's counts.
  void internalRegisterBindings(std::span<const SRLBindingsModuleData* const> modules);

  /// Whether modules may be many: all of them say so. The first answer that any registry gives is that of
  /// all.
  bool multipleBindingsModulesAllowed() const;

  /// Registers what the modules bind to `api`, not null. Returns whether a module knows the API. The caller
  /// holds the lock.
  bool lazilyRegisterBindingsForAPI(const SRLAPIRegistrationData* api) RT_REQUIRES(ivars_->lock);

  /// Each module's binding of the API with the identifier of `api`, not null. The caller holds the lock.
  std::vector<const _SRLBindingRegistrationData*> registrationDatasForAPI(
      const SRLAPIRegistrationData* api) const RT_REQUIRES(ivars_->lock);

  /// Binds the implementations of a binding. Where there are none, the API is known from now on, and a single
  /// implementation that it had is bound no more. Ends the program unless the caller holds the lock.
  void registerBindings(const _SRLBindingRegistrationData& binding) RT_REQUIRES(ivars_->lock);

  /// Binds an implementation to an API. Reported, with nothing bound: that either is null; that the class of
  /// the implementation is not of the API's type; that the implementation has a scope that the API has not;
  /// and what the functions below report. The caller holds the lock.
  void internalRegisterServiceAPI(const SRLAPIRegistrationData* api,
                                  const rt::Ref<SRLImplementation>& implementation) RT_REQUIRES(ivars_->lock);

  /// Binds an implementation, not null, to an API for one. Reported, with nothing changed: an API for many;
  /// and one that has an implementation already, unless `allowOverridingExistingBinding`. The caller holds
  /// the lock.
  void internalRegisterImplementation(const rt::Ref<SRLImplementation>& implementation,
                                      const SRLAPIRegistrationData* forSingleboundAPI,
                                      bool allowOverridingExistingBinding) RT_REQUIRES(ivars_->lock);

  /// Binds an implementation, not null, to an API for many, unless it has an equal one. An API for one is
  /// reported. The caller holds the lock.
  void internalRegisterImplementation(const rt::Ref<SRLImplementation>& implementation,
                                      const SRLAPIRegistrationData* forMultiboundAPI)
      RT_REQUIRES(ivars_->lock);

  /// The configuration for an address, made when it is first asked for; null where no module has one.
  rt::Ref<rt::Object> internalImplementationConfigForIdentifier(const void* identifier);

  /// The API that is given by the name of `protocol` and no class; null where no module knows one. Ends the
  /// program unless the caller holds the lock. Looks at one binding after another: for tools.
  const SRLAPIRegistrationData* apiIdentifierForProtocol(const rt::ProtocolInfo* protocol) const
      RT_REQUIRES(ivars_->lock);

  /// The API with this identifier; null where no module knows one. Null is reported. Where the identifier has
  /// not been found before, it looks at one binding after another, and ends the program if the caller holds
  /// the lock.
  const SRLAPIRegistrationData* apiIdentifierFromString(const rt::String& apiIdentifierString) const;

  /// The identifiers of all APIs that the modules know, as strings, whether they have been asked for or not.
  rt::Ref<rt::Set> registeredAPIIdentifiers() const;

  /// The registry's lock, for as long as the registry is there.
  SRLUnfairLock* lock() const noexcept RT_RETURN_CAPABILITY(ivars_->lock) { return &ivars_->lock; }

  /// @}

 protected:
  explicit SRLRegistry(std::unique_ptr<SRLRegistryIvars> ivars);

 private:
  // For a request: an instance that is there already; or else what is bound to the API, and the scope that
  // its instance is to be kept in, where that is one of this registry.
  struct Found {
    rt::Ref<rt::Object> instance;
    rt::Ref<SRLImplementation> implementation;
    rt::Ref<SRLMemoizingScope> scope;
  };
  // `ivars` are the registry's, here and below: read once, before the lock is taken.
  Found find(SRLRegistryIvars& ivars, const SRLAPIRegistrationData* api, const SRLScopeTagSet& tags)
      RT_REQUIRES(ivars.lock);

  // What is bound to an API for one, which may be null; null where no module knows it. A null API is
  // reported.
  const rt::Ref<SRLImplementation>* boundTo(SRLRegistryIvars& ivars, const SRLAPIRegistrationData* api)
      RT_REQUIRES(ivars.lock);
  // The same for one that is not in the table yet.
  const rt::Ref<SRLImplementation>* newlyBound(const SRLAPIRegistrationData* api);

  // `lazilyRegisterBindingsForAPI`, after which it is known where no module knows the API.
  bool registersBindingsFor(const SRLAPIRegistrationData* api) RT_REQUIRES(ivars_->lock);

  static SRLMemoizingScope& openScope(SRLRegistryIvars& ivars, const SRLScopeTagSet& tags)
      RT_REQUIRES(ivars.lock);
  static SRLMemoizingScope& newScope(SRLRegistryIvars& ivars, const SRLScopeTagSet& tags)
      RT_REQUIRES(ivars.lock);

  // The instance that a scope of this registry has already; null where there is none, or no telling. In the
  // first case `scope` becomes the one that it is to be kept in, if there is one.
  rt::Ref<rt::Object> keptInstanceOf(SRLRegistryIvars& ivars, const SRLImplementation& implementation,
                                     const SRLScopeTagSet& tags, rt::Ref<SRLMemoizingScope>& scope)
      RT_REQUIRES(ivars.lock);

  // An instance of what the caller keeps, new or kept; null where its factory gives none. Where `scope` is
  // given, that is where it is kept.
  static rt::Ref<rt::Object> instanceOf(SRLImplementation& implementation, const SRLAPIRegistrationData* api,
                                        const SRLScopeTagSet& tags, rt::Ref<SRLMemoizingScope> scope);

  std::unique_ptr<SRLRegistryIvars> ivars_;
  const rt::Ref<SRLMemoizingScope> configScope_;
  // Written with the shared registry itself.
  std::atomic<bool> isShared_{false};
  mutable rt::UnfairLock delegateLock_;
  rt::Weak<SRLScopeLifecycleDelegate> scopeLifecycleDelegate_ RT_GUARDED_BY(delegateLock_);
};
