#pragma once

/// `rt::RecursiveLock` is a lock that its holder may take again.
///
///     void Switchboard::replace(Logger* logger) {
///       rt::LockGuard guard(lock_);      // a rt::RecursiveLock
///       remove(logger);                  // takes lock_ too
///       add(logger);
///     }
///
/// The lock is free again after as many calls of `unlock` as of `lock`. Unlocking a lock that the caller does
/// not hold ends the program with a line on standard error. It may be held while callbacks run or a system
/// call waits, also when the process forks.
///
/// Not for: code that can take its lock once. clang's annotations check one function at a time. So a function
/// that itself takes the lock twice does not compile with clang.

#include <cstdint>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/Private/OwnerLock.h"
#include "Runtime/Locks/UnfairLock.h"  // LockGuard

namespace rt {

class RT_CAPABILITY("lock") RecursiveLock {
 public:
  /// Makes a free lock.
  constexpr RecursiveLock() noexcept = default;
  RecursiveLock(const RecursiveLock&) = delete;
  RecursiveLock& operator=(const RecursiveLock&) = delete;

  /// Waits until no other thread holds the lock, and takes it once more.
  void lock() noexcept RT_ACQUIRE();

  /// Takes the lock once more and returns true. Returns false at once if another thread holds it.
  [[nodiscard]] bool tryLock() noexcept RT_TRY_ACQUIRE(true);

  /// Takes back one `lock`. Ends the program if the caller does not hold the lock.
  void unlock() noexcept RT_RELEASE();

  /// Ends the program if the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this);

 private:
  detail::OwnerLock lock_;
  std::uint32_t depth_ = 0;  // How often the holder has taken the lock.
};

}  // namespace rt
