#pragma once

/// The lock of a registry, which generated code may hold (`SRLRegistry::lock`).
///
///     const rt::LockGuard guard(*registry->lock());
///     registry->internalRegisterServiceAPI(&clockAPI, implementation);
///
/// It is not recursive: what takes it itself must not be called with it held, nor may the error callback ask
/// the registry for anything while a report is made under it. Both end the program.
///
/// Not for: anything but registries.

#include "Runtime/UnfairLock.h"

struct RT_CAPABILITY("lock") SRLUnfairLock {
  void lock() noexcept RT_ACQUIRE() RT_NO_THREAD_SAFETY_ANALYSIS { unfair_lock_.lock(); }
  void unlock() noexcept RT_RELEASE() RT_NO_THREAD_SAFETY_ANALYSIS { unfair_lock_.unlock(); }
  /// Ends the program when the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) RT_NO_THREAD_SAFETY_ANALYSIS {
    unfair_lock_.assertOwner();
  }

  rt::UnfairLock unfair_lock_;
};
