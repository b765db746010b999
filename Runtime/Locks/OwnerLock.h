#pragma once

// A lock in one word: the token of the thread that holds it, and a bit that says whether threads sleep until
// it is free. The locks of this folder are made of it.
//
// The token identifies the holder, so misuse is caught. It also reveals a lock that a fork has left held,
// since the holder's thread does not exist in the child. A thread that wants the lock finds that out when it
// is about to wait, and takes the lock over. So no list of locks is needed, and taking a free lock costs
// nothing more.

#include <atomic>
#include <cstdint>

#include "Runtime/Locks/ThreadIdentifier.h"

namespace rt::detail {

class OwnerLock {
 public:
  constexpr OwnerLock() noexcept = default;

  // Takes the lock. `isCounted` says whether the caller has counted the lock for forks
  // (Runtime/Locks/ForkGate.h).
  [[gnu::always_inline]] void lock(bool isCounted = false) noexcept {
    const ThreadToken self = currentThreadToken();
    if (!take(self)) [[unlikely]]
      lockSlow(self, isCounted);
  }

  [[gnu::always_inline]] bool tryLock() noexcept {
    const ThreadToken self = currentThreadToken();
    return take(self) || takeOver(self);
  }

  [[gnu::always_inline]] void unlock() noexcept {
    // Checked before the lock is released, so that nobody gets into what another thread guards.
    if (!isHeldByCaller()) [[unlikely]]
      failOwner("unlocked");
    if ((state_.exchange(0, std::memory_order_release) & kHasWaiters) != 0) [[unlikely]]
      wakeOne();
  }

  [[gnu::always_inline]] void assertOwner() const noexcept {
    if (!isHeldByCaller()) [[unlikely]]
      failOwner("needed");
  }

  bool isHeldByCaller() const noexcept {
    return (state_.load(std::memory_order_relaxed) & ~kHasWaiters) == currentThreadToken();
  }

  // Returns whether the holder is a thread that a fork has left behind in another process.
  bool isAbandoned() const noexcept { return isAbandoned(state_.load(std::memory_order_relaxed)); }

 private:
  static constexpr std::uint32_t kHasWaiters = 0x80000000;

  static bool isAbandoned(std::uint32_t state) noexcept {
    return state != 0 && isThreadGone(state & ~kHasWaiters);
  }

  [[gnu::always_inline]] bool take(ThreadToken self) noexcept {
    std::uint32_t expected = 0;
    // The fork gate needs the release order (`ForkGate::isShut`).
    return state_.compare_exchange_strong(expected, self, std::memory_order_acq_rel,
                                          std::memory_order_relaxed);
  }

  [[gnu::cold]] void lockSlow(ThreadToken self, bool isCounted) noexcept;
  [[gnu::cold]] bool takeOver(ThreadToken self) noexcept;
  [[gnu::cold]] void wakeOne() noexcept;
  [[noreturn, gnu::cold]] void failOwner(const char* verb) const noexcept;

  std::atomic<std::uint32_t> state_ = 0;
};

}  // namespace rt::detail
