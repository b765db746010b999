#include "Runtime/ThreadIdentifier.h"

#include <sys/syscall.h>
#include <unistd.h>

namespace rt::detail {

ThreadIdentifier systemThreadIdentifier() noexcept {
  return static_cast<ThreadIdentifier>(syscall(SYS_gettid));
}

bool systemIsMainThread() noexcept {
  return syscall(SYS_gettid) == getpid();
}

}  // namespace rt::detail
