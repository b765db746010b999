#pragma once

/// The lock of a registry, which generated code may hold (`SRLRegistry::lock`).
///
///     const rt::LockGuard guard(*registry->lock());
///     registry->internalRegisterServiceAPI(&clockAPI, implementation);
///
/// It is not recursive: what takes it itself must not be called with it held, which ends the program.
///
/// Some errors are reported while it is held, so error callbacks, log filters and loggers must not ask a
/// registry for anything. One thread that reports and another whose callback asks would wait for each other
/// for ever; a callback that finds the lock held, or an instance in the making, ends the program instead,
/// with a line on standard error. Nor must they wait for anybody who asks: not for a lock that some thread
/// holds while it asks, and not for a queue, the main one included, whose tasks ask. That nothing can find
/// out.
///
/// Not for: anything but registries.

#include "Runtime/Locks/UnfairLock.h"

struct RT_CAPABILITY("lock") SRLUnfairLock {
  void lock() noexcept RT_ACQUIRE() RT_NO_THREAD_SAFETY_ANALYSIS {
    if (!unfair_lock_.tryLock()) [[unlikely]]
      lockHeld();
  }
  void unlock() noexcept RT_RELEASE() RT_NO_THREAD_SAFETY_ANALYSIS { unfair_lock_.unlock(); }
  /// Ends the program when the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) RT_NO_THREAD_SAFETY_ANALYSIS {
    unfair_lock_.assertOwner();
  }

  rt::UnfairLock unfair_lock_;

 private:
  // What `lock` does where somebody holds it.
  [[gnu::cold]] void lockHeld() noexcept;
};
