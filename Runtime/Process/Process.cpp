#include "Runtime/Process/Process.h"

#include <unistd.h>

#include <cstdlib>

#ifdef __APPLE__
#include <stdlib.h>
#else
#include <cerrno>
#endif

namespace rt::Process {

String name() {
#ifdef __APPLE__
  const char* const name = getprogname();
#else
  const char* const name = program_invocation_short_name;
#endif
  return name != nullptr ? String::fromUTF8Repaired(name) : ""_s;
}

std::int32_t identifier() noexcept {
  return getpid();
}

String environmentValue(const char* name) {
  const char* const value = std::getenv(name);
  return value != nullptr ? String::fromUTF8Repaired(value) : String();
}

}  // namespace rt::Process
