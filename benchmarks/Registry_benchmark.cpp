// Services beside what a look-up is made of, and beside a container as a user would write it.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <thread>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Comparison.h"
#include "Runtime/Array.h"
#include "Runtime/Class.h"
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
    scopes.emplace(SRLScopeTagSet{{scopeTag.get()}}, rt::make<Service>());
  }

  const Ref<rt::Object> scopeTag = rt::String::fromUTF8("account").object();
  rt::UnfairLock lock;
  rt::UnfairLock sharedLock;
  rt::UnfairLock scopeLock;
  Ref<rt::Object> shared = rt::make<Service>();
  std::unordered_map<const void*, Ref<rt::Object>> implementations;
  std::unordered_map<SRLScopeTagSet, Ref<rt::Object>, SRLRegistryIvars::TagSetHash,
                     SRLRegistryIvars::TagSetEqual>
      scopes;
  std::unordered_map<const void*, Ref<rt::Object>> instances;
};

template <class Table, class Key>
[[gnu::always_inline]] inline Ref<rt::Object> lookUp(rt::UnfairLock& lock, const Table& table,
                                                     const Key& key) {
  const rt::LockGuard guard(lock);
  const auto found = table.find(key);
  return found != table.end() ? Ref<rt::Object>(found->second) : nullptr;
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
    const Ref<rt::Object> shared = [] {
      const rt::LockGuard guard(floor.sharedLock);
      return floor.shared;
    }();
    const Ref<rt::Object> scope = lookUp(floor.lock, floor.scopes, tags);
    benchmark::DoNotOptimize(lookUp(floor.scopeLock, floor.instances, scopedAPI()));
  }
}
void findScopedInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.at(0);
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
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
// A module may bind it, so it is looked for among the module's bindings.
const _SRLBindingRegistrationData* bindingOf(const SRLAPIRegistrationData& api) {
  const auto identifierOf = [](const auto& binding) { return SRLIdentifierBytes(*binding.api); };
  const auto* const found = std::ranges::lower_bound(module().bindings, std::string_view(api.identifier),
                                                     SRLIsIdentifierBefore, identifierOf);
  return found != module().bindings.end() && identifierOf(*found) == api.identifier ? &*found : nullptr;
}
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
    for (std::size_t i = 0; i < 8; ++i) {
      const Ref<rt::Object> scope = lookUp(floor.lock, floor.scopes, tags);
      services.push_back(lookUp(floor.scopeLock, floor.instances, &module().apis.at(3 * i)));
    }
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

// The last of a thousand.
void findByString(benchmark::State& state) {
  SRLRegistry& asked = registry();
  const rt::String name = rt::String::fromUTF8(module().identifiers.back());
  const auto tags = SRLScopeTagSetCodableWrapper::initWithTagSet({{account().get()}});
  for (auto _ : state) benchmark::DoNotOptimize(asked.eg_internalService(name, tags));
}

// Identifiers are looked through one after the other.
void findByStringBare(benchmark::State& state) {
  static Floor& floor = *new Floor();
  const std::string& name = module().identifiers.back();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    const rt::LockGuard guard(floor.sharedLock);
    const auto* const found = std::ranges::find_if(
        module().bindings, [&](const auto& binding) { return SRLIdentifierBytes(*binding.api) == name; });
    const Ref<rt::Object> implementation = lookUp(floor.lock, floor.implementations, found->api);
    const Ref<rt::Object> scope = lookUp(floor.lock, floor.scopes, tags);
    benchmark::DoNotOptimize(lookUp(floor.scopeLock, floor.instances, found->api));
  }
}
void findByStringInContainer(benchmark::State& state) {
  Container& asked = container();
  const std::string& name = module().identifiers.back();
  const Container::Tags tags = {"account"};
  for (auto _ : state) benchmark::DoNotOptimize(asked.find(name, tags));
}

// With all checks of its binding.
constexpr std::size_t kFirst = 100;
void findFirst(benchmark::State& state) {
  registry();
  const SRLScopeTagSet tags{{account().get()}};
  for (auto _ : state) {
    state.PauseTiming();
    Ref<SRLRegistry> asked = registryWith(module().data);
    state.ResumeTiming();
    for (std::size_t i = 0; i < kFirst; ++i)
      benchmark::DoNotOptimize(asked->internalService(&module().apis.at(i), tags));
    state.PauseTiming();
    asked = nullptr;
    state.ResumeTiming();
  }
}
// What has to be there after it: an implementation with its type and a block, in a table, and an instance.
void findFirstBare(benchmark::State& state) {
  rt::UnfairLock lock;
  for (auto _ : state) {
    state.PauseTiming();
    auto implementations = std::make_unique<std::unordered_map<const void*, Ref<rt::Object>>>();
    auto instances = std::make_unique<std::unordered_map<const void*, Ref<rt::Object>>>();
    state.ResumeTiming();
    for (std::size_t i = 0; i < kFirst; ++i) {
      const SRLAPIRegistrationData& api = module().apis.at(i);
      const rt::LockGuard guard(lock);
      const SRLImplementationRegistrationData* record = *bindingOf(api)->implementations;
      implementations->emplace(
          &api, SRLImplementation::initWithIdentifier(
                    record->identifier, SRLImplementationRegistrationDataInstanceType(record),
                    record->lifetime, record->scopeType,
                    [record](const SRLScopeTagSet& tags, bool*) { return record->factory(tags); }, nullptr));
      benchmark::DoNotOptimize(instances->emplace(record, record->factory({})));
    }
    state.PauseTiming();
    implementations = nullptr;
    instances = nullptr;
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

// A registry, and the modules that it is told of when a program is loaded, of a thousand APIs each.
void start(benchmark::State& state) {
  const std::vector<const SRLBindingsModuleData*> modules(static_cast<std::size_t>(state.range(0)),
                                                          &module().data);
  for (auto _ : state) {
    const Ref<SRLRegistry> made = SRLRegistry::initPrivate();
    made->internalRegisterBindings(modules);
    benchmark::DoNotOptimize(made);
  }
}

BENCHMARK(findScoped)->Name("Registry/scoped/ours");
BENCHMARK(findScopedBare)->Name("Registry/scoped/bare");
BENCHMARK(findScopedInContainer)->Name("Registry/scoped/container");
const Bound scopedBare{"Registry/scoped", "bare", 1.2};
const Bound scopedContainer{"Registry/scoped", "container", 1.0};
BENCHMARK(findFresh)->Name("Registry/fresh/ours");
BENCHMARK(findFreshBare)->Name("Registry/fresh/bare");
BENCHMARK(findFreshInContainer)->Name("Registry/fresh/container");
const Bound freshBare{"Registry/fresh", "bare", 1.2};
const Bound freshContainer{"Registry/fresh", "container", 1.0};
BENCHMARK(missOptional)->Name("Registry/miss/ours");
BENCHMARK(missBare)->Name("Registry/miss/bare");
BENCHMARK(missInContainer)->Name("Registry/miss/container");
const Bound missBound{"Registry/miss", "bare", 1.2};
BENCHMARK(findMany)->Name("Registry/eight/ours");
BENCHMARK(findManyBare)->Name("Registry/eight/bare");
BENCHMARK(findManyInContainer)->Name("Registry/eight/container");
const Bound eightBare{"Registry/eight", "bare", 1.2};
const Bound eightContainer{"Registry/eight", "container", 1.0};
BENCHMARK(findByString)->Name("Registry/by string, last of 1000/ours");
BENCHMARK(findByStringBare)->Name("Registry/by string, last of 1000/bare");
BENCHMARK(findByStringInContainer)->Name("Registry/by string, last of 1000/container");
const Bound byStringBare{"Registry/by string, last of 1000", "bare", 1.2};
BENCHMARK(findFirst)->Name("Registry/first of 100 APIs/ours");
BENCHMARK(findFirstBare)->Name("Registry/first of 100 APIs/bare");
BENCHMARK(findFirstInContainer)->Name("Registry/first of 100 APIs/container");
BENCHMARK(start)->Name("Registry/modules told of/ours")->Arg(1)->Arg(1000);

}  // namespace
