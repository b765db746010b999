#pragma once

/// The record of a bindings module: its bindings and its configuration factories.
///
///     constexpr _SRLBindingRegistrationData bindings[] = {{&clockAPI, clocks}, {&weatherAPI, weathers}};
///     static_assert(SRLAreBindingsSorted(bindings));
///     constexpr SRLBindingsModuleData moduleData{
///         .bindingsBegin = std::begin(bindings), .bindingsEnd = std::end(bindings)};
///
///     const SRLBindingsModuleData* networkBindings() { return &moduleData; }
///     template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsNetwork", &networkBindings>;
///
/// The registry finds the module through the class method (SRLRegistry.h). The record is a constant with a
/// fixed layout. It must live as long as the process.
///
/// Not for: handwritten code. A generator writes these records.

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

/// The factory of each configuration. The key is the address that identifies the configuration. Each registry
/// makes a configuration once.
using SRLConfigurationFactories = std::unordered_map<const void*, rt::Block<rt::Ref<rt::Object>()>>;

struct RT_VISIBLE SRLBindingsModuleData {
  /// The module's bindings, sorted by their APIs' identifiers. SRLAreBindingsSorted checks the order.
  const _SRLBindingRegistrationData* bindingsBegin = nullptr;
  const _SRLBindingRegistrationData* bindingsEnd = nullptr;
  /// Adds the module's configuration factories to `factories`, which is empty. Null if the module has none.
  /// Called once, when the program is loaded.
  void (*addConfigurationFactories)(SRLConfigurationFactories& factories) = nullptr;
  /// Belongs to the generator. The registry does not read it.
  std::uint8_t generatorFlag = 0;
  /// Nonzero if the module may be one of several.
  std::uint8_t allowsMultipleModules = 0;

  std::span<const _SRLBindingRegistrationData> bindings() const noexcept {
    return {bindingsBegin, bindingsEnd};
  }
};

// Generated code relies on this layout.
static_assert(sizeof(SRLBindingsModuleData) == 32);
static_assert(offsetof(SRLBindingsModuleData, bindingsBegin) == 0);
static_assert(offsetof(SRLBindingsModuleData, bindingsEnd) == 8);
static_assert(offsetof(SRLBindingsModuleData, addConfigurationFactories) == 16);
static_assert(offsetof(SRLBindingsModuleData, generatorFlag) == 24);
static_assert(offsetof(SRLBindingsModuleData, allowsMultipleModules) == 25);

/// Returns whether a module's binding of the identifier `first` comes before that of `second`. A shorter
/// identifier comes first. Identifiers of equal length are in the order of their bytes.
constexpr bool SRLIsIdentifierBefore(std::string_view first, std::string_view second) noexcept {
  return first.size() != second.size() ? first.size() < second.size() : first < second;
}

/// Returns whether a module's bindings are sorted, each API occurs once, and each `identifierLength` is
/// right. Otherwise the registry may miss bindings. Assert this at compile time, beside the bindings.
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
