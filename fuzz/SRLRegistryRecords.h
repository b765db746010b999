#pragma once

// Records for a registry as an input of the fuzzer has them, and what their factories make.

#include <fuzzer/FuzzedDataProvider.h>

#include <array>
#include <cstddef>
#include <string>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"

using Tags = std::vector<std::string>;

// The types that records name.

struct FuzzP : rt::Protocol<FuzzP> {
 protected:
  ~FuzzP() = default;
};
class FuzzA : public rt::Implements<FuzzA, rt::Object, FuzzP> {};
class FuzzB final : public rt::Implements<FuzzB, FuzzA> {};
class FuzzC final : public rt::Implements<FuzzC, rt::Object> {};

/// The class among these that is called `name`, or null.
const rt::ClassInfo* classCalled(const char* name);

constexpr std::size_t kMostImplementations = 8;

/// What a factory was asked for, and has made: null where it makes null.
struct Made {
  std::size_t implementation;
  Tags tags;
  rt::Object* instance;

  bool operator==(const Made& other) const {
    return implementation == other.implementation && tags == other.tags;
  }
};
/// In order, since whoever reads it cleared it.
extern std::vector<Made> made;
extern std::size_t instancesAlive;
/// By implementation.
extern std::array<bool, kMostImplementations> makesNull;

/// Records as the input has them.
struct Records {
  explicit Records(FuzzedDataProvider& data);

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
