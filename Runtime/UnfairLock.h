#pragma once

/// The lock to use: four bytes, no allocation, no fairness, and misuse caught in every build.
///
///     class Counter {
///      public:
///       void add(int amount) {
///         rt::LockGuard guard(lock_);
///         value_ += amount;
///       }
///      private:
///       rt::UnfairLock lock_;
///       int value_ RT_GUARDED_BY(lock_) = 0;    // Runtime/ThreadSafety.h
///     };
///
/// A thread that waits spins for a moment and then sleeps. Who comes first when the lock is let go is
/// not defined, so a thread that lets it go and takes it again at once may well get it. A thread that
/// takes a lock it holds, and one that lets go a lock it does not hold, ends the program with a line on
/// standard error that names lock and thread.
///
/// Constant-initialised: a lock at namespace scope is ready before anything runs, and needs nothing at
/// exit. After `fork`, the child's thread holds what the thread that forked held, and may unlock it (on
/// macOS it makes the lock anew instead); a lock that another thread held stays locked in the child for
/// ever.
///
/// Not for: locks that a thread takes again while it holds them (Runtime/RecursiveLock.h); waiting for a
/// condition; long waits, for which a queue is better (Runtime/Queue.h).

#include "Runtime/ThreadSafety.h"

#if defined(__APPLE__)
#include "Runtime/Darwin/SystemLock.h"
#else
#include "Runtime/Linux/SystemLock.h"
#endif

namespace rt {

namespace detail {

// How many locks a thread holds is counted where RT_COUNTS_HELD_LOCKS is defined, as it is in instrumented
// builds: for tests of what runs without any.
#if defined(RT_COUNTS_HELD_LOCKS)
inline constinit thread_local int heldLocks = 0;
inline void countHeldLocks(int change) noexcept {
  heldLocks += change;
}
#else
inline void countHeldLocks(int /*change*/) noexcept {}
#endif

}  // namespace detail

class RT_CAPABILITY("lock") UnfairLock {
 public:
  /// Not held.
  constexpr UnfairLock() noexcept = default;
  UnfairLock(const UnfairLock&) = delete;
  UnfairLock& operator=(const UnfairLock&) = delete;

  /// Takes the lock, after waiting until no thread holds it. Ends the program when the caller holds it.
  void lock() noexcept RT_ACQUIRE() {
    lock_.lock();
    detail::countHeldLocks(1);
  }

  /// Takes the lock and returns true, or returns false at once when any thread, the caller included,
  /// holds it.
  [[nodiscard]] bool tryLock() noexcept RT_TRY_ACQUIRE(true) {
    const bool isTaken = lock_.tryLock();
    if (isTaken) detail::countHeldLocks(1);
    return isTaken;
  }

  /// Lets the lock go. Ends the program when the caller does not hold it.
  void unlock() noexcept RT_RELEASE() {
    lock_.unlock();
    detail::countHeldLocks(-1);
  }

  /// Ends the program when the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) { lock_.assertOwner(); }

 private:
  detail::SystemLock lock_;
};

static_assert(sizeof(UnfairLock) == 4);

/// Holds a lock for as long as a scope lasts, however it is left. For `UnfairLock`, `RecursiveLock` and
/// what else has `lock` and `unlock`.
template <class Lock>
class RT_SCOPED_CAPABILITY [[nodiscard]] LockGuard {
 public:
  /// Takes `lock`, which outlives the guard.
  explicit LockGuard(Lock& lock) RT_ACQUIRE(lock) : lock_(lock) { lock_.lock(); }
  ~LockGuard() RT_RELEASE() { lock_.unlock(); }
  LockGuard(const LockGuard&) = delete;
  LockGuard& operator=(const LockGuard&) = delete;

 private:
  Lock& lock_;
};

}  // namespace rt
