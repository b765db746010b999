#include "Runtime/ThreadIdentifier.h"

#include <pthread.h>

namespace rt::detail {

ThreadIdentifier systemThreadIdentifier() noexcept {
  return pthread_mach_thread_np(pthread_self());
}

bool systemIsMainThread() noexcept {
  return pthread_main_np() == 1;
}

}  // namespace rt::detail
