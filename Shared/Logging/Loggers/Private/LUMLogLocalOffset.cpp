#include "Shared/Logging/Loggers/Private/LUMLogLocalOffset.h"

#include <atomic>
#include <ctime>

#include "Runtime/Locks/UnfairLock.h"

namespace {

constexpr std::int64_t kQuarterInSeconds = 900;

// An offset is less than 36 hours, so it fits below the number of its quarter.
constexpr unsigned kOffsetBits = 18;
constexpr std::int64_t kOffsetBias = std::int64_t{1} << (kOffsetBits - 1);
constexpr std::int64_t kQuarterBias = std::int64_t{1} << 40;

// The last answer of the system. 0 before the first.
constinit std::atomic<std::uint64_t> known = 0;

// Held around `localtime_r`, which has a lock of its own. A fork waits for our lock, so it never copies the
// system's lock while that is held.
constinit rt::UnfairLock lock;

std::uint64_t quarterAt(std::int64_t second) noexcept {
  const std::int64_t quarter = (second / kQuarterInSeconds) - (second % kQuarterInSeconds < 0 ? 1 : 0);
  return static_cast<std::uint64_t>(quarter + kQuarterBias);
}

std::int32_t offsetIn(std::uint64_t word) noexcept {
  constexpr std::uint64_t kMask = (std::uint64_t{1} << kOffsetBits) - 1;
  return word == 0 ? 0 : static_cast<std::int32_t>(static_cast<std::int64_t>(word & kMask) - kOffsetBias);
}

[[gnu::cold]] std::int32_t askSystem(std::int64_t second) noexcept {
  const std::time_t time = second;
  std::tm local{};
  const rt::LockGuard guard(lock);
  // `localtime_r` alone would keep the zone that it read at its first call.
  tzset();
  const std::int32_t offset =
      localtime_r(&time, &local) != nullptr ? static_cast<std::int32_t>(local.tm_gmtoff) : 0;
  known.store((quarterAt(second) << kOffsetBits) | static_cast<std::uint64_t>(offset + kOffsetBias),
              std::memory_order_relaxed);
  return offset;
}

}  // namespace

std::int32_t LUMLogLocalOffset::secondsAt(std::int64_t second, LUMLogLine::Caller caller) noexcept {
  const std::uint64_t word = known.load(std::memory_order_relaxed);
  if (word >> kOffsetBits == quarterAt(second) || caller == LUMLogLine::Caller::kSignalHandler) {
    return offsetIn(word);
  }
  return askSystem(second);
}
