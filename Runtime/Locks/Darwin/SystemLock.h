#pragma once

// On macOS, `rt::UnfairLock` is the system's own lock. It ends the program on misuse, and the crash report
// gives the reason.

#include <os/lock.h>

namespace rt::detail {

class SystemLock {
 public:
  // Whether the child of a fork can take a lock that another thread held.
  static constexpr bool kIsTakenOver = false;

  constexpr SystemLock() noexcept = default;

  void lock() noexcept { os_unfair_lock_lock(&lock_); }
  bool tryLock() noexcept { return os_unfair_lock_trylock(&lock_); }
  void unlock() noexcept { os_unfair_lock_unlock(&lock_); }
  void assertOwner() const noexcept { os_unfair_lock_assert_owner(&lock_); }

 private:
  mutable os_unfair_lock lock_ = OS_UNFAIR_LOCK_INIT;
};

}  // namespace rt::detail
