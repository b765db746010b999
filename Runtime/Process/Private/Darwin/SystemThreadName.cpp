#include "Runtime/Process/Private/SystemThreadName.h"

#include <pthread.h>

#include <array>
#include <string>

namespace rt::detail {

String systemThreadName() {
  std::array<char, 64> name{};
  if (pthread_getname_np(pthread_self(), name.data(), name.size()) != 0 || name[0] == '\0') return nullptr;
  return String::fromUTF8Repaired(name.data());
}

void setSystemThreadName(const String& name) noexcept {
  std::array<char, 64> text{};
  name.view().copy(text.data(), text.size() - 1);
  pthread_setname_np(text.data());
}

}  // namespace rt::detail
