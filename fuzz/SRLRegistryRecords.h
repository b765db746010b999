#pragma once

// The records that a fuzzer's input describes, and what their factories make.

#include <fuzzer/FuzzedDataProvider.h>

#include <array>
#include <cstddef>
#include <string>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

using Tags = std::vector<std::string>;

// The types that records name.

struct FuzzP : rt::Protocol<FuzzP> {
 protected:
  ~FuzzP() = default;
};
class FuzzA : public rt::Implements<FuzzA, rt::Object, FuzzP> {};
class FuzzB final : public rt::Implements<FuzzB, FuzzA> {};
class FuzzC final : public rt::Implements<FuzzC, rt::Object> {};

// Returns the class above with this name, or null.
const rt::ClassInfo* classCalled(const char* name);

constexpr std::size_t kMostImplementations = 8;

// A call of a factory: its implementation and tags, and the instance that it made, which may be null.
struct Made {
  std::size_t implementation;
  Tags tags;
  rt::Object* instance;

  bool operator==(const Made& other) const {
    return implementation == other.implementation && tags == other.tags;
  }
};
// The calls of factories in order, since the vector was last cleared.
extern std::vector<Made> made;
extern std::size_t instancesAlive;
// For each implementation, whether its factory returns null.
extern std::array<bool, kMostImplementations> makesNull;

// The records that the input describes.
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
