// Asking the system for the time takes about 23 ns. Reading the processor's counter takes 10. So the time is
// asked once in a millisecond at most. In between it is computed from the counter.
//
// The duration of the counter's ticks is measured between two such times. It is used once two measurements
// agree. If the next one does not, the clock has been set, or the counter has changed. Then the system is
// asked each time until two agree again. So a result is wrong by a millisecond at most.
//
// The last time and the counter's value at it are one record under a sequence number, which is odd while a
// thread changes the record. Nobody waits for that thread: the others ask the system meanwhile. (If a fork
// happens at that moment, the child asks the system each time.)

#include "Runtime/Base/Private/WallClock.h"

#if defined(__x86_64__)
#include <x86intrin.h>
#endif

#include <atomic>
#include <ctime>

namespace rt {

namespace {

std::int64_t systemTime() noexcept {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return now.tv_sec * 1'000'000'000 + now.tv_nsec;
}

#if defined(__x86_64__)

constexpr std::int64_t kMillisecond = 1'000'000;

// The duration of a tick is in nanoseconds times 2^32.
constexpr int kFractionBits = 32;

// The interval between two times from which the duration of a tick is computed. A longer one would overflow.
constexpr std::int64_t kShortestInterval = kMillisecond;
constexpr std::int64_t kLongestInterval = 4000 * kMillisecond;

// Two durations agree if they differ by less than this part.
constexpr std::uint64_t kTolerance = 500;

// A thread that is interrupted between reading the counter and asking for the time gets a useless pair.
constexpr std::uint64_t kMostTicksBetween = 5'000;

struct Record {
  std::atomic<std::uint32_t> sequence = 0;
  std::atomic<std::int64_t> time = 0;
  std::atomic<std::uint64_t> ticks = 0;
  // The last measured duration of a tick. 0 if none has been measured.
  std::atomic<std::uint64_t> tick = 0;
  // For how many ticks the record may be used, which is a millisecond. 0 if the last two durations differ.
  std::atomic<std::uint64_t> validTicks = 0;
};

constinit Record record;

bool agree(std::uint64_t first, std::uint64_t second) noexcept {
  const std::uint64_t difference = first > second ? first - second : second - first;
  return difference < first / kTolerance;
}

// Changes the record, which the caller has made odd, to the time of a counter's value.
void setRecord(std::int64_t time, std::uint64_t ticks) noexcept {
  const std::int64_t interval = time - record.time.load(std::memory_order_relaxed);
  const std::uint64_t passed = ticks - record.ticks.load(std::memory_order_relaxed);
  if (interval >= 0 && interval < kShortestInterval) return;
  record.time.store(time, std::memory_order_release);
  record.ticks.store(ticks, std::memory_order_release);
  if (interval < 0 || interval > kLongestInterval || passed == 0) return;
  const std::uint64_t tick = (static_cast<std::uint64_t>(interval) << kFractionBits) / passed;
  const bool isKnown = tick != 0 && agree(tick, record.tick.load(std::memory_order_relaxed));
  record.tick.store(tick, std::memory_order_release);
  record.validTicks.store(isKnown ? (static_cast<std::uint64_t>(kMillisecond) << kFractionBits) / tick : 0,
                          std::memory_order_release);
}

// Asks the system, and makes the answer the record from which the next times are computed.
[[gnu::noinline, gnu::cold]] std::int64_t timeAndRecord() noexcept {
  const std::uint64_t before = __rdtsc();
  const std::int64_t time = systemTime();
  const std::uint64_t between = __rdtsc() - before;
  if (between > kMostTicksBetween) return time;
  std::uint32_t sequence = record.sequence.load(std::memory_order_relaxed);
  if (sequence % 2 == 0 &&
      record.sequence.compare_exchange_strong(sequence, sequence + 1, std::memory_order_acquire,
                                              std::memory_order_relaxed)) {
    setRecord(time, before + between / 2);
    record.sequence.store(sequence + 2, std::memory_order_release);
  }
  return time;
}

#endif

}  // namespace

std::int64_t WallClock::nanoseconds() noexcept {
#if defined(__x86_64__)
  const std::uint32_t sequence = record.sequence.load(std::memory_order_acquire);
  const std::int64_t time = record.time.load(std::memory_order_acquire);
  const std::uint64_t start = record.ticks.load(std::memory_order_acquire);
  const std::uint64_t tick = record.tick.load(std::memory_order_acquire);
  const std::uint64_t validTicks = record.validTicks.load(std::memory_order_acquire);
  const std::uint64_t passed = __rdtsc() - start;
  if (passed < validTicks && sequence % 2 == 0 && record.sequence.load(std::memory_order_relaxed) == sequence)
      [[likely]] {
    return time + static_cast<std::int64_t>((passed * tick) >> kFractionBits);
  }
  return timeAndRecord();
#else
  return systemTime();
#endif
}

}  // namespace rt
