#pragma once

// The time for which one entry may block its caller. Internal to the system log.

#include <chrono>
#include <cstdint>
#include <ctime>

namespace rt::detail {

class Patience {
 public:
  /// The longest single wait. A send of a datagram may wait twice: for room in its own socket, and in the
  /// daemon's. No send waits once `kWait` has passed since the entry was begun. So an entry takes less than
  /// three times `kWait`.
  static constexpr std::chrono::milliseconds kWait{50};

  /// Makes an object whose time is over already, so that no send waits.
  constexpr Patience() noexcept = default;

  static Patience fromNow() noexcept { return Patience(now() + kWait); }

  /// Returns whether no send may wait any more.
  bool isOver() const noexcept { return now() >= end_; }

 private:
  explicit constexpr Patience(std::chrono::nanoseconds end) noexcept : end_(end) {}

  // The coarse clock is some milliseconds late, but several times as fast to read.
  static std::chrono::nanoseconds now() noexcept {
    timespec time{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &time);
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
  }

  std::chrono::nanoseconds end_{0};
};

}  // namespace rt::detail
