#include "tests/support/ClockHook.h"

#ifdef __APPLE__
#include <time.h>
#else
#include <sys/syscall.h>
#include <unistd.h>
#endif

constinit std::atomic<ClockHook> clockHook = nullptr;

namespace {

int readClock(clockid_t clock, timespec* time) noexcept {
#ifdef __APPLE__
  constexpr __uint64_t kSecond = 1'000'000'000;
  const __uint64_t now = clock_gettime_nsec_np(clock);
  time->tv_sec = static_cast<time_t>(now / kSecond);
  time->tv_nsec = static_cast<long>(now % kSecond);
  return now == 0 ? -1 : 0;
#else
  return static_cast<int>(syscall(SYS_clock_gettime, clock, time));
#endif
}

}  // namespace

// The program's function takes precedence over the C library's, also for the C++ library. On Linux it does
// for the system's libraries, too.
extern "C" int clock_gettime(clockid_t clock_id,
                             timespec* tp) noexcept(noexcept(clock_gettime(clock_id, tp))) {
  const int status = readClock(clock_id, tp);
  const ClockHook hook = clockHook.load();
  if (status == 0 && hook != nullptr) hook(clock_id, *tp);
  return status;
}
