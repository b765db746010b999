// Forks while other threads hold, take and wait for locks.
#include "Runtime/Locks/Private/ForkGate.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdint>
#include <set>
#include <thread>
#include <vector>

#include "Runtime/Locks/UnfairLock.h"
#include "tests/support/ForkTest.h"

namespace {

using rt::LockGuard;
using rt::UnfairLock;

// Two numbers that a lock guards. They are equal whenever the lock is free.
struct Pair {
  UnfairLock lock;
  int first RT_GUARDED_BY(lock) = 0;
  int second RT_GUARDED_BY(lock) = 0;

  void change() {
    const LockGuard guard(lock);
    ++first;
    std::this_thread::yield();
    ++second;
  }

  bool isWhole() {
    const LockGuard guard(lock);
    return first == second;
  }
};

// A lock under which other locks are taken, like that of a registry.
struct Nest {
  UnfairLock lock;
  std::array<Pair, 2> pairs;

  void change() {
    const LockGuard guard(lock);
    for (Pair& each : pairs) each.change();
  }
};

std::uint32_t heldLocks() {
  return rt::detail::ForkGate::heldLocks();
}

// Invariant: whatever the other threads were doing, all locks are free in the child, and the data that they
// guard is whole.
TEST(ForkGate, FreesAllLocksInTheChildAndKeepsTheirDataWhole) {
  std::array<Pair, 3> pairs;
  Nest nest;
  std::atomic<bool> isEnding = false;
  std::vector<std::thread> threads;
  threads.reserve(4);
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&, i] {
      while (!isEnding) {
        // Two threads use each pair, so that some wait for each other.
        pairs.at(static_cast<std::size_t>(i / 2)).change();
        nest.change();
      }
    });
  }
  int status = 0;
  for (int i = 0; i < 200 && status == 0; ++i) {
    status = statusOfChild([&] {
      bool isWhole = true;
      for (Pair& each : pairs) isWhole = each.isWhole() && isWhole;
      for (Pair& each : nest.pairs) isWhole = each.isWhole() && isWhole;
      for (Pair& each : pairs) each.change();  // Only children use the last pair.
      nest.change();
      // The locks are free in a child of the child, too.
      const bool isUsableInGrandchild = statusOfChild([&] {
                                          nest.change();
                                          return 0;
                                        }) == 0;
      return isWhole && isUsableInGrandchild && heldLocks() == 0 ? 0 : 1;
    });
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(status, 0);
  for (Pair& each : pairs) EXPECT_TRUE(each.isWhole());
  EXPECT_EQ(heldLocks(), 0U);
}

// A lock that stays held for longer than the fork waits is free in the child nevertheless.
TEST(ForkGate, FreesALockThatIsHeldForTooLongInTheChild) {
  if (RT_TEST_IS_APPLE) GTEST_SKIP() << "the system's lock stays held";
  UnfairLock lock;
  const HeldElsewhere holder(lock);
  EXPECT_EQ(statusOfChild([&]() RT_NO_THREAD_SAFETY_ANALYSIS {
              if (!lock.tryLock()) return 1;
              lock.unlock();
              const LockGuard guard(lock);
              return 0;
            }),
            0);
  EXPECT_FALSE([&]() RT_NO_THREAD_SAFETY_ANALYSIS { return lock.tryLock(); }())
      << "the parent's is still held";
}

// A lock that stays held is free in the child even if a thread of the parent waits for it. Several threads of
// the child want it.
TEST(ForkGate, AnAbandonedLockKeepsThreadsApartInTheChild) {
  if (RT_TEST_IS_APPLE || RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "no new threads in the child here";
  Pair pair;
  std::atomic<bool> isWaiting = false;
  const HeldElsewhere holder(pair.lock);
  // The waiting thread sets the lock's bit for waiting threads.
  std::thread waiter([&] {
    isWaiting = true;
    const LockGuard guard(pair.lock);
  });
  while (!isWaiting) std::this_thread::yield();
  EXPECT_EQ(statusOfChild([&] {
              std::array<std::thread, 3> threads;
              for (std::thread& each : threads) {
                each = std::thread([&] {
                  for (int i = 0; i < 1000; ++i) pair.change();
                });
              }
              for (std::thread& each : threads) each.join();
              const LockGuard guard(pair.lock);
              return pair.first == 3000 && pair.second == 3000 ? 0 : 1;
            }),
            0);
  holder.letGo();
  waiter.join();
}

// Two threads fork at the same time. Each has a lock of its own that the other's fork waits for.
TEST(ForkGate, LetsTwoThreadsForkAtTheSameTime) {
  std::array<Pair, 2> pairs;
  std::array<std::thread, 2> threads;
  std::atomic<int> failures = 0;
  for (std::size_t i = 0; i < 2; ++i) {
    threads.at(i) = std::thread([&, i] {
      for (int round = 0; round < 50; ++round) {
        pairs.at(i).change();
        const int status = statusOfChild([&] { return pairs[0].isWhole() && pairs[1].isWhole() ? 0 : 1; });
        if (status != 0) ++failures;
      }
    });
  }
  for (std::thread& each : threads) each.join();
  EXPECT_EQ(failures, 0);
}

TEST(ForkGate, AThreadKeepsItsLockInTheChildThatItForks) {
  Pair pair;
  const LockGuard guard(pair.lock);
  EXPECT_EQ(heldLocks(), 1U);
  EXPECT_EQ(statusOfChild([] { return heldLocks() == 1 ? 0 : 1; }), 0);
  EXPECT_EQ(heldLocks(), 1U);
}

// Threads start and end while others fork. The destructors at the end of each thread take locks.
TEST(ForkGate, CountsLocksOfThreadsUntilTheyHaveEnded) {
  static constinit Pair pair;
  struct AtEnd {
    ~AtEnd() { pair.change(); }
  };
  pthread_key_t key{};
  ASSERT_EQ(pthread_key_create(&key, [](void*) { pair.change(); }), 0);
  std::atomic<bool> isEnding = false;
  std::array<std::thread, 2> starters;
  for (std::thread& each : starters) {
    each = std::thread([&] {
      while (!isEnding) {
        std::thread([&] {
          static thread_local const AtEnd atEnd;
          static_cast<void>(&atEnd);
          pthread_setspecific(key, &pair);
        }).join();
      }
    });
  }
  int status = 0;
  for (int i = 0; i < 200 && status == 0; ++i) {
    status = statusOfChild([] { return pair.isWhole() ? 0 : 1; });
  }
  isEnding = true;
  for (std::thread& each : starters) each.join();
  EXPECT_EQ(status, 0);
  pthread_key_delete(key);
}

// A fork used to follow a list into the memory of threads that had ended, and never returned.
TEST(ForkGate, IgnoresEndedThreadsWhoseFirstLockCameLate) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer allows no new threads in the child";
  static constinit UnfairLock lock;
  static constinit pthread_key_t key{};
  // Takes its first lock in the last round of destructors that the system makes, or in an earlier one.
  const auto end = [](void* value) {
    const auto rounds = reinterpret_cast<std::intptr_t>(value);
    if (rounds > 1) {
      pthread_setspecific(key, reinterpret_cast<void*>(rounds - 1));
    } else {
      const LockGuard guard(lock);
    }
  };
  ASSERT_EQ(pthread_key_create(&key, end), 0);
  EXPECT_EQ(statusOfChild([] {
              for (std::intptr_t rounds = 1; rounds <= PTHREAD_DESTRUCTOR_ITERATIONS; ++rounds) {
                for (int i = 0; i < 3; ++i) {
                  std::thread([&] { pthread_setspecific(key, reinterpret_cast<void*>(rounds)); }).join();
                }
              }
              return statusOfChild([] { return 0; });
            }),
            0);
  pthread_key_delete(key);
}

TEST(ForkGate, ReusesThePlaceOfAThreadThatHasEnded) {
  static constinit UnfairLock lock;
  std::set<const void*> places;
  for (int i = 0; i < 100; ++i) {
    std::thread([&] {
      const LockGuard guard(lock);
      places.insert(rt::detail::currentThread.lockCount.load());
    }).join();
  }
  EXPECT_EQ(places.size(), 1U);
}

// Regression: macOS frees a thread's variables before the last destructors of the thread, which may lock. The
// thread then took another place, and the first one was lost. The test frees the variable itself.
TEST(ForkGate, KeepsThePlaceOfAThreadWhoseVariablesAreGone) {
  std::thread([] {
    UnfairLock lock;
    const auto placeAfterLocking = [&lock] {
      const LockGuard guard(lock);
      return rt::detail::currentThread.lockCount.load();
    };
    const auto* const place = placeAfterLocking();
    rt::detail::currentThread.lockCount = nullptr;
    EXPECT_EQ(placeAfterLocking(), place);
  }).join();
}

// Starts more threads than there are places in the first page.
TEST(ForkGate, WaitsForTheLocksOfManyThreads) {
  std::vector<Pair> pairs(200);
  std::atomic<bool> isEnding = false;
  std::atomic<std::size_t> started = 0;
  std::vector<std::thread> threads;
  threads.reserve(pairs.size());
  for (Pair& each : pairs) {
    threads.emplace_back([&] {
      each.change();
      for (++started; !isEnding;) each.change();
    });
  }
  while (started < pairs.size()) std::this_thread::yield();
  int status = 0;
  for (int i = 0; i < 20 && status == 0; ++i) {
    status = statusOfChild([&] {
      bool isWhole = true;
      for (Pair& each : pairs) isWhole = each.isWhole() && isWhole;
      return isWhole ? 0 : 1;
    });
  }
  isEnding = true;
  for (std::thread& each : threads) each.join();
  EXPECT_EQ(status, 0);
}

// A fork handler that is registered before the gate's, so that it runs while the gate is shut.
constinit std::atomic<std::atomic<bool>*> forkWaitsFor = nullptr;
constinit std::atomic<bool> isForkWaiting = false;

[[gnu::constructor(101)]] void registerEarlyHandler() {
  pthread_atfork(
      [] {
        const std::atomic<bool>* const event = forkWaitsFor.load();
        if (event == nullptr) return;
        isForkWaiting = true;
        isForkWaiting.notify_all();
        event->wait(false);
      },
      nullptr, nullptr);
}

// The handler waits for a thread that waits at the gate. This used to deadlock.
TEST(ForkGate, OpensForAThreadThatTheForkItselfWaitsFor) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer allows no new threads in the child";
  EXPECT_EQ(statusOfChild([] {
              static constinit UnfairLock lock;
              static constinit std::atomic<bool> hasLocked = false;
              forkWaitsFor = &hasLocked;
              std::thread thread([] {
                isForkWaiting.wait(false);
                for (int i = 0; i < 1000; ++i) {
                  const LockGuard guard(lock);
                }
                hasLocked = true;
                hasLocked.notify_all();
              });
              const int status = statusOfChild([] {
                const LockGuard guard(lock);
                return 0;
              });
              thread.join();
              return status;
            }),
            0);
}

TEST(ForkGate, LeavesErrnoAlone) {
  errno = E2BIG;
  EXPECT_EQ(statusOfChild([] { return errno == E2BIG ? 0 : 1; }), 0);
}

}  // namespace
