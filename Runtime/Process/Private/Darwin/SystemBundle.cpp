#include "Runtime/Process/Private/SystemBundle.h"

#include <CoreFoundation/CoreFoundation.h>

#include <array>

namespace rt::detail {

String systemBundleIdentifier() {
  const CFBundleRef bundle = CFBundleGetMainBundle();
  const CFStringRef identifier = bundle != nullptr ? CFBundleGetIdentifier(bundle) : nullptr;
  std::array<char, 1024> text{};
  if (identifier == nullptr ||
      CFStringGetCString(identifier, text.data(), text.size(), kCFStringEncodingUTF8) == 0) {
    return nullptr;
  }
  return String::fromUTF8(text.data());
}

}  // namespace rt::detail
