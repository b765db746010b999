#include "Runtime/Base/MonotonicClock.h"

#include <gtest/gtest.h>

#include <ctime>

namespace {

std::uint64_t raw() {
  timespec now{};
  EXPECT_EQ(clock_gettime(CLOCK_MONOTONIC_RAW, &now), 0);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000U + static_cast<std::uint64_t>(now.tv_nsec);
}

TEST(MonotonicClock, ReadsTheSystemsRawClockInNanoseconds) {
  const std::uint64_t before = raw();
  const std::uint64_t told = rt::MonotonicClock::nanoseconds();
  const std::uint64_t after = raw();
  EXPECT_GE(told, before);
  EXPECT_LE(told, after);
}

TEST(MonotonicClock, NeverGoesBack) {
  std::uint64_t last = 0;
  for (int i = 0; i < 100'000; ++i) {
    const std::uint64_t now = rt::MonotonicClock::nanoseconds();
    ASSERT_GE(now, last);
    last = now;
  }
}

}  // namespace
