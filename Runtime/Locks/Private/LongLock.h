#pragma once

/// A lock that may be held for long: while somebody else's code runs, or a system call waits.
///
///     rt::LongLock lock_;
///
///     void Journal::write(std::string_view line) {
///       rt::LockGuard guard(lock_);
///       file_.write(line);                       // as long as the disk takes
///     }
///
/// Four bytes. As Runtime/Locks/UnfairLock.h, but for forks, which do not wait for it. In the child it is
/// free, unless the thread that forked holds it; that one may let it go there. What another thread was doing
/// under it may be half done. So it keeps threads apart, and what it guards must bear that: a change that has
/// to be whole is made under an `UnfairLock`, or published by one write.
///
/// Not for: guarding data for a moment (Runtime/Locks/UnfairLock.h).

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/Private/OwnerLock.h"
#include "Runtime/Locks/UnfairLock.h"  // LockGuard

namespace rt {

class RT_CAPABILITY("lock") LongLock {
 public:
  /// Not held.
  constexpr LongLock() noexcept = default;
  LongLock(const LongLock&) = delete;
  LongLock& operator=(const LongLock&) = delete;

  /// Takes the lock, after waiting until no thread of this process holds it. Ends the program when the caller
  /// holds it.
  void lock() noexcept RT_ACQUIRE() { lock_.lock(); }

  /// Takes the lock and returns true, or returns false at once when any thread of this process, the caller
  /// included, holds it.
  [[nodiscard]] bool tryLock() noexcept RT_TRY_ACQUIRE(true) { return lock_.tryLock(); }

  /// Lets the lock go. Ends the program when the caller does not hold it.
  void unlock() noexcept RT_RELEASE() { lock_.unlock(); }

  /// Ends the program when the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) { lock_.assertOwner(); }

  /// Whether a thread holds it that a fork has left behind in another process.
  bool isAbandoned() const noexcept { return lock_.isAbandoned(); }

 private:
  detail::OwnerLock lock_;
};

}  // namespace rt
