// An API's set of implementations never changes: a new set replaces it. So a request for a multi-bound API
// retains the set under the lock, and copies nothing.
//
// A program can intervene by defining two weak functions: `SRLStartUpHook` and `SRLPProfilingSwitch`. They
// may run while the program is loaded, when none of its code could have registered a callback yet.

#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

#include <algorithm>
#include <new>
#include <string_view>
#include <utility>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/LoadHook.h"
#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Dictionary.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/Private/SRLRegistryIvars.h"
#include "Shared/ServiceRegistry/Source/Private/SRLReportFatal.h"
#include "Shared/ServiceRegistry/Source/Private/SRLScopedFactory.h"
#include "Shared/ServiceRegistry/Source/SRLStartUpHook.h"

using namespace rt::literals;

template struct rt::LoadHook<SRLRegistry>;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/SRLRegistry";

constexpr std::string_view kBindingsPrefix = "srl_bindings";

constinit rt::UnfairLock sharedInstanceLock;
constinit bool isSharedInstanceMade RT_GUARDED_BY(sharedInstanceLock) = false;
// Retained, and not released at exit, when other threads may still request services.
constinit SRLRegistry* sharedRegistry RT_GUARDED_BY(sharedInstanceLock) = nullptr;

// Returns a module's binding of the API with this identifier. Null if there is none.
const _SRLBindingRegistrationData* bindingOf(const SRLBindingsModuleData& module,
                                             std::string_view identifier) {
  const auto identifierOf = [](const auto& binding) { return SRLIdentifierBytes(*binding.api); };
  const auto bindings = module.bindings();
  const auto found = std::ranges::lower_bound(bindings, identifier, SRLIsIdentifierBefore, identifierOf);
  return found != bindings.end() && identifierOf(*found) == identifier ? &*found : nullptr;
}

// Returns whether a class fits an API that is given by names, as most are. This is quicker than making the
// API's instance type, which decides if this returns false.
bool hasNamesOf(const SRLAPIRegistrationData& api, const rt::ClassInfo& aClass) {
  if (api.instanceTypeKind != SRLInstanceTypeKindNames) return false;
  const auto& [protocolName, className] = api.instanceType.names;
  if (className != nullptr) {
    const rt::ClassInfo* named = rt::classNamed(className);
    if (named == nullptr || !aClass.isSubclassOf(*named)) return false;
  }
  if (protocolName != nullptr) {
    const rt::ProtocolInfo* named = rt::protocolNamed(protocolName);
    if (named == nullptr || !aClass.conformsTo(*named)) return false;
  }
  return className != nullptr || protocolName != nullptr;
}

rt::String descriptionOf(const rt::Ref<SRLInstanceType>& type) {
  return type ? type->asObject()->description() : rt::String();
}

}  // namespace

void SRLRegistry::load() {
  initialize(rt::classInfo<SRLRegistry>());
}

void SRLRegistry::initialize(const rt::ClassInfo& receiver) {
  if (&receiver != &rt::classInfo<SRLRegistry>()) return;
  SRLStartUpHook();
  const std::vector<rt::ClassMethod> methods = rt::classMethods(receiver);
  std::vector<const SRLBindingsModuleData*> modules;
  modules.reserve(methods.size());
  for (const rt::ClassMethod& method : methods) {
    if (!method.selector().starts_with(kBindingsPrefix) || method.selector() == kBindingsPrefix) continue;
    const auto bindings = method.as<const SRLBindingsModuleData*()>();
    if (bindings == nullptr) continue;
    if (const SRLBindingsModuleData* module = bindings()) modules.push_back(module);
  }
  sharedInstance()->internalRegisterBindings(modules);
}

rt::Ref<SRLRegistry> SRLRegistry::sharedInstance() {
  const rt::LockGuard guard(sharedInstanceLock);
  if (!isSharedInstanceMade) [[unlikely]] {
    const rt::Ref<SRLRegistry> made = initPrivate();
    made->retain();
    made->isShared_.store(true, std::memory_order_relaxed);
    sharedRegistry = made.get();
    isSharedInstanceMade = true;
  }
  return sharedRegistry;
}

rt::Ref<SRLRegistry> SRLRegistry::setSharedInstance(const rt::Ref<SRLRegistry>& registry) {
  if (registry) registry->retain();
  const rt::LockGuard guard(sharedInstanceLock);
  isSharedInstanceMade = true;
  if (sharedRegistry != nullptr) sharedRegistry->isShared_.store(false, std::memory_order_relaxed);
  if (registry) registry->isShared_.store(true, std::memory_order_relaxed);
  return rt::Ref<SRLRegistry>::adopt(std::exchange(sharedRegistry, registry.get()));
}

rt::Ref<SRLRegistry> SRLRegistry::initPrivate() {
  // The members initialise themselves, so their memory need not be cleared first.
  return rt::Ref<SRLRegistry>::adopt(new SRLRegistry(std::make_unique_for_overwrite<SRLRegistryIvars>()));
}

SRLRegistry::SRLRegistry(std::unique_ptr<SRLRegistryIvars> ivars)
    : ivars_(std::move(ivars)), lock_(&unguarded().lock), configScope_(SRLMemoizingScope::init()) {}

// The only way to the state around the analysis.
SRLRegistryUnguardedIvars& SRLRegistry::unguarded() const noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  return *ivars_;
}

SRLRegistry::~SRLRegistry() {
  if (rt::isMainThread()) return;
  try {
    rt::Queue::main()->async([ivars = std::move(ivars_)] {});
  } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): nothing is left to do
    // Without memory for the task, the lambda has released the ivars here and now.
  }
}

rt::Ref<SRLRegistry> SRLRegistry::mutableCopy() const {
  const rt::LockGuard guard(*lock_);
  return rt::Ref<SRLRegistry>::adopt(new SRLRegistry(std::make_unique<SRLRegistryIvars>(*ivars_)));
}

rt::String SRLRegistry::description() const {
  rt::Dictionary::Builder singles;
  rt::Dictionary::Builder multis;
  {
    const rt::LockGuard guard(*lock_);
    for (const auto& [api, implementation] : ivars_->singleBindings.entries()) {
      singles.set(SRLAPIIdentifier(api), implementation);
    }
    for (const auto& [api, implementations] : ivars_->multiBindings.entries()) {
      multis.set(SRLAPIIdentifier(api), implementations);
    }
  }
  return rt::format("<%@: %p>\nSingle bindings:\n%@\nMulti bindings:\n%@"_s,
                    rt::String::overStatic(classInfo().name), static_cast<const void*>(this),
                    std::move(singles).dictionary(), std::move(multis).dictionary());
}

void SRLRegistry::internalRegisterBindings(std::span<const SRLBindingsModuleData* const> modules) {
  SRLRegistryUnguardedIvars& ivars = unguarded();
  if (ivars.bindingsState != SRLBindingsState::kNone) {
    SRLReportFatal({kFile, "-[SRLRegistry internalRegisterBindings:]"},
                   "Trying to register bindings module data twice. This is likely caused by loading multiple "
                   "bindings modules in the same app or test. "
                   "See docs/registry.md#registering-bindings-module-twice."_s);
  }
  ivars.bindingsState = SRLBindingsState::kInProgress;
  for (const SRLBindingsModuleData* module : modules) {
    if (module->addConfigurationFactories == nullptr) continue;
    SRLConfigurationFactories factories;
    module->addConfigurationFactories(factories);
    ivars.configFactories.merge(factories);
  }
  ivars.bindingsModules.insert(ivars.bindingsModules.end(), modules.begin(), modules.end());
  ivars.bindingsState = SRLBindingsState::kRegistered;
}

bool SRLRegistry::multipleBindingsModulesAllowed() const {
  static constinit rt::Lazy<bool> isAllowed;
  return isAllowed.get([&] {
    return std::ranges::all_of(unguarded().bindingsModules,
                               [](const auto* module) { return module->allowsMultipleModules != 0; });
  });
}

// Does not call `registrationDatasForAPI`: making its list would cost a seventh of a first request's time.
bool SRLRegistry::lazilyRegisterBindingsForAPI(const SRLAPIRegistrationData* api) {
  const bool isNew = !ivars_->isKnown(api);
  // Other records with the identifier of `api`, which become known together with it.
  std::vector<const SRLAPIRegistrationData*> others;
  bool hasBindings = false;
  try {
    for (const SRLBindingsModuleData* module : ivars_->bindingsModules) {
      const _SRLBindingRegistrationData* binding = bindingOf(*module, api->identifier);
      if (binding == nullptr) continue;
      hasBindings = true;
      if (binding->api != api && !ivars_->isKnown(binding->api)) others.push_back(binding->api);
      registerBindings(*binding);
    }
  } catch (const std::bad_alloc&) {
    // Makes these APIs unknown, so that the next request registers all their bindings anew.
    const auto forget = [this](const SRLAPIRegistrationData* each) RT_NO_THREAD_SAFETY_ANALYSIS {
      ivars_->singleBindings.erase(each);
      ivars_->multiBindings.erase(each);
    };
    if (isNew) forget(api);
    std::ranges::for_each(others, forget);
    throw;
  }
  return hasBindings;
}

std::vector<const _SRLBindingRegistrationData*> SRLRegistry::registrationDatasForAPI(
    const SRLAPIRegistrationData* api) const {
  const std::string_view identifier = api->identifier;
  std::vector<const _SRLBindingRegistrationData*> found;
  for (const SRLBindingsModuleData* module : ivars_->bindingsModules) {
    if (const _SRLBindingRegistrationData* binding = bindingOf(*module, identifier)) found.push_back(binding);
  }
  return found;
}

void SRLRegistry::registerBindings(const _SRLBindingRegistrationData& binding) {
  lock_->assertOwner();
  const SRLAPIRegistrationData* api = binding.api;
  if (*binding.implementations == nullptr) {
    if (api->isMultibound == 0) {
      ivars_->singleBindings[api] = nullptr;
    } else {
      rt::Ref<rt::Set> none = rt::make<rt::Set>();
      rt::Ref<rt::Set>& implementations = ivars_->multiBindings[api];
      if (!implementations) implementations = std::move(none);
    }
    return;
  }
  for (const auto* next = binding.implementations; *next != nullptr; ++next) {
    const SRLImplementationRegistrationData* record = *next;
    rt::Ref<SRLImplementationConfiguration> configuration;
    if (record->hasConfiguration != 0) {
      configuration = SRLImplementationConfiguration::initWithConfigurationInstanceType(
          SRLImplementationRegistrationDataConfigInstanceType(record), record->isConfigurationRequired != 0);
    }
    rt::Ref<SRLInstanceType> instanceType = SRLImplementationRegistrationDataInstanceType(record);
    SRLFactoryBlock factoryBlock =
        scopedBlockForFactory(record->factory, record, api->scopeType, record->scopeType, record->lifetime);
    const rt::Ref<SRLImplementation> implementation =
        SRLImplementation::initWithIdentifier(record->identifier, std::move(instanceType), record->lifetime,
                                              record->scopeType, std::move(factoryBlock), configuration);
    internalRegisterServiceAPI(api, implementation);
  }
}

void SRLRegistry::internalRegisterServiceAPI(const SRLAPIRegistrationData* api,
                                             const rt::Ref<SRLImplementation>& implementation) {
  constexpr const char* kFunction = "-[SRLRegistry internalRegisterServiceAPI:toImplementation:]";
  if (api == nullptr) {
    PECReport({kFile, kFunction}, "apiData cannot be nil!"_s);
    return;
  }
  if (!implementation) {
    PECReport({kFile, kFunction}, "implMetadata cannot be nil!"_s);
    return;
  }

  if (const auto* classType = rt::cast<SRLClassType>(implementation->instanceType().get());
      classType != nullptr && !hasNamesOf(*api, classType->concreteClass())) {
    const rt::Ref<SRLInstanceType> apiType = SRLAPIRegistrationDataInstanceType(api);
    if (!apiType || !apiType->doesRepresentSupertypeOfClass(classType->concreteClass())) {
      PECReport({kFile, kFunction}, "Implementation %@ should conform to %@"_s,
                descriptionOf(implementation->instanceType()), descriptionOf(apiType));
      return;
    }
  }
  if ((implementation->scopeType() & api->scopeType) != implementation->scopeType()) {
    // The grammar stays as it is, since people search for this message.
    PECReport({kFile, kFunction},
              "Cannot bind a implementation to APIs that require a superset of scopes:\n"
              "Implementation: %@,\nService API: %@"_s,
              implementation->description(), SRLAPIIdentifier(api));
    return;
  }
  if (api->isMultibound != 0) {
    internalRegisterImplementation(implementation, api);
  } else {
    internalRegisterImplementation(implementation, api, /*allowOverridingExistingBinding=*/false);
  }
}

void SRLRegistry::internalRegisterImplementation(const rt::Ref<SRLImplementation>& implementation,
                                                 const SRLAPIRegistrationData* forSingleboundAPI,
                                                 bool allowOverridingExistingBinding) {
  constexpr const char* kFunction =
      "-[SRLRegistry internalRegisterImplementation:forSingleboundAPI:allowOverridingExistingBinding:]";
  if (forSingleboundAPI->isMultibound != 0) {
    PECReport({kFile, kFunction}, "Incorrect binding type for %@"_s, SRLAPIIdentifier(forSingleboundAPI));
    return;
  }
  rt::Ref<SRLImplementation>& bound = ivars_->singleBindings[forSingleboundAPI];
  if (bound && !allowOverridingExistingBinding) {
    PECReport({kFile, kFunction},
              "Service API is already registered\nService API: %@\nExisting binding implementation: "
              "%@\nNew binding implementation: %@"_s,
              SRLAPIIdentifier(forSingleboundAPI), bound->description(), implementation->description());
    return;
  }
  bound = implementation;
}

void SRLRegistry::internalRegisterImplementation(const rt::Ref<SRLImplementation>& implementation,
                                                 const SRLAPIRegistrationData* forMultiboundAPI) {
  constexpr const char* kFunction = "-[SRLRegistry internalRegisterImplementation:forMultiboundAPI:]";
  if (forMultiboundAPI->isMultibound == 0) {
    PECReport({kFile, kFunction}, "Incorrect binding type for %@"_s, SRLAPIIdentifier(forMultiboundAPI));
    return;
  }
  // Completes the set before the API becomes known, since hashing a host's own type may throw.
  const auto* known = ivars_->multiBindings.find(forMultiboundAPI);
  const bool isBound = known != nullptr && known->second;
  rt::Set::Builder builder = isBound ? rt::Set::Builder(*known->second) : rt::Set::Builder();
  builder.add(implementation);
  ivars_->multiBindings[forMultiboundAPI] = std::move(builder).set();
}

rt::Ref<rt::Object> SRLRegistry::internalImplementationConfigForIdentifier(const void* identifier) {
  const SRLConfigurationFactories& factories = unguarded().configFactories;
  const auto found = factories.find(identifier);
  if (found == factories.end()) return nullptr;
  return configScope()->instanceForIdentifier(identifier, nullptr, found->second);
}

const SRLAPIRegistrationData* SRLRegistry::apiIdentifierForProtocol(const rt::ProtocolInfo* protocol) const {
  lock_->assertOwner();
  if (protocol == nullptr) return nullptr;
  for (const SRLBindingsModuleData* module : ivars_->bindingsModules) {
    for (const _SRLBindingRegistrationData& binding : module->bindings()) {
      if (binding.api->instanceTypeKind != SRLInstanceTypeKindNames) continue;
      const SRLAPIInstanceType::Names& names = binding.api->instanceType.names;
      if (names.className == nullptr && names.protocolName != nullptr &&
          names.protocolName == protocol->name) {
        return binding.api;
      }
    }
  }
  return nullptr;
}

const SRLAPIRegistrationData* SRLRegistry::apiIdentifierFromString(
    const rt::String& apiIdentifierString) const {
  if (!apiIdentifierString) {
    PECReport({kFile, "-[SRLRegistry apiIdentifierFromString:]"}, "apiIdentifierString must not be nil"_s);
    return nullptr;
  }
  const std::string_view identifier = apiIdentifierString.view();
  const auto& apisByIdentifier = unguarded().apisByIdentifier;
  if (const auto* known = apisByIdentifier.find(identifier)) return known->second;
  const rt::LockGuard guard(*lock_);
  for (const SRLBindingsModuleData* module : ivars_->bindingsModules) {
    for (const _SRLBindingRegistrationData& binding : module->bindings()) {
      const std::string_view bytes = SRLIdentifierBytes(*binding.api);
      if (bytes != identifier) continue;
      ivars_->apisByIdentifier.tryInsert(bytes, binding.api);
      return binding.api;
    }
  }
  return nullptr;
}

rt::Ref<rt::Set> SRLRegistry::registeredAPIIdentifiers() const {
  rt::Set::Builder identifiers;
  const rt::LockGuard guard(*lock_);
  for (const SRLBindingsModuleData* module : ivars_->bindingsModules) {
    for (const _SRLBindingRegistrationData& binding : module->bindings()) {
      identifiers.add(SRLAPIIdentifier(binding.api).object());
    }
  }
  return std::move(identifiers).set();
}
