#include "Runtime/Base/Private/WallClock.h"

#include <ctime>

namespace rt {

std::int64_t WallClock::nanoseconds() noexcept {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

}  // namespace rt
