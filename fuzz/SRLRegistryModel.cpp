#include "fuzz/SRLRegistryModel.h"

#include <algorithm>
#include <bit>
#include <utility>

void Model::service(std::size_t i, API api, const Tags& tags, bool isRequired, Expected& expected) {
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

void Model::services(std::size_t i, API api, const Tags& tags, Expected& expected) {
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

void Model::has(std::size_t i, API api, Expected& expected) {
  expected.answer = boundTo(registries[i], api, expected) != nullptr;
}

API Model::apiCalled(std::size_t i, std::string_view identifier) const {
  for (std::size_t j = 0; registries[i].isRegistered && j < records_.moduleCount; ++j) {
    for (const _SRLBindingRegistrationData& binding : records_.modules[j].bindings) {
      if (binding.api->identifier == identifier) return binding.api;
    }
  }
  return nullptr;
}

void Model::keep(const Made& each) {
  if (const auto scope = pending_.find(each.implementation); scope != pending_.end()) {
    registries[shared].scopes[scope->second][&records_.implementations[each.implementation]] = each.instance;
  }
}

std::size_t Model::countAlive() const {
  std::size_t count = 0;
  for (const ModelRegistry& registry : registries) {
    for (const auto& [tags, scope] : registry.scopes) {
      for (const auto& [record, instance] : scope) count += instance != nullptr ? 1 : 0;
    }
  }
  return count;
}

const ModelImplementation* Model::boundTo(ModelRegistry& registry, API api, Expected& expected) {
  if (!registry.singles.contains(api) && registersBindingsFor(registry, api, expected)) registry.singles[api];
  const auto found = registry.singles.find(api);
  return found != registry.singles.end() && found->second ? &*found->second : nullptr;
}

bool Model::registersBindingsFor(ModelRegistry& registry, API api, Expected& expected) {
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

const rt::ClassInfo* Model::typeCalled(const char* name, Expected& expected) {
  const rt::ClassInfo* type = classCalled(name);
  if (type == nullptr) expected.reports.emplace_back("SRLClassType's concreteClass must not be nil.");
  return type;
}

bool Model::fits(API api, const rt::ClassInfo& type, Expected& expected) {
  if (api->instanceTypeKind == SRLInstanceTypeKindFunction) return type.isSubclassOf(rt::classInfo<FuzzA>());
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

void Model::bind(ModelRegistry& registry, const _SRLBindingRegistrationData& binding, Expected& expected) {
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
      expected.reports.emplace_back("Cannot bind a implementation to APIs that require a superset of scopes");
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

bool Model::resolve(const ModelImplementation& implementation, const Tags& tags, Expected& expected) {
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
