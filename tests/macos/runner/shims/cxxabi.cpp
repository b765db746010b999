// What the compiler calls by itself.

#include <cstdint>
#include <cstdio>
#include <cstdlib>

#include "tests/macos/runner/Shims.h"

extern "C" {
extern void* __dso_handle;
int __cxa_atexit(void (*function)(void*), void* object, void* image);
int __cxa_thread_atexit_impl(void (*function)(void*), void* object, void* image);
__extension__ __int128 __divti3(__int128, __int128);
__extension__ __int128 __modti3(__int128, __int128);
__extension__ unsigned __int128 __udivti3(unsigned __int128, unsigned __int128);
__extension__ unsigned __int128 __umodti3(unsigned __int128, unsigned __int128);
}

namespace {

// The destructors of thread-local variables run at the end of their thread, before those of the thread's
// values.
void destroyAtEndOfThread(void (*function)(void*), void* object) {
  __cxa_thread_atexit_impl(function, object, &__dso_handle);
}

std::uintptr_t stackGuard = 0x5a17c0de00ff0d00;

[[noreturn]] void stackIsOverwritten() {
  std::fprintf(stderr, "macos-runner: a buffer on the stack has overflowed\n");
  std::abort();
}

}  // namespace

shims::Table shims::cxxabi() {
  static const Shim table[] = {
      shim("__cxa_atexit", &__cxa_atexit),
      shim("_tlv_atexit", &destroyAtEndOfThread),
      shim("__stack_chk_guard", &stackGuard),
      shim("__stack_chk_fail", &stackIsOverwritten),
      shim("__divti3", &__divti3),
      shim("__modti3", &__modti3),
      shim("__udivti3", &__udivti3),
      shim("__umodti3", &__umodti3),
  };
  return table;
}
