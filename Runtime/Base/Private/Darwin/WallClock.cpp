#include "Runtime/Base/Private/WallClock.h"

#include <ctime>

namespace rt {

std::int64_t WallClock::nanoseconds() noexcept {
  return static_cast<std::int64_t>(clock_gettime_nsec_np(CLOCK_REALTIME));
}

}  // namespace rt
