#pragma once

// What keeps the data of locks whole across a fork. For Runtime/Locks/UnfairLock.h and
// Runtime/Locks/Private/ThreadIdentifier.h.
//
// The child of a fork has one thread, and the memory as it was at that moment: a lock that another thread
// held stays held there, and what it guards may be half changed. So a fork waits until no other thread holds
// one. Every thread counts the locks that it holds, in a place of its own. A fork shuts the gate, and waits
// until the counts of all other threads are 0. It opens the gate afterwards, in both processes. A thread that
// wants its first lock meanwhile waits at the gate. One that holds a lock may take more, so that it gets
// done. One that sleeps until its first lock is free does not count.
//
// A lock costs two writes to the thread's place for that, and a look at a variable that hardly ever changes.
// The alternative is a list of all locks: it needs a place in each lock and a lock of its own, and locks come
// and go with objects.
//
// A fork waits for about a second at most. After that, a lock that is still held is free in the child
// nevertheless, since its holder is known to be gone there (Runtime/Locks/Private/OwnerLock.h).
//
// A thread waits at the gate for about two seconds at most, and then opens it. The fork may be waiting for
// that thread: a handler of the host's that prepares forks, and was registered before the gate's, runs while
// the gate is shut, and may want what the thread has.
//
// A program and a shared library may both bring this file. Either they share its variables, which are all
// external, and the first that is loaded registers the fork handlers for both. Or each has its own gate: a
// fork shuts one after the other, and a thread with locks of both may have the fork and itself wait until
// patience ends.

#include <atomic>
#include <cstdint>

#include "Runtime/Locks/Private/ThreadIdentifier.h"

namespace rt::detail {

class ForkGate {
 public:
  /// Counts a lock that the calling thread is about to take, or has let go.
  [[gnu::always_inline]] static void enter() noexcept {
    std::atomic<std::uint32_t>* count = currentThread.lockCount.load(std::memory_order_relaxed);
    if (count == nullptr) [[unlikely]]
      count = &beginCounting();
    count->store(count->load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
  }
  [[gnu::always_inline]] static void leave() noexcept {
    std::atomic<std::uint32_t>& count = *currentThread.lockCount.load(std::memory_order_relaxed);
    count.store(count.load(std::memory_order_relaxed) - 1, std::memory_order_release);
  }

  /// Whether the calling thread, which has counted and taken a lock, has to let it go and to wait. Taking it
  /// was an atomic read-modify-write with release order: either the fork sees the count, or this the gate.
  [[gnu::always_inline]] static bool isShut() noexcept {
#if !defined(__x86_64__)
    // There, the read-modify-write is a barrier as it is.
    std::atomic_thread_fence(std::memory_order_seq_cst);
#endif
    return shutFor_.load(std::memory_order_relaxed) != 0 && heldLocks() == 1;
  }

  /// Counts a lock that the calling thread is about to take, once no fork is being made. For locks that
  /// nobody can free in the child: unlike with `isShut`, a thread that waits does not take them for a moment.
  static void pass() noexcept;

  /// Returns when the gate is open or has been opened once. The caller holds no lock that counts.
  [[gnu::cold]] static void wait() noexcept;

  /// How many locks the calling thread has counted.
  static std::uint32_t heldLocks() noexcept {
    const std::atomic<std::uint32_t>* count = currentThread.lockCount.load(std::memory_order_relaxed);
    return count != nullptr ? count->load(std::memory_order_relaxed) : 0;
  }

  /// Has the system tell of forks, if it does not yet. Returns whether it does.
  static bool registerHandlers() noexcept;

  /// The token of a thread of this process that has `number`, which is below 2^22.
  static ThreadToken tokenOf(std::uint32_t number) noexcept;

  /// The number in a token.
  static std::uint32_t numberOf(ThreadToken token) noexcept;

  /// See `rt::isThreadGone`.
  static bool isGone(ThreadToken token) noexcept;

 private:
  struct Forks;
  struct Place;
  struct Places;

  [[gnu::cold]] static std::atomic<std::uint32_t>& beginCounting() noexcept;
  static Place* takePlace() noexcept;
  static void giveBack(Place& place, std::atomic<std::uint32_t>* next) noexcept;
  static void threadEnds(void* place) noexcept;
  static bool isAnyLockHeldElsewhere() noexcept;
  static void prepare() noexcept;
  static void open() noexcept;
  static void continueInParent() noexcept;
  static void continueInChild() noexcept;

  // While a fork is being made, from when it waits, its number; 0 otherwise.
  static constinit std::atomic<std::uint32_t> shutFor_;
  // How many forks lie between the first process and this one, modulo 2^9.
  static constinit std::atomic<std::uint32_t> generation_;
  // Of the thread that has made this process by a fork; 0 in one that was not made so.
  static constinit std::atomic<ThreadToken> survivor_;
  static Forks forks_;
  static Places places_;
};

}  // namespace rt::detail
