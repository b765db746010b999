#include "Runtime/Process/Private/SystemBundle.h"

// Defined by a host that has an identifier.
extern "C" [[gnu::weak]] const char kMainBundleIdentifier[];

namespace rt::detail {

String systemBundleIdentifier() {
  // Through a volatile, so that no compiler takes the address of an array for never null.
  const char* volatile const identifier = kMainBundleIdentifier;
  return String::fromUTF8(identifier);
}

}  // namespace rt::detail
