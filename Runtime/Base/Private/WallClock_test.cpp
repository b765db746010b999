#include "Runtime/Base/Private/WallClock.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <ctime>
#include <thread>
#include <vector>

#include "tests/support/AllocationCount.h"
#include "tests/support/ClockHook.h"

namespace {

constexpr std::int64_t kMillisecond = 1'000'000;
constexpr std::int64_t kHour = 3'600'000 * kMillisecond;

std::int64_t systemTime() {
  timespec now{};
  EXPECT_EQ(clock_gettime(CLOCK_REALTIME, &now), 0);
  return now.tv_sec * 1'000'000'000 + now.tv_nsec;
}

// Reads the clock until `duration` is over. Each time is between the system's times before and after it, give
// or take `tolerance`.
void expectTheSystemsTimeFor(std::int64_t duration, std::int64_t tolerance) {
  const std::int64_t end = systemTime() + duration;
  for (std::int64_t before = 0; before < end;) {
    before = systemTime();
    const std::int64_t told = rt::WallClock::nanoseconds();
    const std::int64_t after = systemTime();
    ASSERT_GE(told, before - tolerance);
    ASSERT_LE(told, after + tolerance);
  }
}

TEST(WallClock, TellsTheSystemsTime) {
  expectTheSystemsTimeFor(50 * kMillisecond, kMillisecond / 10);
}

TEST(WallClock, TellsTheSystemsTimeOnAllThreadsAtOnce) {
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int i = 0; i < 8; ++i)
    threads.emplace_back([] { expectTheSystemsTimeFor(50 * kMillisecond, kMillisecond / 10); });
  for (std::thread& thread : threads) thread.join();
}

// The clock is read all the time while it is set, so that the frequency is learned across the jump, too.
TEST(WallClock, FollowsAClockThatIsSet) {
  for (const std::int64_t offset : {kHour, -kHour, std::int64_t{0}}) {
    static constinit std::atomic<std::int64_t> current = 0;
    current = offset;
    clockHook = [](clockid_t clock, timespec& time) {
      if (clock == CLOCK_REALTIME) time.tv_sec += current / (1000 * kMillisecond);
    };
    const std::int64_t set = systemTime();
    while (systemTime() < set + 2 * kMillisecond) rt::WallClock::nanoseconds();
    expectTheSystemsTimeFor(10 * kMillisecond, kMillisecond);
  }
  clockHook = nullptr;
}

TEST(WallClock, AllocatesNothing) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  for (int i = 0; i < 1000; ++i) rt::WallClock::nanoseconds();
  EXPECT_EQ(count.allocations(), 0);
}

}  // namespace
