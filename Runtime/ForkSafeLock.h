#pragma once

/// An UnfairLock that nobody else holds in the child of a fork.
///
///     constinit rt::ForkSafeLock lock;
///     constinit Object* chosen RT_GUARDED_BY(lock) = nullptr;
///
/// A lock that another thread holds at the moment of a fork stays locked in the child for ever, since that
/// thread is not there, and what it guards may be half changed. So a fork waits until it has all locks of
/// this kind, and lets them go in the parent and in the child. Costs a look at a variable more than an
/// UnfairLock. Constant-initialised, and never destroyed: for static variables.
///
/// Hold it for moments only, as forks wait, and take no other lock of any kind with it held, nor call
/// anything that does or that forks.
///
/// Not for: locks under which the code of users runs; locks within objects that go.

#include <atomic>

#include "Runtime/ThreadSafety.h"
#include "Runtime/UnfairLock.h"

namespace rt {

class RT_CAPABILITY("lock") ForkSafeLock {
 public:
  /// Not held.
  constexpr ForkSafeLock() noexcept = default;
  ForkSafeLock(const ForkSafeLock&) = delete;
  ForkSafeLock& operator=(const ForkSafeLock&) = delete;

  /// As of an UnfairLock.
  void lock() noexcept RT_ACQUIRE() RT_NO_THREAD_SAFETY_ANALYSIS {
    if (!isListed_.load(std::memory_order_acquire)) [[unlikely]]
      addToList();
    lock_.lock();
  }
  void unlock() noexcept RT_RELEASE() RT_NO_THREAD_SAFETY_ANALYSIS { lock_.unlock(); }

 private:
  static void lockAll() noexcept;
  static void unlockAll() noexcept;
  static void unlockAllInChild() noexcept;

  [[gnu::cold]] void addToList() noexcept;

  static const bool hasForkHandlers_;

  UnfairLock lock_;
  std::atomic<bool> isListed_ = false;
  ForkSafeLock* next_ = nullptr;
};

}  // namespace rt
