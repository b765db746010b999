#pragma once

/// Provides a few services, their records as a generator writes them, and registries with these records.
///
///     const TestModule module({{&testClockAPI, testWallClocks}});
///     rt::Ref<SRLRegistry> registry = registryWith({&module});
///
/// Not for: anything but tests.

#include <algorithm>
#include <cstdint>
#include <initializer_list>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/ClassInfo.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLBindingsModuleData.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

struct TestClock : rt::Protocol<TestClock> {
 protected:
  ~TestClock() = default;
};
class TestWallClock final : public rt::Implements<TestWallClock, rt::Object, TestClock> {};
class TestSundial final : public rt::Implements<TestSundial, rt::Object, TestClock> {};
/// Does not conform to TestClock.
class TestStone final : public rt::Implements<TestStone, rt::Object> {};

template <class Service>
rt::Ref<rt::Object> makeTestService(SRLScopeTagSet) {
  return rt::make<Service>();
}

/// An API for a single implementation, with scopes 1 and 2.
inline constinit const SRLAPIRegistrationData testClockAPI{
    .identifier = "Clock",
    .instanceType = {.names = {.protocolName = "TestClock"}},
    .scopeType = 0b11,
    .identifierLength = 5,
};
/// An API for many implementations, without scopes.
inline constinit const SRLAPIRegistrationData testClocksAPI{
    .identifier = "Clocks",
    .instanceType = {.names = {.protocolName = "TestClock"}},
    .identifierLength = 6,
    .isMultibound = 1,
};

/// Returns the record of an implementation without scopes. Each request makes a new instance.
template <class Service>
constexpr SRLImplementationRegistrationData testImplementation(const char* name) {
  return {.identifier = name,
          .instanceType = {.className = name},
          .factory = makeTestService<Service>,
          .lifetime = 1};
}
inline constinit const auto testWallClock = testImplementation<TestWallClock>("TestWallClock");
inline constinit const auto testSundial = testImplementation<TestSundial>("TestSundial");
inline constinit const auto testStone = testImplementation<TestStone>("TestStone");

using TestImplementations = const SRLImplementationRegistrationData* const;
inline constinit TestImplementations testWallClocks[] = {&testWallClock, nullptr};
inline constinit TestImplementations testSundials[] = {&testSundial, nullptr};
inline constinit TestImplementations testBothClocks[] = {&testWallClock, &testSundial, nullptr};
inline constinit TestImplementations testNoClocks[] = {nullptr};

/// A module with the given bindings. The constructor sorts them.
class TestModule {
 public:
  explicit TestModule(std::vector<_SRLBindingRegistrationData> bindings,
                      void (*addConfigurationFactories)(SRLConfigurationFactories&) = nullptr,
                      std::uint8_t allowsMultipleModules = 0)
      : bindings_(std::move(bindings)) {
    std::ranges::sort(bindings_, SRLIsIdentifierBefore,
                      [](const auto& binding) { return std::string_view(binding.api->identifier); });
    data_ = {.bindingsBegin = bindings_.data(),
             .bindingsEnd = bindings_.data() + bindings_.size(),
             .addConfigurationFactories = addConfigurationFactories,
             .allowsMultipleModules = allowsMultipleModules};
  }
  TestModule(const TestModule&) = delete;
  TestModule& operator=(const TestModule&) = delete;

  const SRLBindingsModuleData* data() const { return &data_; }
  const std::vector<_SRLBindingRegistrationData>& bindings() const { return bindings_; }

 private:
  std::vector<_SRLBindingRegistrationData> bindings_;
  SRLBindingsModuleData data_;
};

/// Returns a registry that has registered these modules in order. The modules must outlive the registry.
inline rt::Ref<SRLRegistry> registryWith(std::initializer_list<const TestModule*> modules) {
  std::vector<const SRLBindingsModuleData*> datas;
  for (const TestModule* module : modules) datas.push_back(module->data());
  rt::Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  registry->internalRegisterBindings(datas);
  return registry;
}

/// Returns an implementation whose instances are of `type`, which may be null. It has its own factory.
inline rt::Ref<SRLImplementation> implementationOf(std::string_view identifier, rt::Ref<SRLInstanceType> type,
                                                   SRLScopeType scope = 0) {
  return SRLImplementation::initWithIdentifier(
      identifier, std::move(type), /*lifetime=*/1, scope,
      [](const SRLScopeTagSet&, bool*) -> rt::Ref<rt::Object> { return rt::make<TestWallClock>(); }, nullptr);
}

/// Returns an implementation whose instances are of the class `Service`.
template <class Service>
rt::Ref<SRLImplementation> implementationOf(std::string_view identifier, SRLScopeType scope = 0) {
  return implementationOf(identifier, SRLClassType::initWithClass(&rt::classInfo<Service>()), scope);
}

/// Returns the implementation that is bound to `api`, or null.
inline rt::Ref<SRLImplementation> boundTo(const SRLAPIRegistrationData& api,
                                          const rt::Ref<SRLRegistry>& registry) {
  const rt::LockGuard guard(*registry->lock());
  return registry->implementationForSingleBoundService(&api);
}

/// Returns how many implementations are bound to `api`, or -1 if the registry does not know it. Precondition:
/// `api` is for many implementations.
inline std::int64_t countBoundTo(const SRLAPIRegistrationData& api, const rt::Ref<SRLRegistry>& registry) {
  const rt::Ref<rt::Array> instances = registry->internalMultiBoundService(&api, {});
  return instances ? static_cast<std::int64_t>(instances->count()) : -1;
}
