#pragma once

// Keeps the data that locks guard whole across a fork. Used by Runtime/Locks/UnfairLock.h and
// Runtime/Locks/ThreadIdentifier.h.
//
// The child of a fork has one thread and a copy of the memory. A lock that another thread held stays held
// there. The data that it guards may be half changed. So a fork waits until no other thread holds a lock.
//
// Every thread counts the locks that it holds, in a place of its own. A fork shuts the gate and waits until
// the counts of all other threads are 0. Afterwards it opens the gate, in both processes. While the gate is
// shut, a thread that wants its first lock waits. A thread that holds a lock may take more, so that it can
// finish. A thread that sleeps until its first lock is free is not counted.
//
// This costs each lock two writes to the thread's place, and a read of a variable that hardly ever changes.
// The alternative is a list of all locks. It would need a place in each lock and a lock of its own, and locks
// come and go with objects.
//
// A fork waits for about a second at most. A lock that is still held then is free in the child nevertheless.
// The child knows that the lock's holder is gone (Runtime/Locks/OwnerLock.h).
//
// A thread waits at the gate for about two seconds at most, and then opens it. The fork may be waiting for
// that thread. An example is a host that registered a fork handler before the gate did. That handler runs
// while the gate is shut, and may need something that the thread has.
//
// A program and a shared library may both contain this code. Its variables are all external, so the two may
// share them. Then the one that is loaded first registers the fork handlers for both. Otherwise each has its
// own gate, and a fork shuts one after the other. A fork and a thread with locks of both may then wait for
// each other until one of them gives up.

#include <atomic>
#include <cstdint>

#include "Runtime/Locks/ThreadIdentifier.h"

namespace rt::detail {

class ForkGate {
 public:
  // `enter` counts a lock that the calling thread is about to take. `leave` subtracts a lock that it has
  // released.
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

  // Returns whether the calling thread has to release its lock and wait for a fork. Precondition: the thread
  // has counted the lock and taken it. Taking it was an atomic read-modify-write with release order. So
  // either the fork sees the count, or this function sees that the gate is shut.
  [[gnu::always_inline]] static bool isShut() noexcept {
#if !defined(__x86_64__)
    // On x86-64 the read-modify-write is a full barrier already.
    std::atomic_thread_fence(std::memory_order_seq_cst);
#endif
    return shutFor_.load(std::memory_order_relaxed) != 0 && heldLocks() == 1;
  }

  // Waits until no fork is being made, and counts a lock that the calling thread is about to take. For locks
  // that nobody can free in the child. Unlike with `isShut`, a thread that waits never holds the lock, not
  // even for a moment.
  static void pass() noexcept;

  // Returns once the gate is open, or has been opened since the call. Precondition: the caller holds no
  // counted lock.
  [[gnu::cold]] static void wait() noexcept;

  // Returns how many locks the calling thread has counted.
  static std::uint32_t heldLocks() noexcept {
    const std::atomic<std::uint32_t>* count = currentThread.lockCount.load(std::memory_order_relaxed);
    return count != nullptr ? count->load(std::memory_order_relaxed) : 0;
  }

  // Registers the fork handlers, if they are not registered yet. Returns whether they are registered.
  static bool registerHandlers() noexcept;

  // Returns the token of the thread of this process that has `number`, which is below 2^22.
  static ThreadToken tokenOf(std::uint32_t number) noexcept;

  // Returns the number in `token`.
  static std::uint32_t numberOf(ThreadToken token) noexcept;

  // See `rt::isThreadGone`.
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

  // The number of the fork that is being made, from when it starts to wait. 0 if no fork is being made.
  static constinit std::atomic<std::uint32_t> shutFor_;
  // The number of forks between the first process and this one, modulo 2^9.
  static constinit std::atomic<std::uint32_t> generation_;
  // The token of the thread that made this process by a fork. 0 if no fork made it.
  static constinit std::atomic<ThreadToken> survivor_;
  static Forks forks_;
  static Places places_;
};

}  // namespace rt::detail
