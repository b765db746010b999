#pragma once

/// The services that the registry's benchmarks request, and a container to compare the registry with.
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
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

namespace RegistryBenchmark {

/// The class of all services.
class Service final : public rt::Implements<Service, rt::Object> {};

inline rt::Ref<rt::Object> makeService(SRLScopeTagSet /*tags*/) {
  return rt::make<Service>();
}

inline constexpr std::size_t kAPIs = 1000;
inline constexpr SRLAPIInstanceType kType{.names = {.protocolName = nullptr, .className = "Service"}};

/// A module with a thousand APIs in the scope of an account. Every third of them makes a new instance for
/// each request. One more API is bound to eight implementations.
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

/// The hash and equality of tag sets, for tables of the standard library.
struct TagSetHash {
  std::size_t operator()(const SRLScopeTagSet& set) const { return SRLScopeTagSetHash(set); }
};
struct TagSetEqual {
  bool operator()(const SRLScopeTagSet& first, const SRLScopeTagSet& second) const {
    return SRLScopeTagSetEqual(first, second);
  }
};

/// A container as a user would write it. It finds services by name, scopes by tags, and instances in a scope
/// by name.
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
    // Runs the factory without the lock, since it may request other services. If two threads make the same
    // instance, the first to store it wins.
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
