// Services beside what a look-up is made of, and beside a container as a user would write it.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <forward_list>
#include <functional>
#include <memory>
#include <mutex>
#include <span>
#include <string>
#include <string_view>
#include <thread>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Comparison.h"
#include "Runtime/Array.h"
#include "Runtime/Class.h"
#include "Runtime/ClassMethod.h"
#include "Runtime/Ref.h"
#include "Runtime/Set.h"
#include "Runtime/String.h"
#include "Runtime/UnfairLock.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace {

using namespace rt::literals;
using rt::Ref;

// Other parts of a program have threads: nothing may skip its atomic operations.
[[maybe_unused]] const bool hasHadThreads = (std::thread([] {}).join(), true);

class Service final : public rt::Implements<Service, rt::Object> {};

Ref<rt::Object> makeService(SRLScopeTagSet /*tags*/) {
  return rt::make<Service>();
}

constexpr std::size_t kAPIs = 1000;
constexpr SRLAPIInstanceType kType{.names = {.protocolName = nullptr, .className = "Service"}};

// A thousand APIs of one account's each, every third of which is made anew each time; and one for eight.
struct Module {
  Module() {
    for (std::size_t i = 0; i < kAPIs; ++i) {
      identifiers.at(i) = "Service" + std::to_string(1000 + i);
      apis.at(i).identifier = identifiers.at(i).c_str();
      apis.at(i).identifierLength = static_cast<std::uint16_t>(identifiers.at(i).size());
      apis.at(i).instanceType = kType;
      apis.at(i).scopeType = 0b1;
      implementations.at(i).identifier = identifiers.at(i).c_str();
      implementations.at(i).instanceType.className = "Service";
      implementations.at(i).factory = makeService;
      implementations.at(i).scopeType = 0b1;
      implementations.at(i).lifetime = i % 3 == 2 ? 1 : 0;
      lists.at(i) = {&implementations.at(i), nullptr};
      bindings.at(i) = {&apis.at(i), lists.at(i).data()};
    }
    for (std::size_t i = 0; i < 8; ++i) eight.at(i) = &implementations.at(3 * i);
    many.isMultibound = 1;
    bindings.at(kAPIs) = {&many, eight.data()};
    data.bindingsBegin = bindings.data();
    data.bindingsEnd = bindings.data() + bindings.size();
  }

  std::array<std::string, kAPIs> identifiers;
  std::array<SRLAPIRegistrationData, kAPIs> apis;
  std::array<SRLImplementationRegistrationData, kAPIs> implementations;
  std::array<std::array<const SRLImplementationRegistrationData*, 2>, kAPIs> lists{};
  SRLAPIRegistrationData many{
      .identifier = "ServiceOfMany", .instanceType = kType, .scopeType = 0b1, .identifierLength = 13};
  std::array<const SRLImplementationRegistrationData*, 9> eight{};
  std::array<_SRLBindingRegistrationData, kAPIs + 1> bindings;
  SRLBindingsModuleData data;
};

const Module& module() {
  static const Module module;
  return module;
}
const SRLAPIRegistrationData* scopedAPI() {
  return &module().apis.at(0);
}
const SRLAPIRegistrationData* freshAPI() {
  return &module().apis.at(2);
}
constexpr SRLAPIRegistrationData kUnknown{
    .identifier = "Unknown", .instanceType = kType, .identifierLength = 7};

Ref<SRLRegistry> registryWith(const SRLBindingsModuleData& data) {
  Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  registry->internalRegisterBindings(std::array{&data});
  return registry;
}

// The registry that the cases ask, all of whose APIs have been asked for.
SRLRegistry& registry() {
  static const Ref<SRLRegistry> registry = [] {
    Ref<SRLRegistry> made = registryWith(module().data);
    SRLRegistry::setSharedInstance(made);
    const Ref<rt::Object> account = rt::String::fromUTF8("account").object();
    for (const SRLAPIRegistrationData& api : module().apis) made->internalService(&api, {{account.get()}});
    return made;
  }();
  return *registry;
}

// The tag of a request is equal to the scope's, and not the same.
const Ref<rt::Object>& account() {
  static const Ref<rt::Object> tag = rt::String::fromUTF8("account").object();
  return tag;
}

// What a look-up is made of: locks, tables and counts, and nothing between them.
struct Floor {
  Floor() {
    for (const SRLAPIRegistrationData& api : module().apis) {
      implementations.emplace(&api, rt::make<Service>());
      instances.emplace(&api, rt::make<Service>());
    }
    for (const Ref<rt::Object>& tag : scopeTags)
      scopes.emplace(SRLScopeTagSet{{tag.get()}}, rt::make<Service>());
  }

  const std::array<Ref<rt::Object>, 2> scopeTags = {rt::String::fromUTF8("account").object(),
                                                    rt::String::fromUTF8("another").object()};
  rt::UnfairLock lock;
  rt::UnfairLock sharedLock;
  rt::UnfairLock scopeLock;
  Ref<rt::Object> shared = rt::make<Service>();
  std::unordered_map<const void*, Ref<rt::Object>> implementations;
  std::unordered_map<const void*, Ref<rt::Object>> instances;
  struct TagSetHash {
    std::size_t operator()(const SRLScopeTagSet& set) const { return SRLScopeTagSetHash(set); }
  };
  struct TagSetEqual {
    bool operator()(const SRLScopeTagSet& first, const SRLScopeTagSet& second) const {
      return SRLScopeTagSetEqual(first, second);
    }
  };
  std::unordered_map<SRLScopeTagSet, Ref<rt::Object>, TagSetHash, TagSetEqual> scopes;
};

template <class Table, class Key>
[[gnu::always_inline]] inline Ref<rt::Object> lookUp(rt::UnfairLock& lock, const Table& table,
                                                     const Key& key) {
  const rt::LockGuard guard(lock);
  const auto found = table.find(key);
  return found != table.end() ? Ref<rt::Object>(found->second) : nullptr;
}

// An instance that is there, in its scope of the shared registry.
[[gnu::always_inline]] inline Ref<rt::Object> keptInstance(Floor& floor, const SRLAPIRegistrationData& api,
                                                           const SRLScopeTagSet& tags) {
  const Ref<rt::Object> shared = [&] {
    const rt::LockGuard guard(floor.sharedLock);
    return floor.shared;
  }();
  const Ref<rt::Object> scope = lookUp(floor.lock, floor.scopes, tags);
  return lookUp(floor.scopeLock, floor.instances, &api);
}

// The container of a user: services by name, instances by name in scopes by tags.
class Container {
 public:
  using Service = std::shared_ptr<void>;
  using Tags = std::vector<std::string>;
  using Factory = std::function<Service(const Tags&)>;

  void bind(const std::string& name, Factory factory, bool isFresh) {
    const std::lock_guard lock(mutex_);
    bindings_[name] = {std::move(factory), isFresh};
  }

  Service find(const std::string& name, const Tags& tags) {
    Factory factory;
    bool isFresh = false;
    {
      const std::lock_guard lock(mutex_);
      const auto binding = bindings_.find(name);
      if (binding == bindings_.end()) return nullptr;
      factory = binding->second.factory;
      isFresh = binding->second.isFresh;
      if (!isFresh) {
        auto& scope = scopes_[tags];
        if (const auto instance = scope.find(name); instance != scope.end()) return instance->second;
      }
    }
    // Factories may ask for other services, so that two threads may make the same: the first counts.
    Service made = factory(tags);
    if (isFresh) return made;
    const std::lock_guard lock(mutex_);
    return scopes_[tags].emplace(name, std::move(made)).first->second;
  }

 private:
  struct Binding {
    Factory factory;
    bool isFresh = false;
  };
  struct TagsHash {
    std::size_t operator()(const Tags& tags) const {
      std::size_t hash = tags.size();
      for (const std::string& tag : tags) hash = hash * 31 + std::hash<std::string>()(tag);
      return hash;
    }
  };

  std::mutex mutex_;
  std::unordered_map<std::string, Binding> bindings_;
  std::unordered_map<Tags, std::unordered_map<std::string, Service>, TagsHash> scopes_;
};

Container& container() {
  static Container& container = []() -> Container& {
    auto& made = *new Container();
    for (std::size_t i = 0; i < kAPIs; ++i) {
      made.bind(
          module().identifiers.at(i), [](const Container::Tags&) { return std::make_shared<int>(1); },
          i % 3 == 2);
      made.find(module().identifiers.at(i), {"account"});
    }
    return made;
  }();
  return container;
}

void findScoped(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) benchmark::DoNotOptimize(asked.internalService(scopedAPI(), tags));
}
void findScopedBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    const Ref<rt::Object> implementation = lookUp(floor.lock, floor.implementations, scopedAPI());
    benchmark::DoNotOptimize(keptInstance(floor, *scopedAPI(), tags));
  }
}
void findScopedInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.at(0);
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
}

// Of two accounts by turns, so that the scope is never that of the request before.
void findByTurns(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const Ref<rt::Object> another = rt::String::fromUTF8("another").object();
  const std::array<SRLScopeTagSet, 2> tags = {{{{account().get()}}, {{another.get()}}}};
  std::size_t turn = 0;
  for (auto _ : state) benchmark::DoNotOptimize(asked.internalService(scopedAPI(), tags.at(turn ^= 1U)));
}
void findByTurnsBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  const Ref<rt::Object> another = rt::String::fromUTF8("another").object();
  const std::array<SRLScopeTagSet, 2> tags = {{{{account().get()}}, {{another.get()}}}};
  std::size_t turn = 0;
  for (auto _ : state) {
    const Ref<rt::Object> implementation = lookUp(floor.lock, floor.implementations, scopedAPI());
    benchmark::DoNotOptimize(keptInstance(floor, *scopedAPI(), tags.at(turn ^= 1U)));
  }
}
void findByTurnsInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.at(0);
  const std::array<Container::Tags, 2> tags = {{{"account"}, {"another"}}};
  std::size_t turn = 0;
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags.at(turn ^= 1U)));
}

void findFresh(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) benchmark::DoNotOptimize(asked.internalService(freshAPI(), tags));
}
void findFreshBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  for (auto _ : state) {
    const Ref<rt::Object> implementation = lookUp(floor.lock, floor.implementations, freshAPI());
    benchmark::DoNotOptimize(module().implementations.at(2).factory({}));
  }
}
void findFreshInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.at(2);
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
}

void missOptional(benchmark::State& state) {
  SRLRegistry& asked = registry();
  for (auto _ : state) benchmark::DoNotOptimize(asked.internalOptionalService(&kUnknown, {}));
}
// The module's binding of an API; null where it has none.
const _SRLBindingRegistrationData* bindingOf(const SRLAPIRegistrationData& api) {
  const auto identifierOf = [](const auto& binding) { return SRLIdentifierBytes(*binding.api); };
  const auto* const found = std::ranges::lower_bound(module().bindings, std::string_view(api.identifier),
                                                     SRLIsIdentifierBefore, identifierOf);
  return found != module().bindings.end() && identifierOf(*found) == api.identifier ? &*found : nullptr;
}
// A module may bind it, so it is looked for among the module's bindings. (Ours does so once.)
void missBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  for (auto _ : state) {
    const rt::LockGuard guard(floor.lock);
    const bool isKnown = floor.implementations.find(&kUnknown) != floor.implementations.end();
    benchmark::DoNotOptimize(isKnown || bindingOf(kUnknown) != nullptr);
  }
}
void missInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string name = "Unknown";
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
}

void findMany(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) benchmark::DoNotOptimize(asked.internalMultiBoundService(&module().many, tags));
}
void findManyBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    const Ref<rt::Object> implementations = lookUp(floor.lock, floor.implementations, scopedAPI());
    std::vector<Ref<rt::Object>> services;
    services.reserve(8);
    for (std::size_t i = 0; i < 8; ++i)
      services.push_back(keptInstance(floor, module().apis.at(3 * i), tags));
    benchmark::DoNotOptimize(rt::make<rt::Array>(std::move(services)));
  }
}
void findManyInContainer(benchmark::State& state) {
  Container& asked = container();
  const Container::Tags tags = {"account"};
  for (auto _ : state) {
    std::vector<Container::Service> services;
    services.reserve(8);
    for (std::size_t i = 0; i < 8; ++i) services.push_back(asked.find(module().identifiers.at(3 * i), tags));
    benchmark::DoNotOptimize(services);
  }
}

// The last of a thousand, which has been asked for before.
void findByString(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const rt::String name = rt::String::fromUTF8(module().identifiers.back());
  const auto tags = SRLScopeTagSetCodableWrapper::initWithTagSet({{account().get()}});
  for (auto _ : state) benchmark::DoNotOptimize(asked.eg_internalService(name, tags));
}
// The identifier is in a table too.
void findByStringBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  static const auto& byIdentifier = []() -> const auto& {
    auto& made = *new std::unordered_map<std::string_view, const SRLAPIRegistrationData*>();
    for (const SRLAPIRegistrationData& api : module().apis) made.emplace(SRLIdentifierBytes(api), &api);
    return made;
  }();
  const std::string& name = module().identifiers.back();
  const Ref<rt::Array> tags = rt::Array::of(account());
  for (auto _ : state) {
    const SRLAPIRegistrationData* api = [&] {
      const rt::LockGuard guard(floor.lock);
      return byIdentifier.find(name)->second;
    }();
    const Ref<rt::Array> kept = tags;
    const Ref<rt::Object> implementation = lookUp(floor.lock, floor.implementations, api);
    benchmark::DoNotOptimize(keptInstance(floor, *api, {{kept->at(0)}}));
  }
}
// Identifiers are looked through one after the other, as they are the first time.
void findByStringScanning(benchmark::State& state) {
  const std::string& name = module().identifiers.back();
  for (auto _ : state) {
    benchmark::DoNotOptimize(std::ranges::find_if(
        module().bindings, [&](const auto& binding) { return SRLIdentifierBytes(*binding.api) == name; }));
  }
}
void findByStringInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.back();
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
}

// With all checks of its binding, and in a scope that is new too.
constexpr std::size_t kFirst = 100;
void findFirst(benchmark::State& state) {
  SRLRegistry& before = registry();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    state.PauseTiming();
    Ref<SRLRegistry> asked = registryWith(module().data);
    SRLRegistry::setSharedInstance(asked);
    state.ResumeTiming();
    for (std::size_t i = 0; i < kFirst; ++i)
      benchmark::DoNotOptimize(asked->internalService(&module().apis.at(i), tags));
    state.PauseTiming();
    SRLRegistry::setSharedInstance(&before);
    asked = nullptr;
    state.ResumeTiming();
  }
}
// Step by step: the binding is looked for, its types are made and compared, and what has to be there
// afterwards is made: an implementation with a block, a scope, and an instance, with a lock for which others
// could wait meanwhile. (Ours makes no type for the API, and one such lock for all.)
void findFirstBare(benchmark::State& state) {
  struct Scope {
    rt::UnfairLock lock;
    std::unordered_map<const void*, Ref<rt::Object>> instances;
    std::unordered_map<const void*, std::unique_ptr<rt::UnfairLock>> pending;
  };
  struct Tables {
    rt::UnfairLock lock;
    rt::UnfairLock sharedLock;
    Ref<rt::Object> shared = rt::make<Service>();
    std::unordered_map<const void*, Ref<SRLImplementation>> implementations;
    std::unordered_map<SRLScopeTagSet, std::unique_ptr<Scope>, Floor::TagSetHash, Floor::TagSetEqual> scopes;
  };
  const auto bind = [](Tables& tables, const SRLAPIRegistrationData& api) {
    const rt::LockGuard guard(tables.lock);
    if (tables.implementations.find(&api) != tables.implementations.end()) return;
    const SRLImplementationRegistrationData* record = *bindingOf(api)->implementations;
    Ref<SRLImplementation> implementation = SRLImplementation::initWithIdentifier(
        record->identifier, SRLImplementationRegistrationDataInstanceType(record), record->lifetime,
        record->scopeType, [record](const SRLScopeTagSet& tags, bool*) { return record->factory(tags); },
        nullptr);
    if (SRLAPIRegistrationDataInstanceType(&api)->doesRepresentSupertypeOfClass(rt::classInfo<Service>()))
      tables.implementations.emplace(&api, std::move(implementation));
  };
  const auto openScope = [](Tables& tables, const SRLScopeTagSet& tags) {
    const Ref<rt::Object> shared = [&] {
      const rt::LockGuard guard(tables.sharedLock);
      return tables.shared;
    }();
    const rt::LockGuard guard(tables.lock);
    std::unique_ptr<Scope>& scope = tables.scopes[tags];
    if (scope == nullptr) scope = std::make_unique<Scope>();
    return scope.get();
  };
  const auto makeInstance = [](Scope& scope, const SRLImplementationRegistrationData& record,
                               const SRLScopeTagSet& tags) -> Ref<rt::Object> {
    auto pending = std::make_unique<rt::UnfairLock>();
    rt::UnfairLock& creation = *pending;
    {
      const rt::LockGuard guard(scope.lock);
      if (scope.instances.find(&record) != scope.instances.end()) return nullptr;
      scope.pending.emplace(&record, std::move(pending));
      creation.lock();
    }
    Ref<rt::Object> instance = record.factory(tags);
    const rt::LockGuard guard(scope.lock);
    scope.instances.emplace(&record, instance);
    creation.unlock();
    scope.pending.erase(&record);
    return instance;
  };
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    state.PauseTiming();
    auto tables = std::make_unique<Tables>();
    state.ResumeTiming();
    for (std::size_t i = 0; i < kFirst; ++i) {
      const SRLImplementationRegistrationData& record = module().implementations.at(i);
      bind(*tables, module().apis.at(i));
      benchmark::DoNotOptimize(record.lifetime != 0 ? record.factory(tags)
                                                    : makeInstance(*openScope(*tables, tags), record, tags));
    }
    state.PauseTiming();
    tables = nullptr;
    state.ResumeTiming();
  }
}
void findFirstInContainer(benchmark::State& state) {
  const Container::Tags tags = {"account"};
  for (auto _ : state) {
    state.PauseTiming();
    auto asked = std::make_unique<Container>();
    state.ResumeTiming();
    for (std::size_t i = 0; i < kFirst; ++i) {
      asked->bind(
          module().identifiers.at(i), [](const Container::Tags&) { return std::make_shared<int>(1); },
          i % 3 == 2);
      benchmark::DoNotOptimize(asked->find(module().identifiers.at(i), tags));
    }
    state.PauseTiming();
    asked = nullptr;
    state.ResumeTiming();
  }
}

// The same thousand APIs, all in one module or each in its own.
template <std::size_t count>
std::span<const SRLBindingsModuleData* const> modules() {
  static const auto data = [] {
    std::array<SRLBindingsModuleData, count> made;
    for (std::size_t i = 0; i < count; ++i) {
      made.at(i).bindingsBegin = &module().bindings.at(i * kAPIs / count);
      made.at(i).bindingsEnd = made.at(i).bindingsBegin + kAPIs / count;
    }
    return made;
  }();
  static const auto pointers = [] {
    std::array<const SRLBindingsModuleData*, count> made{};
    std::ranges::transform(data, made.begin(), [](const auto& each) { return &each; });
    return made;
  }();
  return pointers;
}
// A hundred programs are loaded: their registries know the modules. None of them ends, as that of a program
// does not while it runs.
template <auto start>
void startHundred(benchmark::State& state) {
  constexpr std::size_t kStarts = 100;
  std::vector<decltype(start())> started;
  started.reserve(kStarts);
  for (auto _ : state) {
    for (std::size_t i = 0; i < kStarts; ++i) started.push_back(start());
    state.PauseTiming();
    started.clear();
    state.ResumeTiming();
  }
}
template <std::size_t count>
Ref<SRLRegistry> start() {
  Ref<SRLRegistry> made = SRLRegistry::initPrivate();
  made->internalRegisterBindings(modules<count>());
  return made;
}
// A registry and its scope of configurations are each an object and what it knows, apart from each other.
struct BareRegistry {
  struct Tables {
    std::unordered_map<const void*, Ref<rt::Object>> implementations;
    std::unordered_map<const void*, Ref<rt::Object>> implementationsOfMany;
    std::unordered_map<SRLScopeTagSet, Ref<rt::Object>, Floor::TagSetHash, Floor::TagSetEqual> scopes;
    std::vector<const SRLBindingsModuleData*> modules;
    SRLConfigurationFactories configurations;
    rt::UnfairLock lock;
  };
  struct Scope {
    std::unordered_map<const void*, Ref<rt::Object>> instances;
    std::unordered_map<const void*, Ref<rt::Object>> pending;
    rt::UnfairLock lock;
  };

  Ref<rt::Object> object = rt::make<Service>();
  std::unique_ptr<Tables> tables = std::make_unique<Tables>();
  Ref<rt::Object> scopeObject = rt::make<Service>();
  std::unique_ptr<Scope> scope = std::make_unique<Scope>();
};
BareRegistry startBareWith(std::span<const SRLBindingsModuleData* const> modules) {
  BareRegistry made;
  for (const SRLBindingsModuleData* each : modules) {
    if (each->addConfigurationFactories != nullptr)
      each->addConfigurationFactories(made.tables->configurations);
  }
  made.tables->modules.assign(modules.begin(), modules.end());
  return made;
}
template <std::size_t count>
BareRegistry startBare() {
  return startBareWith(modules<count>());
}
// The container has to be told of each API.
std::unique_ptr<Container> startContainer() {
  auto made = std::make_unique<Container>();
  for (std::size_t i = 0; i < kAPIs; ++i) {
    made->bind(
        module().identifiers.at(i), [](const Container::Tags&) { return std::make_shared<int>(1); },
        i % 3 == 2);
  }
  return made;
}

// The same from the beginning: the class methods of a thousand modules are listed and called.
const SRLBindingsModuleData* bindings() {
  return modules<1>().front();
}
void discover(benchmark::State& state) {
  SRLRegistry& before = registry();
  for (auto _ : state) {
    SRLRegistry::setSharedInstance(SRLRegistry::initPrivate());
    SRLRegistry::initialize(rt::classInfo<SRLRegistry>());
  }
  if (rt::classMethods(rt::classInfo<SRLRegistry>()).size() != 1000)
    state.SkipWithError("methods are missing");
  SRLRegistry::setSharedInstance(&before);
}
// The methods are walked through in the order in which they are loaded (see below), put in order and called.
void discoverBare(benchmark::State& state) {
  const std::vector<rt::ClassMethod> methods = rt::classMethods(rt::classInfo<SRLRegistry>());
  std::forward_list<rt::ClassMethod> listed;
  auto last = listed.before_begin();
  for (const std::ptrdiff_t hundred : {7, 0, 3, 1, 8, 2, 9, 4, 6, 5}) {
    const auto first = methods.begin() + 100 * hundred;
    last = listed.insert_after(last, first, first + 100);
  }
  for (auto _ : state) {
    std::vector<rt::ClassMethod> sorted;
    for (const rt::ClassMethod& method : listed) sorted.push_back(method);
    std::ranges::sort(sorted, {}, &rt::ClassMethod::selector);
    std::vector<const SRLBindingsModuleData*> found;
    found.reserve(sorted.size());
    for (const rt::ClassMethod& method : sorted) {
      if (!method.selector().starts_with("srl_bindings")) continue;
      found.push_back(method.as<const SRLBindingsModuleData*()>()());
    }
    const BareRegistry made = startBareWith(found);
    benchmark::DoNotOptimize(made.tables->modules.data());
  }
}

BENCHMARK(findScoped)->Name("Registry/scoped/ours");
BENCHMARK(findScopedBare)->Name("Registry/scoped/bare");
BENCHMARK(findScopedInContainer)->Name("Registry/scoped/container");
const Bound scopedBare{"Registry/scoped", "bare", 1.2};
const Bound scopedContainer{"Registry/scoped", "container", 1.0};
BENCHMARK(findByTurns)->Name("Registry/scoped, of two by turns/ours");
BENCHMARK(findByTurnsBare)->Name("Registry/scoped, of two by turns/bare");
BENCHMARK(findByTurnsInContainer)->Name("Registry/scoped, of two by turns/container");
const Bound byTurnsBare{"Registry/scoped, of two by turns", "bare", 1.2};
const Bound byTurnsContainer{"Registry/scoped, of two by turns", "container", 1.0};
BENCHMARK(findFresh)->Name("Registry/fresh/ours");
BENCHMARK(findFreshBare)->Name("Registry/fresh/bare");
BENCHMARK(findFreshInContainer)->Name("Registry/fresh/container");
const Bound freshBare{"Registry/fresh", "bare", 1.2};
const Bound freshContainer{"Registry/fresh", "container", 1.0};
BENCHMARK(missOptional)->Name("Registry/miss/ours");
BENCHMARK(missBare)->Name("Registry/miss/bare");
BENCHMARK(missInContainer)->Name("Registry/miss/container");
const Bound missBound{"Registry/miss", "bare", 1.2};
const Bound missContainer{"Registry/miss", "container", 1.0};
BENCHMARK(findMany)->Name("Registry/eight/ours");
BENCHMARK(findManyBare)->Name("Registry/eight/bare");
BENCHMARK(findManyInContainer)->Name("Registry/eight/container");
const Bound eightBare{"Registry/eight", "bare", 1.2};
const Bound eightContainer{"Registry/eight", "container", 1.0};
BENCHMARK(findByString)->Name("Registry/by string, last of 1000/ours");
BENCHMARK(findByStringBare)->Name("Registry/by string, last of 1000/bare");
BENCHMARK(findByStringScanning)->Name("Registry/by string, last of 1000/scan");
BENCHMARK(findByStringInContainer)->Name("Registry/by string, last of 1000/container");
const Bound byStringBare{"Registry/by string, last of 1000", "bare", 1.2};
const Bound byStringContainer{"Registry/by string, last of 1000", "container", 1.0};
BENCHMARK(findFirst)->Name("Registry/first of 100 APIs/ours");
BENCHMARK(findFirstBare)->Name("Registry/first of 100 APIs/bare");
BENCHMARK(findFirstInContainer)->Name("Registry/first of 100 APIs/container");
const Bound firstBare{"Registry/first of 100 APIs", "bare", 1.2};
BENCHMARK(startHundred<start<1>>)->Name("Registry/100 starts with 1 module/ours");
BENCHMARK(startHundred<startBare<1>>)->Name("Registry/100 starts with 1 module/bare");
BENCHMARK(startHundred<startContainer>)->Name("Registry/100 starts with 1 module/container");
const Bound startOneBare{"Registry/100 starts with 1 module", "bare", 1.2};
const Bound startOneContainer{"Registry/100 starts with 1 module", "container", 1.0};
BENCHMARK(startHundred<start<1000>>)->Name("Registry/100 starts with 1000 modules/ours");
BENCHMARK(startHundred<startBare<1000>>)->Name("Registry/100 starts with 1000 modules/bare");
BENCHMARK(startHundred<startContainer>)->Name("Registry/100 starts with 1000 modules/container");
const Bound startManyBare{"Registry/100 starts with 1000 modules", "bare", 1.2};
const Bound startManyContainer{"Registry/100 starts with 1000 modules", "container", 1.0};
BENCHMARK(discover)->Name("Registry/discovery of 1000 modules/ours");
BENCHMARK(discoverBare)->Name("Registry/discovery of 1000 modules/bare");
const Bound discoveryBare{"Registry/discovery of 1000 modules", "bare", 1.2};

}  // namespace

#define METHOD(number) template struct rt::AddedClassMethod<SRLRegistry, "srl_bindings" #number, &bindings>;
#define TEN(number) \
  METHOD(number##0) \
  METHOD(number##1) \
  METHOD(number##2) \
  METHOD(number##3) \
  METHOD(number##4) METHOD(number##5) METHOD(number##6) METHOD(number##7) METHOD(number##8) METHOD(number##9)
#define HUNDRED(number) \
  TEN(number##0)        \
  TEN(number##1)        \
  TEN(number##2)        \
  TEN(number##3) TEN(number##4) TEN(number##5) TEN(number##6) TEN(number##7) TEN(number##8) TEN(number##9)
HUNDRED(7) HUNDRED(0) HUNDRED(3) HUNDRED(1) HUNDRED(8) HUNDRED(2) HUNDRED(9) HUNDRED(4) HUNDRED(6) HUNDRED(5)
