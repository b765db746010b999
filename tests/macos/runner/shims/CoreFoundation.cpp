#include "tests/macos/runner/Shims.h"

namespace {

constexpr char kMainBundle = 0;

// A program without a folder around it has a main bundle, which has no identifier.
const void* mainBundle() {
  return &kMainBundle;
}

const void* identifierOf(const void*) {
  return nullptr;
}

[[noreturn]] void refuseText() {
  refuse("a text of CoreFoundation is used, although no shim makes one");
}

}  // namespace

shims::Table shims::coreFoundation() {
  static const Shim table[] = {
      shim("CFBundleGetMainBundle", &mainBundle),
      shim("CFBundleGetIdentifier", &identifierOf),
      shim("CFStringGetCString", &refuseText),
  };
  return table;
}
