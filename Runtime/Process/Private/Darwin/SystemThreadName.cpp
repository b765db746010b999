#include "Runtime/Process/Private/SystemThreadName.h"

#include <pthread.h>

#include <array>

#include "Runtime/Base/Private/UTF8.h"

namespace rt::detail {

namespace {

// The system keeps 63 bytes and a NUL.
using Text = std::array<char, 64>;

}  // namespace

String systemThreadName() {
  Text name{};
  if (pthread_getname_np(pthread_self(), name.data(), name.size()) != 0 || name[0] == '\0') return nullptr;
  return String::fromUTF8Repaired(name.data());
}

void setSystemThreadName(const String& name) noexcept {
  const std::string_view text = name.view();
  Text shortened{};
  text.copy(shortened.data(), lengthThatFits(text, shortened.size() - 1));
  pthread_setname_np(shortened.data());
}

}  // namespace rt::detail
