// Compares requests for services with the necessary steps of a look-up ("bare"), and with a container as a
// user would write it.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Comparison.h"
#include "RegistryBenchmark.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Set.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "Shared/ServiceRegistry/Source/Private/SRLTable.h"

namespace {

const SecondThread secondThread;

using namespace RegistryBenchmark;
using rt::Ref;

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

// The registry of the cases. All of its APIs have been requested before.
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

// The tag of a request. It equals the scope's tag but is another object.
const Ref<rt::Object>& account() {
  static const Ref<rt::Object> tag = rt::String::fromUTF8("account").object();
  return tag;
}

// The locks, tables and reference counts of a look-up, without any other work.
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
  std::unordered_map<SRLScopeTagSet, Ref<rt::Object>, TagSetHash, TagSetEqual> scopes;
};

// The least that a request can do: one lock, the same tables and reference counts, and no check but that the
// tags fit. The lock is of the kind that every request needs: a fork waits for its holder, so that the child
// finds whole tables. Each step uses the result of the step before it: the implementation of an API knows the
// identifier of the instance in its scope. An API that is not bound is looked for among those known to have
// no binding.
struct Least {
  struct Implementation final : rt::Implements<Implementation, rt::Object> {
    explicit Implementation(const SRLImplementationRegistrationData& theRecord) : record(theRecord) {}
    const SRLImplementationRegistrationData& record;
  };

  Least() {
    for (std::size_t i = 0; i < kAPIs; ++i) {
      const SRLImplementationRegistrationData& record = module().implementations.at(i);
      implementations.insert(&module().apis.at(i), rt::make<Implementation>(record));
      scope->instanceForIdentifier(&record, nullptr, [] { return rt::make<Service>(); });
    }
    unknown.insert(&kUnknown, true);
  }

  [[gnu::noinline]] Ref<rt::Object> keptInstance(const SRLAPIRegistrationData* api,
                                                 const SRLScopeTagSet& tags) {
    const rt::LockGuard guard(lock);
    if (const auto* bound = implementations.find(api)) return keptInstance(bound->second->record, tags);
    benchmark::DoNotOptimize(unknown.find(api));
    return nullptr;
  }
  [[gnu::always_inline]] Ref<rt::Object> keptInstance(const SRLImplementationRegistrationData& record,
                                                      const SRLScopeTagSet& tags) {
    Ref<rt::Object> instance;
    if (SRLScopeTagSetDetail::hasOneTagForEachBit(tags, record.scopeType) &&
        SRLScopeTagSetEqual(scopeTags, tags))
      scope->findInstance(&record, instance);
    return instance;
  }
  [[gnu::noinline]] Ref<rt::Object> newInstance(const SRLAPIRegistrationData* api,
                                                const SRLScopeTagSet& tags) {
    const Ref<Implementation> implementation = [&]() -> Ref<Implementation> {
      const rt::LockGuard guard(lock);
      const auto* found = implementations.find(api);
      return found != nullptr ? found->second : nullptr;
    }();
    if (!implementation) return nullptr;
    const SRLImplementationRegistrationData& record = implementation->record;
    return record.factory(SRLScopeTagSetMaskingWithScopes(tags, record.scopeType, record.scopeType));
  }
  [[gnu::noinline]] Ref<rt::Array> keptInstances(const SRLAPIRegistrationData* api,
                                                 const SRLScopeTagSet& tags) {
    std::vector<Ref<rt::Object>> services;
    services.reserve(8);
    {
      const rt::LockGuard guard(lock);
      if (implementations.find(api) == nullptr) return nullptr;
      const Ref<rt::Set> bound = eight;
      for (const Ref<rt::Object>& implementation : *bound)
        services.push_back(keptInstance(static_cast<const Implementation&>(*implementation).record, tags));
    }
    return rt::make<rt::Array>(std::move(services));
  }

  rt::UnfairLock lock;
  const Ref<rt::Object> scopeTag = rt::String::fromUTF8("account").object();
  const SRLScopeTagSet scopeTags{{scopeTag.get()}};
  SRLTable<const void*, Ref<Implementation>> implementations;
  SRLTable<const void*, bool> unknown;
  const Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
  const Ref<rt::Set> eight = [] {
    rt::Set::Builder builder;
    for (std::size_t i = 0; i < 8; ++i)
      builder.add(rt::make<Implementation>(module().implementations.at(3 * i)));
    return std::move(builder).set();
  }();
};

Least& least() {
  static Least& least = *new Least();
  return least;
}

template <class Table, class Key>
[[gnu::always_inline]] inline Ref<rt::Object> lookUp(rt::UnfairLock& lock, const Table& table,
                                                     const Key& key) {
  const rt::LockGuard guard(lock);
  const auto found = table.find(key);
  return found != table.end() ? Ref<rt::Object>(found->second) : nullptr;
}

// Finds an existing instance in its scope of the shared registry.
[[gnu::always_inline]] inline Ref<rt::Object> keptInstance(Floor& floor, const SRLAPIRegistrationData& api,
                                                           const SRLScopeTagSet& tags) {
  const Ref<rt::Object> shared = [&] {
    const rt::LockGuard guard(floor.sharedLock);
    return floor.shared;
  }();
  const Ref<rt::Object> scope = lookUp(floor.lock, floor.scopes, tags);
  return lookUp(floor.scopeLock, floor.instances, &api);
}

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
void findScopedAtLeast(benchmark::State& state) {
  Least& asked = least();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) benchmark::DoNotOptimize(asked.keptInstance(scopedAPI(), tags));
}
void findScopedInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.at(0);
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
}

// Requests services of two accounts in turn, so that the scope always differs from the previous request's.
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
void findFreshAtLeast(benchmark::State& state) {
  Least& asked = least();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) benchmark::DoNotOptimize(asked.newInstance(freshAPI(), tags));
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
// Returns the module's binding of an API, or null if there is none.
const _SRLBindingRegistrationData* bindingOf(const SRLAPIRegistrationData& api) {
  const auto identifierOf = [](const auto& binding) { return SRLIdentifierBytes(*binding.api); };
  const auto* const found = std::ranges::lower_bound(module().bindings, std::string_view(api.identifier),
                                                     SRLIsIdentifierBefore, identifierOf);
  return found != module().bindings.end() && identifierOf(*found) == api.identifier ? &*found : nullptr;
}
// Searches the module's bindings each time, since the module may bind the API. Our registry does that once.
void missBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  for (auto _ : state) {
    const rt::LockGuard guard(floor.lock);
    const bool isKnown = floor.implementations.find(&kUnknown) != floor.implementations.end();
    benchmark::DoNotOptimize(isKnown || bindingOf(kUnknown) != nullptr);
  }
}
void missAtLeast(benchmark::State& state) {
  Least& asked = least();
  for (auto _ : state) benchmark::DoNotOptimize(asked.keptInstance(&kUnknown, {}));
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
void findManyAtLeast(benchmark::State& state) {
  Least& asked = least();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) benchmark::DoNotOptimize(asked.keptInstances(scopedAPI(), tags));
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

// Requests the last of a thousand APIs by its identifier. It has been requested before.
void findByString(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const rt::String name = rt::String::fromUTF8(module().identifiers.back());
  const auto tags = SRLScopeTagSetCodableWrapper::initWithTagSet({{account().get()}});
  for (auto _ : state) benchmark::DoNotOptimize(asked.eg_internalService(name, tags));
}
// Finds the identifier in a table too.
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
    // NOLINTNEXTLINE(performance-unnecessary-copy-initialization): user code may release the wrapper's tags
    const Ref<rt::Array> kept = tags;
    const Ref<rt::Object> implementation = lookUp(floor.lock, floor.implementations, api);
    benchmark::DoNotOptimize(keptInstance(floor, *api, {{kept->at(0)}}));
  }
}
// Compares the identifiers one after the other, as our first request does.
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

// First requests check their bindings, and the first of them creates its scope.
constexpr std::size_t kFirst = 100;
// Spreads the requests over all APIs.
constexpr std::size_t nthFirst(std::size_t i) {
  return i * (kAPIs / kFirst);
}
void findFirst(benchmark::State& state) {
  SRLRegistry& before = registry();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    state.PauseTiming();
    Ref<SRLRegistry> asked = registryWith(module().data);
    SRLRegistry::setSharedInstance(asked);
    state.ResumeTiming();
    for (std::size_t i = 0; i < kFirst; ++i)
      benchmark::DoNotOptimize(asked->internalService(&module().apis.at(nthFirst(i)), tags));
    state.PauseTiming();
    SRLRegistry::setSharedInstance(&before);
    asked = nullptr;
    state.ResumeTiming();
  }
}
// The steps of a first request. It finds the binding, and makes and compares its types. Then it makes an
// implementation with a block, a scope, and an instance, with a lock on which other threads could wait. Our
// registry makes no type for the API, and one such lock for all instances.
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
    std::unordered_map<SRLScopeTagSet, std::unique_ptr<Scope>, TagSetHash, TagSetEqual> scopes;
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
      const SRLImplementationRegistrationData& record = module().implementations.at(nthFirst(i));
      bind(*tables, module().apis.at(nthFirst(i)));
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
      const std::string& name = module().identifiers.at(nthFirst(i));
      asked->bind(
          name, [](const Container::Tags&) { return std::make_shared<int>(1); }, nthFirst(i) % 3 == 2);
      benchmark::DoNotOptimize(asked->find(name, tags));
    }
    state.PauseTiming();
    asked = nullptr;
    state.ResumeTiming();
  }
}

// Measures what a program without modules pays when it is loaded, and the destruction of a registry.
void discoverNone(benchmark::State& state) {
  const Ref<SRLRegistry> before = SRLRegistry::sharedInstance();
  for (auto _ : state) {
    SRLRegistry::setSharedInstance(SRLRegistry::initPrivate());
    SRLRegistry::initialize(rt::classInfo<SRLRegistry>());
  }
  SRLRegistry::setSharedInstance(before);
}

// A request does more than the least. A request may be for a new instance, for a subset of the tags or for a
// host's block. It may be measured, and it makes missing instances. The bounds leave room for that.
BENCHMARK(findScoped)->Name("Registry/scoped/ours");
BENCHMARK(findScopedBare)->Name("Registry/scoped/bare");
BENCHMARK(findScopedAtLeast)->Name("Registry/scoped/least");
BENCHMARK(findScopedInContainer)->Name("Registry/scoped/container");
const Bound scopedLeast{"Registry/scoped", "least", 2.0};
const Bound scopedBare{"Registry/scoped", "bare", 1.2};
const Bound scopedContainer{"Registry/scoped", "container", 1.0};
BENCHMARK(findByTurns)->Name("Registry/scoped, of two by turns/ours");
BENCHMARK(findByTurnsBare)->Name("Registry/scoped, of two by turns/bare");
BENCHMARK(findByTurnsInContainer)->Name("Registry/scoped, of two by turns/container");
const Bound byTurnsBare{"Registry/scoped, of two by turns", "bare", 1.2};
const Bound byTurnsContainer{"Registry/scoped, of two by turns", "container", 1.0};
BENCHMARK(findFresh)->Name("Registry/fresh/ours");
BENCHMARK(findFreshBare)->Name("Registry/fresh/bare");
BENCHMARK(findFreshAtLeast)->Name("Registry/fresh/least");
BENCHMARK(findFreshInContainer)->Name("Registry/fresh/container");
const Bound freshLeast{"Registry/fresh", "least", 1.4};
const Bound freshBare{"Registry/fresh", "bare", 1.2};
const Bound freshContainer{"Registry/fresh", "container", 1.0};
BENCHMARK(missOptional)->Name("Registry/miss/ours");
BENCHMARK(missBare)->Name("Registry/miss/bare");
BENCHMARK(missAtLeast)->Name("Registry/miss/least");
BENCHMARK(missInContainer)->Name("Registry/miss/container");
const Bound missLeast{"Registry/miss", "least", 1.8};
const Bound missBound{"Registry/miss", "bare", 1.2};
const Bound missContainer{"Registry/miss", "container", 1.0};
BENCHMARK(findMany)->Name("Registry/eight/ours");
BENCHMARK(findManyBare)->Name("Registry/eight/bare");
BENCHMARK(findManyAtLeast)->Name("Registry/eight/least");
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
BENCHMARK(discoverNone)->Name("Registry/discovery of no module/ours");

}  // namespace
