#include "Runtime/Defaults/Private/SystemDefaultsFolder.h"

#include <unistd.h>

#include <cstdlib>

namespace rt::detail {

std::string systemDefaultsFolder() {
  const char* const home = issetugid() == 0 ? std::getenv("HOME") : nullptr;
  if (home == nullptr || *home != '/') return "";
  return std::string(home) + "/Library/Application Support";
}

}  // namespace rt::detail
