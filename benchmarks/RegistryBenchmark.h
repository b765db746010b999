#pragma once

/// What the registry's benchmarks ask for, and the container that they compare it with.
///
/// Not for: anything but benchmarks.

#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"

namespace RegistryBenchmark {

/// What all services are.
class Service final : public rt::Implements<Service, rt::Object> {};

inline rt::Ref<rt::Object> makeService(SRLScopeTagSet /*tags*/) {
  return rt::make<Service>();
}

inline constexpr std::size_t kAPIs = 1000;
inline constexpr SRLAPIInstanceType kType{.names = {.protocolName = nullptr, .className = "Service"}};

/// A thousand APIs of one account's each, every third of which is made anew each time; and one for eight.
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

inline const Module& module() {
  static const Module module;
  return module;
}

/// For tables of the standard library whose keys are tags.
struct TagSetHash {
  std::size_t operator()(const SRLScopeTagSet& set) const { return SRLScopeTagSetHash(set); }
};
struct TagSetEqual {
  bool operator()(const SRLScopeTagSet& first, const SRLScopeTagSet& second) const {
    return SRLScopeTagSetEqual(first, second);
  }
};

/// The container of a user: services by name, instances by name in scopes by tags.
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

}  // namespace RegistryBenchmark
