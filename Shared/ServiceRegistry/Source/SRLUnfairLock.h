#pragma once

/// The lock of a registry, which generated code may hold (`SRLRegistry::lock`).
///
///     const rt::LockGuard guard(*registry->lock());
///     registry->internalRegisterServiceAPI(&clockAPI, implementation);
///
/// The lock is not recursive. A thread that holds it must not call a function that takes it: this ends the
/// program.
///
/// Some errors are reported while the lock is held. So error callbacks, log filters and loggers must not call
/// a registry. Otherwise a thread that reports and a thread whose callback calls a registry could deadlock.
/// Instead, an error callback that needs a held lock, or an instance that is being made, ends the program. It
/// prints a line to standard error first.
///
/// Nor may callbacks wait for another thread that calls a registry. They must not take a lock that any thread
/// holds during such a call. They must not wait for a queue, including the main queue, whose tasks make such
/// calls. These deadlocks are not detected.
///
/// Not for: anything but registries.

#include "Runtime/Locks/UnfairLock.h"

struct RT_CAPABILITY("lock") SRLUnfairLock {
  /// Takes the lock. Blocks while another thread holds it.
  void lock() noexcept RT_ACQUIRE() RT_NO_THREAD_SAFETY_ANALYSIS {
    if (!unfair_lock_.tryLock()) [[unlikely]]
      lockHeld();
  }
  /// Releases the lock. Ends the program if the caller does not hold it.
  void unlock() noexcept RT_RELEASE() RT_NO_THREAD_SAFETY_ANALYSIS { unfair_lock_.unlock(); }
  /// Ends the program if the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) RT_NO_THREAD_SAFETY_ANALYSIS {
    unfair_lock_.assertOwner();
  }

  rt::UnfairLock unfair_lock_;

 private:
  // The slow path of `lock`, for a lock that is held.
  [[gnu::cold]] void lockHeld() noexcept;
};
