#pragma once

/// What a bindings module hands to the registry: its bindings, and what makes its configurations.
///
///     constexpr _SRLBindingRegistrationData bindings[] = {{&clockAPI, clocks}, {&weatherAPI, weathers}};
///     static_assert(SRLAreBindingsSorted(bindings));
///     constexpr SRLBindingsModuleData moduleData{
///         .bindingsBegin = std::begin(bindings), .bindingsEnd = std::end(bindings)};
///
///     const SRLBindingsModuleData* networkBindings() { return &moduleData; }
///     template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsNetwork", &networkBindings>;
///
/// The class method is what makes the registry know the module (SRLRegistry.h). The record is a constant of a
/// fixed layout that lives as long as the process.
///
/// Not for: people; what they write is turned into these.

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <unordered_map>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

/// For the addresses that stand for configurations, what makes them. A configuration is made once for each
/// registry.
using SRLConfigurationFactories = std::unordered_map<const void*, rt::Block<rt::Ref<rt::Object>()>>;

struct RT_VISIBLE SRLBindingsModuleData {
  /// The module's bindings, sorted by their APIs' identifiers: see SRLAreBindingsSorted.
  const _SRLBindingRegistrationData* bindingsBegin = nullptr;
  const _SRLBindingRegistrationData* bindingsEnd = nullptr;
  /// Adds the module's configurations to a table, which is empty; null where there are none. Called once,
  /// when the program is loaded.
  void (*addConfigurationFactories)(SRLConfigurationFactories& factories) = nullptr;
  /// The generator's own. The registry does not read it.
  std::uint8_t generatorFlag = 0;
  /// Whether the module may be one of several; any value but 0 says so.
  std::uint8_t allowsMultipleModules = 0;

  std::span<const _SRLBindingRegistrationData> bindings() const noexcept {
    return {bindingsBegin, bindingsEnd};
  }
};

// The layout is part of the interface.
static_assert(sizeof(SRLBindingsModuleData) == 32);
static_assert(offsetof(SRLBindingsModuleData, bindingsBegin) == 0);
static_assert(offsetof(SRLBindingsModuleData, bindingsEnd) == 8);
static_assert(offsetof(SRLBindingsModuleData, addConfigurationFactories) == 16);
static_assert(offsetof(SRLBindingsModuleData, generatorFlag) == 24);
static_assert(offsetof(SRLBindingsModuleData, allowsMultipleModules) == 25);

/// The order of a module's bindings: whether the identifier `first` comes before `second`. A shorter one
/// does; of equally long ones, the one whose bytes come first.
constexpr bool SRLIsIdentifierBefore(std::string_view first, std::string_view second) noexcept {
  return first.size() != second.size() ? first.size() < second.size() : first < second;
}

/// Whether a module's bindings are in order, each API once, and every API's identifier as long as it says.
/// For a static_assert beside the bindings, since the registry finds nothing reliably where this is false.
constexpr bool SRLAreBindingsSorted(std::span<const _SRLBindingRegistrationData> bindings) noexcept {
  std::string_view previous;
  for (const _SRLBindingRegistrationData& binding : bindings) {
    const std::string_view identifier = binding.api->identifier;
    if (binding.api->identifierLength != identifier.size()) return false;
    if (&binding != bindings.data() && !SRLIsIdentifierBefore(previous, identifier)) return false;
    previous = identifier;
  }
  return true;
}
