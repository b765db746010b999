#include "fuzz/SRLRegistryRecords.h"

#include <algorithm>
#include <cstdint>
#include <string_view>
#include <utility>

#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"

using rt::Ref;

std::vector<Made> made;
std::size_t instancesAlive = 0;
std::array<bool, kMostImplementations> makesNull{};

namespace {

constexpr std::array<const char*, 4> kClassNames{"FuzzA", "FuzzB", "FuzzC", "Missing"};
constexpr std::array<const char*, 3> kProtocolNames{nullptr, "FuzzP", "Missing"};

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

}  // namespace

const rt::ClassInfo* classCalled(const char* name) {
  const std::array<const rt::ClassInfo*, 3> classes{&rt::classInfo<FuzzA>(), &rt::classInfo<FuzzB>(),
                                                    &rt::classInfo<FuzzC>()};
  for (const rt::ClassInfo* each : classes) {
    if (name != nullptr && each->name == name) return each;
  }
  return nullptr;
}

Records::Records(FuzzedDataProvider& data) {
  static constexpr std::array<const char*, 5> kIdentifiers{"", "a", "b", "ab", "ba"};
  const auto scope = [&data] {
    const unsigned bits = data.ConsumeIntegralInRange(0U, 31U);
    // The highest bit is used too.
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
    // Half of the implementations need only scopes of an API.
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
