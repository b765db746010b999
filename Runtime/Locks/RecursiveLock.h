#pragma once

/// A lock that the thread which holds it may take again.
///
///     void Switchboard::replace(Logger* logger) {
///       rt::LockGuard guard(lock_);      // a rt::RecursiveLock
///       remove(logger);                  // takes lock_ too
///       add(logger);
///     }
///
/// It is let go when it has been unlocked as often as it was locked. Letting go a lock that another
/// thread, or none, holds ends the program with a line on standard error. Otherwise as
/// Runtime/Locks/Private/LongLock.h, also where a fork is concerned.
///
/// Not for: code that can be arranged to take its lock once. The annotations see one function at a time,
/// so a function that itself takes the lock twice does not compile with clang.

#include <cstdint>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/Private/OwnerLock.h"
#include "Runtime/Locks/UnfairLock.h"  // LockGuard

namespace rt {

class RT_CAPABILITY("lock") RecursiveLock {
 public:
  /// Not held.
  constexpr RecursiveLock() noexcept = default;
  RecursiveLock(const RecursiveLock&) = delete;
  RecursiveLock& operator=(const RecursiveLock&) = delete;

  /// Takes the lock once more, after waiting until no other thread holds it.
  void lock() noexcept RT_ACQUIRE();

  /// Takes the lock once more and returns true, or returns false at once when another thread holds it.
  [[nodiscard]] bool tryLock() noexcept RT_TRY_ACQUIRE(true);

  /// Takes back one `lock`. Ends the program when the caller does not hold the lock.
  void unlock() noexcept RT_RELEASE();

  /// Ends the program when the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this);

 private:
  detail::OwnerLock lock_;
  std::uint32_t depth_ = 0;  // The holder's.
};

}  // namespace rt
