#include "Runtime/Process/SystemBundle.h"

// A host with an identifier defines this symbol.
extern "C" [[gnu::weak]] const char kMainBundleIdentifier[];

namespace rt::detail {

String systemBundleIdentifier() {
  // The volatile keeps compilers from assuming that the address of an array is never null.
  const char* volatile const identifier = kMainBundleIdentifier;
  return String::fromUTF8(identifier);
}

}  // namespace rt::detail
