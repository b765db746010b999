// Opens the library in the first argument. Checks which classes and class methods are known before and after.
#include <dlfcn.h>

#include <cstdio>
#include <string>

#include "Registry.h"

namespace {

int fail(const char* what, const std::string& seen) {
  std::fprintf(stderr, "%s: %s\n", what, seen.c_str());
  return 1;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  const std::string before = "add_A:1 add_B:2 odd:? A B ";
  const std::string after = "add_A:1 add_B:2 add_D:4 odd:? A B D ";
  if (argumentCount != 2) return 1;
  if (Registry::seenByHook() != before) return fail("the hook saw", Registry::seenByHook());
  if (Registry::look() != before) return fail("known before opening", Registry::look());

  void* const plugin = dlopen(arguments[1], RTLD_NOW | RTLD_LOCAL);
  if (plugin == nullptr) return fail("not opened", dlerror());
  auto* const seenByPlugin = reinterpret_cast<const char* (*)()>(dlsym(plugin, "seenByPlugin"));
  if (seenByPlugin == nullptr) return fail("no such function", dlerror());
  if (seenByPlugin() != after) return fail("the plugin's hook saw", seenByPlugin());
  if (Registry::look() != after) return fail("known after opening", Registry::look());
  if (Registry::hookRuns() != 1)
    return fail("the first hook ran again", std::to_string(Registry::hookRuns()));
  return 0;
}
