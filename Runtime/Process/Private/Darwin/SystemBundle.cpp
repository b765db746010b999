// The framework is loaded when somebody asks for the identifier. So a program that never asks, like the
// command with its raised privileges, loads no library but the system's.

#include "Runtime/Process/Private/SystemBundle.h"

#include <dlfcn.h>

#include <array>

namespace rt::detail {

namespace {

// What is used of CoreFoundation, as its documentation declares it.
using Bundle = struct OpaqueBundle*;
using BundleString = const struct OpaqueString*;
using GetMainBundle = Bundle();
using GetIdentifier = BundleString(Bundle);
using GetCString = unsigned char(BundleString, char* text, long size, std::uint32_t encoding);
constexpr std::uint32_t kUTF8 = 0x08000100;

template <class Function>
Function* functionOf(void* framework, const char* name) noexcept {
  return reinterpret_cast<Function*>(dlsym(framework, name));
}

}  // namespace

String systemBundleIdentifier() {
  // It stays loaded: the framework does not support being unloaded.
  void* const framework =
      dlopen("/System/Library/Frameworks/CoreFoundation.framework/CoreFoundation", RTLD_LAZY | RTLD_LOCAL);
  if (framework == nullptr) return nullptr;
  auto* const mainBundle = functionOf<GetMainBundle>(framework, "CFBundleGetMainBundle");
  auto* const identifierOf = functionOf<GetIdentifier>(framework, "CFBundleGetIdentifier");
  auto* const copyText = functionOf<GetCString>(framework, "CFStringGetCString");
  if (mainBundle == nullptr || identifierOf == nullptr || copyText == nullptr) return nullptr;
  const Bundle bundle = mainBundle();
  const BundleString identifier = bundle != nullptr ? identifierOf(bundle) : nullptr;
  std::array<char, 1024> text{};
  if (identifier == nullptr || copyText(identifier, text.data(), text.size(), kUTF8) == 0) return nullptr;
  return String::fromUTF8(text.data());
}

}  // namespace rt::detail
