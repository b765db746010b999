#pragma once

// A model of what registries do with records. It uses maps and ignores speed.

#include <cstddef>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"
#include "fuzz/SRLRegistryRecords.h"

using Reports = std::vector<std::string>;

// The effects of an operation according to the model.
struct Expected {
  Reports reports;
  std::vector<Made> made;
  // The instances that were found in scopes. Instances for which a factory returned null are left out.
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

  // Two implementations are equal if these values are.
  auto value() const {
    return std::tuple(std::string_view(record->identifier), type, record->lifetime + 0U, record->scopeType,
                      configuration, configuration != nullptr && record->isConfigurationRequired != 0);
  }
};

struct ModelRegistry {
  bool isRegistered = false;
  std::map<API, std::optional<ModelImplementation>> singles;
  // An API that was only asked for has no list.
  std::map<API, std::optional<std::vector<ModelImplementation>>> multis;
  Scopes scopes;
};

// The model of all registries of one input.
class Model {
 public:
  explicit Model(const Records& records) : registries(1), records_(records) {}

  void service(std::size_t i, API api, const Tags& tags, bool isRequired, Expected& expected);
  void services(std::size_t i, API api, const Tags& tags, Expected& expected);
  void has(std::size_t i, API api, Expected& expected);
  API apiCalled(std::size_t i, std::string_view identifier) const;
  // Stores an instance in the scope that it was made for.
  void keep(const Made& each);
  void forgetPending() { pending_.clear(); }

  std::size_t countAlive() const;

  std::vector<ModelRegistry> registries;
  std::size_t shared = 0;

 private:
  const ModelImplementation* boundTo(ModelRegistry& registry, API api, Expected& expected);
  bool registersBindingsFor(ModelRegistry& registry, API api, Expected& expected);
  static const rt::ClassInfo* typeCalled(const char* name, Expected& expected);
  static bool fits(API api, const rt::ClassInfo& type, Expected& expected);
  void bind(ModelRegistry& registry, const _SRLBindingRegistrationData& binding, Expected& expected);
  // Adds the instance of the implementation to `expected`. Returns whether the instance is null.
  bool resolve(const ModelImplementation& implementation, const Tags& tags, Expected& expected);

  const Records& records_;
  // For each implementation, the scope in which its next instance is stored.
  std::map<std::size_t, Tags> pending_;
};
