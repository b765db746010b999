// Measures what a program's registry costs until it is ready. Compares it with the necessary steps alone
// ("bare"), and with a container as a user would write it.

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <forward_list>
#include <memory>
#include <span>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Comparison.h"
#include "RegistryBenchmark.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace {

const SecondThread secondThread;

using namespace RegistryBenchmark;
using rt::Ref;

// The thousand APIs in `count` modules: all in one, or each in its own.
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
// Starts a hundred registries with the modules, as a hundred programs would. Their destruction is not
// measured, since a program's registry lives as long as the program.
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
// A registry and its scope of configurations. Each is an object and, allocated separately, its data.
struct BareRegistry {
  struct Tables {
    std::unordered_map<const void*, Ref<rt::Object>> implementations;
    std::unordered_map<const void*, Ref<rt::Object>> implementationsOfMany;
    std::unordered_map<SRLScopeTagSet, Ref<rt::Object>, TagSetHash, TagSetEqual> scopes;
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
// Each API must be bound in the container.
std::unique_ptr<Container> startContainer() {
  auto made = std::make_unique<Container>();
  for (std::size_t i = 0; i < kAPIs; ++i) {
    made->bind(
        module().identifiers.at(i), [](const Container::Tags&) { return std::make_shared<int>(1); },
        i % 3 == 2);
  }
  return made;
}

// Starts a registry from the beginning: lists and calls the class methods of a thousand modules.
const SRLBindingsModuleData* bindings() {
  return modules<1>().front();
}
void discover(benchmark::State& state) {
  const Ref<SRLRegistry> before = SRLRegistry::sharedInstance();
  for (auto _ : state) {
    SRLRegistry::setSharedInstance(SRLRegistry::initPrivate());
    SRLRegistry::initialize(rt::classInfo<SRLRegistry>());
  }
  if (rt::classMethods(rt::classInfo<SRLRegistry>()).size() != 1000)
    state.SkipWithError("methods are missing");
  SRLRegistry::setSharedInstance(before);
}
// Visits the methods in the order in which they are loaded (see below), sorts them and calls them.
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

BENCHMARK(startHundred<start<1>>)->Name("RegistryStart/100 starts with 1 module/ours");
BENCHMARK(startHundred<startBare<1>>)->Name("RegistryStart/100 starts with 1 module/bare");
BENCHMARK(startHundred<startContainer>)->Name("RegistryStart/100 starts with 1 module/container");
const Bound startOneBare{"RegistryStart/100 starts with 1 module", "bare", 1.2};
const Bound startOneContainer{"RegistryStart/100 starts with 1 module", "container", 1.0};
BENCHMARK(startHundred<start<1000>>)->Name("RegistryStart/100 starts with 1000 modules/ours");
BENCHMARK(startHundred<startBare<1000>>)->Name("RegistryStart/100 starts with 1000 modules/bare");
BENCHMARK(startHundred<startContainer>)->Name("RegistryStart/100 starts with 1000 modules/container");
const Bound startManyBare{"RegistryStart/100 starts with 1000 modules", "bare", 1.2};
const Bound startManyContainer{"RegistryStart/100 starts with 1000 modules", "container", 1.0};
BENCHMARK(discover)->Name("RegistryStart/discovery of 1000 modules/ours");
BENCHMARK(discoverBare)->Name("RegistryStart/discovery of 1000 modules/bare");
const Bound discoveryBare{"RegistryStart/discovery of 1000 modules", "bare", 1.2};

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
