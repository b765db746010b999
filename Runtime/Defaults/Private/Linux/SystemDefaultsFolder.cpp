#include "Runtime/Defaults/Private/SystemDefaultsFolder.h"

#include <cstdlib>

namespace rt::detail {

namespace {

// A relative path counts as missing: it would lead elsewhere from each folder.
std::string pathInEnvironment(const char* name) {
  const char* const value = secure_getenv(name);
  return value != nullptr && *value == '/' ? value : "";
}

}  // namespace

std::string systemDefaultsFolder() {
  std::string folder = pathInEnvironment("XDG_CONFIG_HOME");
  if (folder.empty()) {
    folder = pathInEnvironment("HOME");
    if (!folder.empty()) folder += "/.config";
  }
  return folder;
}

}  // namespace rt::detail
