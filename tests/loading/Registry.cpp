#include "Registry.h"

#include <string_view>

#include "Runtime/Objects/ClassMethod.h"
#include "Runtime/Objects/LoadHook.h"

namespace {

// The hook runs before static objects are constructed, so these variables need constant initialisation.
constinit char seen[256] = "";
constinit int runs = 0;

}  // namespace

Registry::~Registry() = default;

std::string Registry::look() {
  std::string text;
  for (const rt::ClassMethod& method : rt::classMethods(rt::classInfo<Registry>())) {
    auto* const function = method.as<int()>();
    text += method.selector();
    text += ':' + (function != nullptr ? std::to_string(function()) : "?") + ' ';
  }
  for (const std::string_view name : {"A", "B", "C", "D"}) {
    if (rt::classNamed(name) != nullptr) text += std::string(name) + ' ';
  }
  return text;
}

void Registry::load() {
  ++runs;
  look().copy(seen, sizeof seen - 1);
}

const char* Registry::seenByHook() {
  return seen;
}

int Registry::hookRuns() {
  return runs;
}

template struct rt::LoadHook<Registry>;
