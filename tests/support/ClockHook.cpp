#include "tests/support/ClockHook.h"

#include <sys/syscall.h>
#include <unistd.h>

constinit std::atomic<ClockHook> clockHook = nullptr;

// The program's function takes precedence over the C library's, even for calls from the system's libraries.
extern "C" int clock_gettime(clockid_t clock_id, timespec* tp) noexcept {
  const auto status = static_cast<int>(syscall(SYS_clock_gettime, clock_id, tp));
  const ClockHook hook = clockHook.load();
  if (status == 0 && hook != nullptr) hook(clock_id, *tp);
  return status;
}
