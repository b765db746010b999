// Compares registries with a model made of maps, for any records and any order of requests. Both must give
// the same instances, from the same factories and tags, and the same reports. Nothing may live that no scope
// holds.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Set.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"
#include "tests/support/TestReports.h"

namespace {

using rt::Ref;
using Tags = std::vector<std::string>;
using Reports = std::vector<std::string>;

void require(bool condition) {
  if (!condition) std::abort();
}

// The types that records name.

struct FuzzP : rt::Protocol<FuzzP> {
 protected:
  ~FuzzP() = default;
};
class FuzzA : public rt::Implements<FuzzA, rt::Object, FuzzP> {};
class FuzzB final : public rt::Implements<FuzzB, FuzzA> {};
class FuzzC final : public rt::Implements<FuzzC, rt::Object> {};

constexpr std::array<const char*, 4> kClassNames{"FuzzA", "FuzzB", "FuzzC", "Missing"};
constexpr std::array<const char*, 3> kProtocolNames{nullptr, "FuzzP", "Missing"};

const rt::ClassInfo* classCalled(const char* name) {
  const std::array<const rt::ClassInfo*, 3> classes{&rt::classInfo<FuzzA>(), &rt::classInfo<FuzzB>(),
                                                    &rt::classInfo<FuzzC>()};
  for (const rt::ClassInfo* each : classes) {
    if (name != nullptr && each->name == name) return each;
  }
  return nullptr;
}

// What factories make, and a note of it.

constexpr std::size_t kMostImplementations = 8;

struct Made {
  std::size_t implementation;
  Tags tags;
  rt::Object* instance;

  bool operator==(const Made& other) const {
    return implementation == other.implementation && tags == other.tags;
  }
};
std::vector<Made> made;
std::size_t instancesAlive = 0;
std::array<bool, kMostImplementations> makesNull{};

class Instance final : public rt::Implements<Instance, rt::Object> {
 public:
  Instance() { ++instancesAlive; }
  ~Instance() override { --instancesAlive; }
};

template <std::size_t implementation>
Ref<rt::Object> make(SRLScopeTagSet set) {
  Tags tags;
  for (const Ref<rt::Object>& tag : SRLScopeTagSetToArray(set))
    tags.emplace_back(rt::String::from(tag.get()).view());
  Ref<rt::Object> instance;
  if (!makesNull[implementation]) instance = rt::make<Instance>();
  made.push_back({implementation, std::move(tags), instance.get()});
  return instance;
}
constexpr std::array<Ref<rt::Object> (*)(SRLScopeTagSet), kMostImplementations> kFactories{
    make<0>, make<1>, make<2>, make<3>, make<4>, make<5>, make<6>, make<7>};

Ref<SRLInstanceType> typeA(const SRLAPIRegistrationData*) {
  return SRLClassType::initWithClass(&rt::classInfo<FuzzA>());
}
Ref<SRLInstanceType> typeB(const SRLImplementationRegistrationData*) {
  return SRLClassType::initWithClass(&rt::classInfo<FuzzB>());
}

/// Records as the input has them.
struct Records {
  explicit Records(FuzzedDataProvider& data) {
    static constexpr std::array<const char*, 5> kIdentifiers{"", "a", "b", "ab", "ba"};
    const auto scope = [&data] {
      const unsigned bits = data.ConsumeIntegralInRange(0U, 31U);
      // Also the ends of the mask.
      return static_cast<SRLScopeType>((bits & 15U) | (bits & 16U ? 0x80000000U : 0U));
    };
    apis.resize(data.ConsumeIntegralInRange<std::size_t>(1, 5));
    for (SRLAPIRegistrationData& api : apis) {
      api.identifier = data.PickValueInArray(kIdentifiers);
      api.identifierLength = static_cast<std::uint16_t>(std::string_view(api.identifier).size());
      api.scopeType = scope();
      api.isMultibound = data.ConsumeBool() ? 1 : 0;
      if (data.ConsumeIntegralInRange(0, 7) == 0) {
        api.instanceTypeKind = SRLInstanceTypeKindFunction;
        api.instanceType.function = typeA;
      } else {
        api.instanceType.names.protocolName = data.PickValueInArray(kProtocolNames);
        if (data.ConsumeBool()) api.instanceType.names.className = data.PickValueInArray(kClassNames);
      }
    }
    implementations.resize(data.ConsumeIntegralInRange<std::size_t>(1, kMostImplementations));
    for (std::size_t i = 0; i < implementations.size(); ++i) {
      SRLImplementationRegistrationData& implementation = implementations[i];
      implementation.identifier = data.PickValueInArray(kIdentifiers);
      implementation.factory = kFactories[i];
      makesNull[i] = data.ConsumeIntegralInRange(0, 7) == 0;
      // Mostly a part of what an API has.
      implementation.scopeType = scope();
      if (data.ConsumeBool()) implementation.scopeType &= apis[i % apis.size()].scopeType;
      implementation.instanceTypeKind = data.ConsumeIntegralInRange(0U, 3U) & 3U;
      implementation.instanceType.className = data.PickValueInArray(kClassNames);
      if (implementation.instanceTypeKind == SRLInstanceTypeKindFunction)
        implementation.instanceType.function = typeB;
      implementation.lifetime = data.ConsumeBool() ? 1 : 0;
      implementation.hasConfiguration = data.ConsumeBool() ? 1 : 0;
      implementation.isConfigurationRequired = data.ConsumeBool() ? 1 : 0;
      implementation.configInstanceType.className = data.PickValueInArray(kClassNames);
    }
    moduleCount = data.ConsumeIntegralInRange<std::size_t>(0, modules.size());
    for (std::size_t i = 0; i < moduleCount; ++i) {
      Module& module = modules[i];
      for (const SRLAPIRegistrationData& api : apis) {
        if (!data.ConsumeBool() || std::ranges::any_of(module.bindings, [&](const auto& each) {
              return std::string_view(each.api->identifier) == api.identifier;
            }))
          continue;
        auto& list = module.lists.emplace_back();
        const auto count = data.ConsumeIntegralInRange<std::size_t>(0, 3);
        for (std::size_t j = 0; j < count; ++j) {
          list.push_back(
              &implementations[data.ConsumeIntegralInRange<std::size_t>(0, implementations.size() - 1)]);
        }
        list.push_back(nullptr);
        module.bindings.push_back({&api, list.data()});
      }
      std::ranges::sort(module.bindings, SRLIsIdentifierBefore,
                        [](const auto& each) { return std::string_view(each.api->identifier); });
      module.data.bindingsBegin = module.bindings.data();
      module.data.bindingsEnd = module.bindings.data() + module.bindings.size();
      datas.push_back(&module.data);
    }
  }

  struct Module {
    std::vector<std::vector<const SRLImplementationRegistrationData*>> lists;
    std::vector<_SRLBindingRegistrationData> bindings;
    SRLBindingsModuleData data;
  };
  std::vector<SRLAPIRegistrationData> apis;
  std::vector<SRLImplementationRegistrationData> implementations;
  std::array<Module, 3> modules;
  std::size_t moduleCount = 0;
  std::vector<const SRLBindingsModuleData*> datas;
};

/// What an operation does, by the model.
struct Expected {
  Reports reports;
  std::vector<Made> made;
  /// Of instances that scopes have: null where the factory gave none.
  std::vector<rt::Object*> kept;
  bool isNull = false;
  bool answer = false;
};

using API = const SRLAPIRegistrationData*;
using Record = const SRLImplementationRegistrationData*;
using Scopes = std::map<Tags, std::map<Record, rt::Object*>>;

struct ModelImplementation {
  Record record;
  SRLScopeType apiScope;
  const rt::ClassInfo* type;
  const rt::ClassInfo* configuration;

  /// What two implementations are equal by.
  auto value() const {
    return std::tuple(std::string_view(record->identifier), type, record->lifetime + 0U, record->scopeType,
                      configuration, configuration != nullptr && record->isConfigurationRequired != 0);
  }
};

struct ModelRegistry {
  bool isRegistered = false;
  std::map<API, std::optional<ModelImplementation>> singles;
  /// Of one that was only asked for, there is no list.
  std::map<API, std::optional<std::vector<ModelImplementation>>> multis;
  Scopes scopes;
};

class Model {
 public:
  explicit Model(const Records& records) : records_(records), registries(1) {}

  void service(std::size_t i, API api, const Tags& tags, bool isRequired, Expected& expected) {
    ModelRegistry& registry = registries[i];
    const ModelImplementation* implementation = boundTo(registry, api, expected);
    if (implementation == nullptr) {
      expected.isNull = true;
      if (!isRequired) return;
      expected.reports.emplace_back(registry.isRegistered
                                        ? "No binding was found for required, single-bound service: %@"
                                        : "A service injector was called prior to service bindings");
      return;
    }
    expected.isNull = resolve(*implementation, tags, expected);
    if (isRequired && expected.isNull)
      expected.reports.emplace_back("Implementation of %@, bound to required service %@");
  }

  void services(std::size_t i, API api, const Tags& tags, Expected& expected) {
    ModelRegistry& registry = registries[i];
    if (!registry.multis.contains(api) && registersBindingsFor(registry, api, expected)) registry.multis[api];
    const auto found = registry.multis.find(api);
    expected.isNull = found == registry.multis.end() || !found->second;
    if (expected.isNull) return;
    for (const ModelImplementation& each : *found->second) {
      if (resolve(each, tags, expected))
        expected.reports.emplace_back("Implementation of %@, bound to multi-bound service %@");
    }
  }

  void has(std::size_t i, API api, Expected& expected) {
    expected.answer = boundTo(registries[i], api, expected) != nullptr;
  }

  API apiCalled(std::size_t i, std::string_view identifier) const {
    for (std::size_t j = 0; registries[i].isRegistered && j < records_.moduleCount; ++j) {
      for (const _SRLBindingRegistrationData& binding : records_.modules[j].bindings) {
        if (binding.api->identifier == identifier) return binding.api;
      }
    }
    return nullptr;
  }

  /// Notes what an operation has made for a scope.
  void keep(const Made& each) {
    if (const auto scope = pending_.find(each.implementation); scope != pending_.end()) {
      registries[shared].scopes[scope->second][&records_.implementations[each.implementation]] =
          each.instance;
    }
  }
  void forgetPending() { pending_.clear(); }

  std::size_t countAlive() const {
    std::size_t count = 0;
    for (const ModelRegistry& registry : registries) {
      for (const auto& [tags, scope] : registry.scopes) {
        for (const auto& [record, instance] : scope) count += instance != nullptr ? 1 : 0;
      }
    }
    return count;
  }

 private:
  const Records& records_;
  // By implementation, the scope that an instance is to be kept in.
  std::map<std::size_t, Tags> pending_;

 public:
  std::vector<ModelRegistry> registries;
  std::size_t shared = 0;

 private:
  const ModelImplementation* boundTo(ModelRegistry& registry, API api, Expected& expected) {
    if (!registry.singles.contains(api) && registersBindingsFor(registry, api, expected))
      registry.singles[api];
    const auto found = registry.singles.find(api);
    return found != registry.singles.end() && found->second ? &*found->second : nullptr;
  }

  bool registersBindingsFor(ModelRegistry& registry, API api, Expected& expected) {
    bool isKnown = false;
    for (std::size_t i = 0; registry.isRegistered && i < records_.moduleCount; ++i) {
      for (const _SRLBindingRegistrationData& binding : records_.modules[i].bindings) {
        if (std::string_view(binding.api->identifier) != api->identifier) continue;
        isKnown = true;
        bind(registry, binding, expected);
      }
    }
    return isKnown;
  }

  static const rt::ClassInfo* typeCalled(const char* name, Expected& expected) {
    const rt::ClassInfo* type = classCalled(name);
    if (type == nullptr) expected.reports.emplace_back("SRLClassType's concreteClass must not be nil.");
    return type;
  }

  static bool fits(API api, const rt::ClassInfo& type, Expected& expected) {
    if (api->instanceTypeKind == SRLInstanceTypeKindFunction)
      return type.isSubclassOf(rt::classInfo<FuzzA>());
    const auto& names = api->instanceType.names;
    const bool hasProtocol = names.protocolName != nullptr && std::string_view(names.protocolName) == "FuzzP";
    const rt::ClassInfo* superclass = classCalled(names.className);
    if (!hasProtocol && superclass == nullptr) {
      expected.reports.emplace_back("Either instanceClass or instanceProtocol must be provided.");
      return false;
    }
    return (!hasProtocol || type.conformsTo(rt::protocolInfo<FuzzP>())) &&
           (superclass == nullptr || type.isSubclassOf(*superclass));
  }

  void bind(ModelRegistry& registry, const _SRLBindingRegistrationData& binding, Expected& expected) {
    API api = binding.api;
    if (*binding.implementations == nullptr) {
      if (api->isMultibound == 0) {
        registry.singles[api] = std::nullopt;
      } else if (auto& all = registry.multis[api]; !all) {
        all.emplace();
      }
    }
    for (const auto* next = binding.implementations; *next != nullptr; ++next) {
      const Record record = *next;
      ModelImplementation implementation{record, api->scopeType, nullptr, nullptr};
      if (record->hasConfiguration != 0) {
        implementation.configuration = typeCalled(record->configInstanceType.className, expected);
        if (implementation.configuration == nullptr)
          expected.reports.emplace_back("SRLImplementationConfiguration requires a non-nil instanceType.");
      }
      if (record->instanceTypeKind == SRLInstanceTypeKindFunction) {
        implementation.type = &rt::classInfo<FuzzB>();
      } else if (record->instanceTypeKind != SRLInstanceTypeKindNone) {
        implementation.type = typeCalled(record->instanceType.className, expected);
      }
      if (implementation.type != nullptr && !fits(api, *implementation.type, expected)) {
        expected.reports.emplace_back("Implementation %@ should conform to %@");
      } else if ((record->scopeType & ~api->scopeType) != 0) {
        expected.reports.emplace_back(
            "Cannot bind a implementation to APIs that require a superset of scopes");
      } else if (api->isMultibound != 0) {
        auto& all = registry.multis[api];
        if (!all) all.emplace();
        if (std::ranges::none_of(*all,
                                 [&](const auto& each) { return each.value() == implementation.value(); })) {
          all->push_back(implementation);
        }
      } else if (auto& bound = registry.singles[api]; bound) {
        expected.reports.emplace_back("Service API is already registered\nService API: %@");
      } else {
        bound = implementation;
      }
    }
  }

  /// Adds what the implementation gives; returns whether that is null.
  bool resolve(const ModelImplementation& implementation, const Tags& tags, Expected& expected) {
    const Record record = implementation.record;
    Tags masked;
    if (tags.size() != static_cast<std::size_t>(std::popcount(implementation.apiScope))) {
      expected.reports.emplace_back("The tag set must contain all API scope tags.");
    } else {
      std::size_t index = 0;
      for (unsigned bit = 0; bit < 32; ++bit) {
        if (((implementation.apiScope >> bit) & 1U) == 0) continue;
        if (((record->scopeType >> bit) & 1U) != 0) masked.push_back(tags[index]);
        ++index;
      }
    }
    const auto number = static_cast<std::size_t>(record - records_.implementations.data());
    if (record->lifetime == 0) {
      auto& scope = registries[shared].scopes[masked];
      if (const auto known = scope.find(record); known != scope.end()) {
        if (known->second != nullptr) expected.kept.push_back(known->second);
        return known->second == nullptr;
      }
      pending_[number] = masked;
    }
    expected.made.push_back({number, std::move(masked), nullptr});
    return makesNull[number];
  }
};

/// An input's operations, on registries and on the model.
class Session {
 public:
  explicit Session(FuzzedDataProvider& data) : data_(data), records_(data), model_(records_) {
    registries_.push_back(SRLRegistry::initPrivate());
    registries_[0]->internalRegisterBindings(records_.datas);
    model_.registries[0].isRegistered = true;
    before_ = SRLRegistry::setSharedInstance(registries_[0]);
    reports_.messages();
  }
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;
  ~Session() {
    SRLRegistry::setSharedInstance(before_);
    registries_.clear();
    require(instancesAlive == 0);
  }

  void run() {
    for (int i = 0; i < 80 && data_.remaining_bytes() > 0; ++i) step();
  }

 private:
  void step() {
    const std::size_t at = data_.ConsumeIntegralInRange<std::size_t>(0, registries_.size() - 1);
    const Ref<SRLRegistry>& registry = registries_[at];
    API api = &records_.apis[data_.ConsumeIntegralInRange<std::size_t>(0, records_.apis.size() - 1)];
    const rt::String identifier = rt::String::fromUTF8(api->identifier);
    Expected expected;
    switch (data_.ConsumeIntegralInRange(0, 15)) {
      case 0:
      case 1:
      case 2: {
        const Tags tags = someTags(*api);
        model_.service(at, api, tags, true, expected);
        return check(expected, registry->internalService(api, TagSet(tags).set));
      }
      case 3: {
        const Tags tags = someTags(*api);
        model_.service(at, api, tags, false, expected);
        return check(expected, registry->internalOptionalService(api, TagSet(tags).set));
      }
      case 4:
      case 5: {
        const Tags tags = someTags(*api);
        model_.services(at, api, tags, expected);
        return check(expected, registry->internalMultiBoundService(api, TagSet(tags).set));
      }
      case 6:
        model_.has(at, api, expected);
        return check(expected, registry->internalHasImplementationForService(api));
      case 7: {
        const std::string tag(1, data_.PickValueInArray({'s', 't', 'u'}));
        for (auto scope = model_.registries[at].scopes.begin();
             scope != model_.registries[at].scopes.end();) {
          const bool ends = std::ranges::find(scope->first, tag) != scope->first.end();
          scope = ends ? model_.registries[at].scopes.erase(scope) : std::next(scope);
        }
        registry->removeScopesWithTag(rt::String::fromUTF8(tag));
        return check(expected);
      }
      case 8: {
        const Tags tags = someTags(*api);
        const bool isRequired = data_.ConsumeBool();
        const Ref<SRLScopeTagSetCodableWrapper> wrapper = wrapperOf(tags, expected);
        API found = model_.apiCalled(at, identifier);
        if (!wrapper) {
          expected.isNull = true;
        } else if (found == nullptr) {
          expected.isNull = true;
          if (isRequired) expected.reports.emplace_back("Unknown API %@");
        } else {
          model_.service(at, found, fitting(tags, expected), isRequired, expected);
        }
        return check(expected, isRequired ? registry->eg_internalService(identifier, wrapper)
                                          : registry->eg_internalOptionalService(identifier, wrapper));
      }
      case 9: {
        const Tags tags = someTags(*api);
        const Ref<SRLScopeTagSetCodableWrapper> wrapper = wrapperOf(tags, expected);
        API found = model_.apiCalled(at, identifier);
        expected.isNull = !wrapper;
        if (wrapper && found != nullptr) model_.services(at, found, fitting(tags, expected), expected);
        return check(expected, registry->eg_internalMultiBoundService(identifier, wrapper));
      }
      case 10:
        if (API found = model_.apiCalled(at, identifier); found != nullptr) {
          model_.has(at, found, expected);
        } else {
          expected.reports.emplace_back("Unknown API %@");
        }
        return check(expected, registry->eg_internalHasImplementationForService(identifier));
      case 11: {
        if (registries_.size() >= 4) return;
        ModelRegistry copy = model_.registries[at];
        copy.scopes.clear();
        model_.registries.push_back(std::move(copy));
        registries_.push_back(registry->mutableCopy());
        return check(expected);
      }
      case 12:
        if (registries_.size() >= 4) return;
        model_.registries.emplace_back();
        registries_.push_back(SRLRegistry::initPrivate());
        return check(expected);
      case 13:
        if (model_.registries[at].isRegistered) return;
        model_.registries[at].isRegistered = true;
        registry->internalRegisterBindings(records_.datas);
        return check(expected);
      case 14:
        model_.shared = at;
        SRLRegistry::setSharedInstance(registry);
        return check(expected);
      default: {
        const Tags tags = someTags(*api);
        const auto& scope = model_.registries[at].scopes[tags];
        std::vector<rt::Object*> kept;
        for (const auto& [record, instance] : scope) {
          if (instance != nullptr) kept.push_back(instance);
        }
        require(sorted(registry->scopeWithTags(TagSet(tags).set)->instances()) == sorted(kept));
        return check(expected);
      }
    }
  }

  /// Tags, which are compared by their values, as objects of their own.
  struct TagSet {
    explicit TagSet(const Tags& tags) {
      for (std::size_t i = 0; i < tags.size(); ++i) {
        objects.at(i) = rt::String::fromUTF8(tags[i]);
        set.tags.at(i) = objects.at(i).get();
      }
    }
    std::array<Ref<rt::Object>, SRLScopeTagSet::kCapacity> objects;
    SRLScopeTagSet set;
  };

  /// Mostly as many as the API wants, of three values.
  Tags someTags(const SRLAPIRegistrationData& api) {
    auto count = static_cast<std::size_t>(std::popcount(api.scopeType));
    if (count > 4 || data_.ConsumeIntegralInRange(0, 7) == 0)
      count = data_.ConsumeIntegralInRange<std::size_t>(0, 4);
    Tags tags;
    for (std::size_t i = 0; i < count; ++i) tags.emplace_back(1, data_.PickValueInArray({'s', 't', 'u'}));
    return tags;
  }

  /// Null now and then, and then with one tag too many, which `fitting` knows.
  Ref<SRLScopeTagSetCodableWrapper> wrapperOf(const Tags& tags, Expected& expected) {
    const int kind = data_.ConsumeIntegralInRange(0, 15);
    isTooLong_ = kind == 1;
    if (kind == 0) {
      expected.reports.emplace_back("Missing tag set for service:\n%@.");
      return nullptr;
    }
    std::vector<Ref<rt::Object>> objects;
    for (const std::string& tag : tags) objects.emplace_back(rt::String::fromUTF8(tag));
    while (isTooLong_ && objects.size() < 5) objects.emplace_back(rt::String::fromUTF8("t"));
    return SRLScopeTagSetCodableWrapper::initWithTags(rt::make<rt::Array>(std::move(objects)));
  }
  Tags fitting(const Tags& tags, Expected& expected) const {
    if (!isTooLong_) return tags;
    expected.reports.emplace_back("SRLScopeTagSet only supports up to %@ tags");
    return {};
  }

  static std::vector<rt::Object*> sorted(std::vector<rt::Object*> instances) {
    std::ranges::sort(instances);
    return instances;
  }
  static std::vector<rt::Object*> sorted(const Ref<rt::Array>& array) {
    std::vector<rt::Object*> instances;
    // A null that a factory gave is in a scope, too.
    for (const Ref<rt::Object>& each : *array) {
      if (each) instances.push_back(each.get());
    }
    return sorted(std::move(instances));
  }

  /// That it was done as the model says, in any order of implementations; notes what was made.
  std::vector<rt::Object*> checkDone(const Expected& expected) {
    Reports texts;
    for (const Ref<LUMLogMessage>& message : reports_.messages()) {
      require(message->level() == LUMLogLevelFault);
      texts.emplace_back(message->format().view().substr(0, kPrefix));
    }
    Reports wanted;
    for (const std::string& text : expected.reports) wanted.push_back(text.substr(0, kPrefix));
    std::ranges::sort(texts);
    std::ranges::sort(wanted);
    require(texts == wanted);
    require(std::ranges::is_permutation(made, expected.made));
    std::vector<rt::Object*> instances = expected.kept;
    for (const Made& each : made) {
      model_.keep(each);
      if (each.instance != nullptr) instances.push_back(each.instance);
    }
    model_.forgetPending();
    made.clear();
    return instances;
  }
  void check(const Expected& expected, Ref<rt::Object> result) {
    const std::vector<rt::Object*> instances = checkDone(expected);
    require(expected.isNull == !result);
    require(expected.isNull ? instances.empty() : instances == std::vector{result.get()});
    result = nullptr;
    require(instancesAlive == model_.countAlive());
  }
  void check(const Expected& expected, Ref<rt::Array> result) {
    const std::vector<rt::Object*> instances = checkDone(expected);
    require(expected.isNull == !result);
    if (result) require(sorted(result) == sorted(instances));
    result = nullptr;
    require(instancesAlive == model_.countAlive());
  }
  void check(const Expected& expected, bool result) {
    require(checkDone(expected).empty() && result == expected.answer);
  }
  void check(const Expected& expected) {
    require(checkDone(expected).empty() && instancesAlive == model_.countAlive());
  }

  // What tells the reports apart.
  static constexpr std::size_t kPrefix = 40;

  static TestReports& reports() {
    static TestReports reports;
    return reports;
  }

  FuzzedDataProvider& data_;
  TestReports& reports_ = reports();
  const Records records_;
  Model model_;
  std::vector<Ref<SRLRegistry>> registries_;
  Ref<SRLRegistry> before_;
  bool isTooLong_ = false;
};

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  LUMLogMultiplexer::sharedInstance()->setCaptureCallStack(false);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  made.clear();
  FuzzedDataProvider data(bytes, size);
  Session(data).run();
  return 0;
}
