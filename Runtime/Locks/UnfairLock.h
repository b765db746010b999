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
///       int value_ RT_GUARDED_BY(lock_) = 0;    // Runtime/Base/ThreadSafety.h
///     };
///
/// A thread that waits spins for a moment and then sleeps. Who comes first when the lock is let go is
/// not defined, so a thread that lets it go and takes it again at once may well get it. A thread that
/// takes a lock it holds, and one that lets go a lock it does not hold, ends the program with a line on
/// standard error that names lock and thread.
///
/// The lock itself needs no memory. The first that a thread takes has the thread library note the thread's
/// end, which allocates in a process with many keys.
///
/// Constant-initialised: a lock at namespace scope is ready before anything runs, and needs nothing at exit.
///
/// Fork. A fork waits until no other thread holds a lock of this kind. So all of them are free in the child,
/// but those of the thread that forked, and what they guard is whole. (On macOS the child cannot let go what
/// that thread held.) A fork waits for about a second at most. A lock that is still held then is free in the
/// child. What it guards is as its holder left it. On macOS it stays held then.
///
/// Not for: what takes long, such as system calls that wait and code of others
/// (Runtime/Locks/Private/LongLock.h); locks that a thread takes again while it holds them
/// (Runtime/Locks/RecursiveLock.h); waiting for a condition, for which a queue is better
/// (Runtime/Queues/Queue.h).

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
  /// Not held.
  constexpr UnfairLock() noexcept = default;
  UnfairLock(const UnfairLock&) = delete;
  UnfairLock& operator=(const UnfairLock&) = delete;

  /// Takes the lock, after waiting until no thread holds it. Ends the program when the caller holds it.
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

  /// Takes the lock and returns true, or returns false at once when any thread, the caller included,
  /// holds it.
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

  /// Lets the lock go. Ends the program when the caller does not hold it.
  [[gnu::always_inline]] void unlock() noexcept RT_RELEASE() {
    lock_.unlock();
    detail::ForkGate::leave();
  }

  /// Ends the program when the caller does not hold the lock.
  void assertOwner() const noexcept RT_ASSERT_CAPABILITY(this) { lock_.assertOwner(); }

 private:
  // The lock has been taken while a fork is being made: it is let go, and taken when that is done.
  [[gnu::cold]] void lockAfterFork() noexcept;
  [[gnu::cold]] bool tryLockAfterFork() noexcept;
  void waitForFork() noexcept;

  detail::SystemLock lock_;
};

static_assert(sizeof(UnfairLock) == 4);

/// Holds a lock for as long as a scope lasts, however it is left. For `UnfairLock`, `LongLock`,
/// `RecursiveLock` and what else has `lock` and `unlock`.
template <class Lock>
class RT_SCOPED_CAPABILITY [[nodiscard]] LockGuard {
 public:
  /// Takes `lock`, which outlives the guard.
  [[gnu::always_inline]] explicit LockGuard(Lock& lock) RT_ACQUIRE(lock) : lock_(lock) { lock_.lock(); }
  [[gnu::always_inline]] ~LockGuard() RT_RELEASE() { lock_.unlock(); }
  LockGuard(const LockGuard&) = delete;
  LockGuard& operator=(const LockGuard&) = delete;

 private:
  Lock& lock_;
};

}  // namespace rt
