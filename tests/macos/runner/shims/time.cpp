#include <sys/time.h>

#include <cstdint>
#include <ctime>

#include "tests/macos/runner/Shims.h"

namespace {

clockid_t linuxClock(unsigned clock) {
  switch (clock) {
    case 0:
      return CLOCK_REALTIME;
    case 4:
    case 5:
      return CLOCK_MONOTONIC_RAW;
    case 6:
    case 8:
    case 9:
      return CLOCK_MONOTONIC;
    case 12:
      return CLOCK_PROCESS_CPUTIME_ID;
    case 16:
      return CLOCK_THREAD_CPUTIME_ID;
    default:
      refuse("the clock %u is used", clock);
  }
}

int timeOf(unsigned clock, timespec* time) {
  return converted(clock_gettime(linuxClock(clock), time));
}

std::uint64_t nanosecondsOf(unsigned clock) {
  timespec time{};
  clock_gettime(linuxClock(clock), &time);
  return static_cast<std::uint64_t>(time.tv_sec) * 1'000'000'000 + static_cast<std::uint64_t>(time.tv_nsec);
}

// The microseconds have 32 bits, and the upper half of Linux's 64 bits is padding.
int timeOfDay(timeval* time, void*) {
  return converted(gettimeofday(time, nullptr));
}

}  // namespace

shims::Table shims::time() {
  static const Shim table[] = {
      shim("clock_gettime", &timeOf),
      shim("clock_gettime_nsec_np", &nanosecondsOf),
      shim("gettimeofday", &timeOfDay),
      shim("nanosleep", systemCall<&::nanosleep>),
      shim("gmtime_r", &::gmtime_r),
      shim("localtime_r", &::localtime_r),
      shim("mktime", libraryCall<&::mktime>),
      shim("strftime", &::strftime),
      shim("time", &::time),
      shim("tzset", &::tzset),
  };
  return table;
}
