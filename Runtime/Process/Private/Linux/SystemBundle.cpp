#include "Runtime/Process/Private/SystemBundle.h"

namespace rt::detail {

// Linux has no bundles.
String systemBundleIdentifier() {
  return nullptr;
}

}  // namespace rt::detail
