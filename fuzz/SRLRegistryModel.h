#pragma once

// What registries do with records, in maps and without any care for time.

#include <cstddef>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "fuzz/SRLRegistryRecords.h"

using Reports = std::vector<std::string>;

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

/// The registries of one input, by the plainest means.
class Model {
 public:
  explicit Model(const Records& records) : registries(1), records_(records) {}

  void service(std::size_t i, API api, const Tags& tags, bool isRequired, Expected& expected);
  void services(std::size_t i, API api, const Tags& tags, Expected& expected);
  void has(std::size_t i, API api, Expected& expected);
  API apiCalled(std::size_t i, std::string_view identifier) const;
  /// Notes what an operation has made for a scope.
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
  /// Adds what the implementation gives; returns whether that is null.
  bool resolve(const ModelImplementation& implementation, const Tags& tags, Expected& expected);

  const Records& records_;
  // By implementation, the scope that an instance is to be kept in.
  std::map<std::size_t, Tags> pending_;
};
