#include "Runtime/Locks/Private/ThreadIdentifier.h"

#include <sys/syscall.h>
#include <unistd.h>

namespace rt::detail {

ThreadIdentifier systemThreadIdentifier() noexcept {
  return static_cast<ThreadIdentifier>(syscall(SYS_gettid));
}

// The kernel numbers threads below 2^22.
std::uint32_t systemThreadNumber() noexcept {
  return systemThreadIdentifier();
}

bool systemIsMainThread() noexcept {
  return syscall(SYS_gettid) == getpid();
}

}  // namespace rt::detail
