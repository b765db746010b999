#pragma once

// How much longer one entry may hold up its caller. Inside of the system log.

#include <chrono>
#include <cstdint>
#include <ctime>

namespace rt::detail {

class Patience {
 public:
  /// What one system call may wait for; a datagram may wait twice, for room of its own socket and of the
  /// daemon's. Nothing begins to wait once this much has passed since the entry was begun, so that an entry
  /// takes less than three times this.
  static constexpr std::chrono::milliseconds kWait{50};

  /// Never waits.
  constexpr Patience() noexcept = default;

  static Patience fromNow() noexcept { return Patience(now() + kWait); }

  /// Whether nothing should wait any more.
  bool isOver() const noexcept { return now() >= end_; }

 private:
  explicit constexpr Patience(std::chrono::nanoseconds end) noexcept : end_(end) {}

  // The coarse clock is some milliseconds off, and several times as fast to read.
  static std::chrono::nanoseconds now() noexcept {
    timespec time{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &time);
    return std::chrono::seconds(time.tv_sec) + std::chrono::nanoseconds(time.tv_nsec);
  }

  std::chrono::nanoseconds end_{0};
};

}  // namespace rt::detail
