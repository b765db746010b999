#pragma once

// What `rt::UnfairLock` is on Linux: one word, the identifier of the thread that holds the lock and a bit
// for the threads that sleep until it is let go.

#include <atomic>
#include <cstdint>

#include "Runtime/ThreadIdentifier.h"

namespace rt::detail {

class SystemLock {
 public:
  constexpr SystemLock() noexcept = default;

  void lock() noexcept {
    const ThreadIdentifier self = currentThreadIdentifier();
    if (!take(self)) [[unlikely]]
      lockSlow(self);
  }

  bool tryLock() noexcept { return take(currentThreadIdentifier()); }

  void unlock() noexcept {
    // Looked at before it is let go: nobody gets into what another thread guards.
    if ((state_.load(std::memory_order_relaxed) & ~kHasWaiters) != currentThreadIdentifier()) [[unlikely]]
      checkOwner("unlocked");
    if ((state_.exchange(0, std::memory_order_release) & kHasWaiters) != 0) [[unlikely]]
      wakeOne();
  }

  void assertOwner() const noexcept {
    if ((state_.load(std::memory_order_relaxed) & ~kHasWaiters) != currentThreadIdentifier()) [[unlikely]]
      checkOwner("needed");
  }

 private:
  static constexpr std::uint32_t kHasWaiters = 0x80000000;

  bool take(ThreadIdentifier self) noexcept {
    std::uint32_t expected = 0;
    return state_.compare_exchange_strong(expected, self, std::memory_order_acquire,
                                          std::memory_order_relaxed);
  }

  [[gnu::cold]] void lockSlow(ThreadIdentifier self) noexcept;
  [[gnu::cold]] void wakeOne() noexcept;
  [[gnu::cold]] void checkOwner(const char* verb) const noexcept;

  std::atomic<std::uint32_t> state_ = 0;
};

}  // namespace rt::detail
