#pragma once

/// `rt::UnfairLock` is the lock to use by default. It has four bytes, allocates nothing, is not fair and
/// catches misuse in every build.
///
///     class Counter {
///      public:
///       void add(int amount) {
///         rt::LockGuard guard(lock_);
///         value_ += amount;
///       }
///      private:
///       rt::UnfairLock lock_;
///       int value_ RT_GUARDED_BY(lock_) = 0;    // Runtime/Base/ThreadSafety.h
///     };
///
/// A waiting thread spins for a moment and then sleeps. Waiting threads get the lock in no defined order. A
/// thread that unlocks it and locks it again at once may well get it first.
///
/// A thread ends the program if it locks a lock that it holds, or unlocks a lock that it does not hold. On
/// Linux a line on standard error names the lock and the thread. On macOS the program ends by a trap without
/// a line, and the crash report gives the reason.
///
/// The lock itself needs no memory. A thread that takes its first lock registers with the thread library,
/// which then tells when the thread ends. Registering allocates if the process has many thread-specific keys.
///
/// The lock is constant-initialised. At namespace scope it is ready before anything runs, and nothing runs
/// for it at exit.
///
/// Fork: a fork waits until no other thread holds a lock of this kind. So all of them are free in the child,
/// except those that the forking thread holds. The data that they guard is whole. (On macOS the child cannot
/// unlock what that thread held.)
///
/// A fork waits for about a second at most. A lock that is still held then is free in the child. Its data is
/// as the holder left it. (On macOS the lock stays held.)
///
/// Not for: sections that take long, such as blocking system calls and callbacks; locks that a thread takes
/// again while it holds them. Use Runtime/Locks/RecursiveLock.h for both. To wait for a condition, use a
/// queue (Runtime/Queues/Queue.h).

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/Private/ForkGate.h"

#if defined(__APPLE__)
#include "Runtime/Locks/Private/Darwin/SystemLock.h"
#else
#include "Runtime/Locks/Private/Linux/SystemLock.h"
#endif

namespace rt {

class RT_CAPABILITY("lock") UnfairLock {
 public:
  /// Makes a free lock.
  constexpr UnfairLock() noexcept = default;
  UnfairLock(const UnfairLock&) = delete;
  UnfairLock& operator=(const UnfairLock&) = delete;

  /// Waits until no thread holds the lock, and takes it. Ends the program if the caller holds it.
  [[gnu::always_inline]] void lock() noexcept RT_ACQUIRE() {
    if constexpr (detail::SystemLock::kIsTakenOver) {
      detail::ForkGate::enter();
      lock_.lock();
      if (detail::ForkGate::isShut()) [[unlikely]]
        lockAfterFork();
    } else {
      detail::ForkGate::pass();
      lock_.lock();
    }
  }

  /// Takes the lock and returns true. Returns false at once if any thread holds it, the caller included.
  [[nodiscard, gnu::always_inline]] bool tryLock() noexcept RT_TRY_ACQUIRE(true) {
    if constexpr (detail::SystemLock::kIsTakenOver) {
      detail::ForkGate::enter();
    } else {
      detail::ForkGate::pass();
    }
    const bool isTaken = lock_.tryLock();
    if (!isTaken) {
      detail::ForkGate::leave();
    } else if (detail::SystemLock::kIsTakenOver && detail::ForkGate::isShut()) [[unlikely]] {
      return tryLockAfterFork();
    }
    return isTaken;
  }

  /// Releases the lock. Ends the program if the caller does not hold it.
  [[gnu::always_inline]] void unlock() noexcept RT_RELEASE() {
    lock_.unlock();
    detail::ForkGate::leave();
  }

  /// Ends the program if the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) { lock_.assertOwner(); }

 private:
  // The caller has taken the lock while a fork is being made. These functions release the lock, wait for the
  // fork and take the lock again.
  [[gnu::cold]] void lockAfterFork() noexcept;
  [[gnu::cold]] bool tryLockAfterFork() noexcept;
  void waitForFork() noexcept;

  detail::SystemLock lock_;
};

static_assert(sizeof(UnfairLock) == 4);

/// Holds a lock until the end of a scope, also when an exception leaves it. The lock may be an `UnfairLock`,
/// a `LongLock`, a `RecursiveLock` or anything else with `lock` and `unlock`.
template <class Lock>
class RT_SCOPED_CAPABILITY [[nodiscard]] LockGuard {
 public:
  /// Takes `lock`, which must outlive the guard.
  [[gnu::always_inline]] explicit LockGuard(Lock& lock) RT_ACQUIRE(lock) : lock_(lock) { lock_.lock(); }
  [[gnu::always_inline]] ~LockGuard() RT_RELEASE() { lock_.unlock(); }
  LockGuard(const LockGuard&) = delete;
  LockGuard& operator=(const LockGuard&) = delete;

 private:
  Lock& lock_;
};

}  // namespace rt
