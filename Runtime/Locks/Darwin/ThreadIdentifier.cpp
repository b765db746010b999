#include "Runtime/Locks/ThreadIdentifier.h"

#include <pthread.h>

namespace rt::detail {

ThreadIdentifier systemThreadIdentifier() noexcept {
  return pthread_mach_thread_np(pthread_self());
}

// The identifier is the name of a port. It has the port's place in the task's table, and eight bits that
// change when the place is reused.
std::uint32_t systemThreadNumber() noexcept {
  return systemThreadIdentifier() >> 8U & 0x3FFFFFU;
}

bool systemIsMainThread() noexcept {
  return pthread_main_np() == 1;
}

}  // namespace rt::detail
