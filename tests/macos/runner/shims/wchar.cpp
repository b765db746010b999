#include <cwchar>

#include "tests/macos/runner/Shims.h"

namespace {

// Compilers disagree on the types of these functions.
const wchar_t* find(const wchar_t* text, const wchar_t* part) {
  return std::wcsstr(text, part);
}

const wchar_t* findCharacter(const wchar_t* text, wchar_t character, std::size_t size) {
  return std::wmemchr(text, character, size);
}

}  // namespace

shims::Table shims::wchar() {
  static const Shim table[] = {
      shim("swprintf", &::swprintf), shim("wcscmp", &::wcscmp),     shim("wcslen", &::wcslen),
      shim("wcsstr", &find),         shim("wcstod", &::wcstod),     shim("wcstof", &::wcstof),
      shim("wcstol", &::wcstol),     shim("wcstold", &::wcstold),   shim("wcstoll", &::wcstoll),
      shim("wcstoul", &::wcstoul),   shim("wcstoull", &::wcstoull), shim("wmemchr", &findCharacter),
      shim("wmemcmp", &::wmemcmp),   shim("wmemcpy", &::wmemcpy),   shim("wmemmove", &::wmemmove),
      shim("wmemset", &::wmemset),
  };
  return table;
}
