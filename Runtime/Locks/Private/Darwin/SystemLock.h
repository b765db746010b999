#pragma once

// What `rt::UnfairLock` is on macOS: the system's own, which ends the program on misuse and says why in
// the crash report.

#include <os/lock.h>

namespace rt::detail {

class SystemLock {
 public:
  /// Whether one that another thread held can be had in the child of a fork.
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
