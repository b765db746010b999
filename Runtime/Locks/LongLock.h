#pragma once

/// `rt::LongLock` is a lock that may be held for long, while a callback runs or a system call blocks.
///
///     rt::LongLock lock_;
///
///     void Journal::write(std::string_view line) {
///       rt::LockGuard guard(lock_);
///       file_.write(line);                       // takes as long as the disk needs
///     }
///
/// The lock has four bytes. It behaves like an `UnfairLock` (Runtime/Locks/UnfairLock.h), but forks do not
/// wait for it. In the child it is free, unless the thread that forked holds it. That thread may unlock it
/// there.
///
/// In the child, the work that another thread was doing under the lock may be half done. So the lock keeps
/// threads apart, but the data that it guards must tolerate half a change. Make a change that has to be whole
/// under an `UnfairLock`, or publish it by one write.
///
/// Not for: guarding data for a moment (Runtime/Locks/UnfairLock.h).

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/OwnerLock.h"
#include "Runtime/Locks/UnfairLock.h"  // LockGuard

namespace rt {

class RT_CAPABILITY("lock") LongLock {
 public:
  /// Makes a free lock.
  constexpr LongLock() noexcept = default;
  LongLock(const LongLock&) = delete;
  LongLock& operator=(const LongLock&) = delete;

  /// Waits until no thread of this process holds the lock, and takes it. Ends the program if the caller holds
  /// it.
  void lock() noexcept RT_ACQUIRE() { lock_.lock(); }

  /// Takes the lock and returns true. Returns false at once if any thread of this process holds it, the
  /// caller included.
  [[nodiscard]] bool tryLock() noexcept RT_TRY_ACQUIRE(true) { return lock_.tryLock(); }

  /// Releases the lock. Ends the program if the caller does not hold it.
  void unlock() noexcept RT_RELEASE() { lock_.unlock(); }

  /// Ends the program if the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) { lock_.assertOwner(); }

  /// Returns whether the lock's holder is a thread that a fork has left behind in another process.
  bool isAbandoned() const noexcept { return lock_.isAbandoned(); }

 private:
  detail::OwnerLock lock_;
};

}  // namespace rt
