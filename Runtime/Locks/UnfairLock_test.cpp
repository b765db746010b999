#include "Runtime/Locks/UnfairLock.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"

namespace {

using rt::LockGuard;
using rt::UnfairLock;

static_assert(sizeof(UnfairLock) == 4);
static_assert(noexcept(UnfairLock()));

constinit UnfairLock lockAtNamespaceScope;

// Not analysed: death tests end the program on purpose, which the analysis cannot know.
#define NOT_ANALYSED [&]() RT_NO_THREAD_SAFETY_ANALYSIS

TEST(UnfairLock, IsLockedAndUnlocked) {
  UnfairLock lock;
  lock.lock();
  lock.assertOwner();
  lock.unlock();
  lock.lock();
  lock.unlock();
}

TEST(UnfairLock, AtNamespaceScopeNeedsNoInitialisation) {
  LockGuard guard(lockAtNamespaceScope);
  lockAtNamespaceScope.assertOwner();
}

TEST(UnfairLock, TryLockTakesAFreeLock) {
  UnfairLock lock;
  ASSERT_TRUE(lock.tryLock());
  lock.assertOwner();
  lock.unlock();
}

TEST(UnfairLock, TryLockFailsIfAnotherThreadHoldsTheLock) {
  UnfairLock lock;
  LockGuard guard(lock);
  std::thread([&] {
    if (lock.tryLock()) {
      lock.unlock();
      ADD_FAILURE() << "two threads hold the lock";
    }
  }).join();
}

TEST(UnfairLock, TryLockFailsIfTheCallerHoldsTheLock) {
  UnfairLock lock;
  const auto tryTwice = NOT_ANALYSED {
    lock.lock();
    EXPECT_FALSE(lock.tryLock());
    lock.unlock();
  };
  tryTwice();
}

TEST(UnfairLock, GuardUnlocksWhenAnExceptionPasses) {
  UnfairLock lock;
  try {
    LockGuard guard(lock);
    throw std::out_of_range("passes");
  } catch (const std::out_of_range& exception) {
    EXPECT_STREQ(exception.what(), "passes");
  }
  ASSERT_TRUE(lock.tryLock());
  lock.unlock();
}

TEST(UnfairLock, WorksWithTheStandardGuards) {
  UnfairLock lock;
  {
    std::lock_guard guard(lock);
    lock.assertOwner();
  }
  ASSERT_TRUE(lock.tryLock());
  lock.unlock();
}

// Invariant: only the holder touches `value`. So no increment is lost, and the thread sanitizer sees no race.
// There are more threads than processors, so that threads sleep and are woken.
TEST(UnfairLock, ManyThreadsCountTogether) {
  constexpr int kThreads = 8;
  constexpr int kRounds = 20'000;
  UnfairLock lock;
  int value = 0;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < kRounds; ++round) {
        LockGuard guard(lock);
        value = value + 1;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(value, kThreads * kRounds);
}

// Invariant: at most one thread is inside. The holder yields the processor, so that every other thread falls
// asleep at the lock. Exactly one unlock has to wake each of them.
TEST(UnfairLock, WakesSleepingThreadsOneAfterTheOther) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 300;
  UnfairLock lock;
  std::atomic<int> inside = 0;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < kRounds; ++round) {
        LockGuard guard(lock);
        EXPECT_EQ(inside.fetch_add(1), 0);
        for (int give = 0; give < 3; ++give) std::this_thread::yield();
        inside.fetch_sub(1);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

TEST(UnfairLock, LeavesErrnoAloneWhileItWaits) {
  UnfairLock lock;
  std::atomic<bool> isHeld = false;
  std::thread holder([&] {
    LockGuard guard(lock);
    isHeld = true;
    for (int give = 0; give < 1000; ++give) std::this_thread::yield();
  });
  while (!isHeld) std::this_thread::yield();
  errno = E2BIG;
  lock.lock();
  EXPECT_EQ(errno, E2BIG);
  lock.unlock();
  EXPECT_EQ(errno, E2BIG);
  holder.join();
}

#if !defined(__APPLE__)

// Returns the object's address as %p prints it, for patterns.
std::string addressOf(const void* object) {
  std::array<char, 32> text{};
  std::snprintf(text.data(), text.size(), "%p", object);
  return text.data();
}

TEST(UnfairLockDeathTest, LockingTwiceEndsTheProgram) {
  UnfairLock lock;
  const auto takeTwice = NOT_ANALYSED {
    lock.lock();
    lock.lock();
  };
  EXPECT_DEATH(takeTwice(),
               "rt: the lock at " + addressOf(&lock) + " is taken again by thread [0-9]+, which holds it");
}

TEST(UnfairLockDeathTest, UnlockingAFreeLockEndsTheProgram) {
  UnfairLock lock;
  const auto letGo = NOT_ANALYSED {
    lock.unlock();
  };
  EXPECT_DEATH(letGo(), "rt: the lock at " + addressOf(&lock) +
                            " is unlocked by thread [0-9]+, but no thread holds it");
}

TEST(UnfairLockDeathTest, UnlockingAnotherThreadsLockEndsTheProgram) {
  UnfairLock lock;
  const auto letGoForeign = NOT_ANALYSED {
    lock.lock();
    std::thread([&]() RT_NO_THREAD_SAFETY_ANALYSIS { lock.unlock(); }).join();
  };
  EXPECT_DEATH(letGoForeign(), "rt: the lock at " + addressOf(&lock) +
                                   " is unlocked by thread [0-9]+, but thread [0-9]+ holds it");
}

TEST(UnfairLockDeathTest, AssertingAFreeLockEndsTheProgram) {
  UnfairLock lock;
  EXPECT_DEATH(lock.assertOwner(),
               "rt: the lock at " + addressOf(&lock) + " is needed by thread [0-9]+, but no thread holds it");
}

TEST(UnfairLockDeathTest, AssertingAnotherThreadsLockEndsTheProgram) {
  UnfairLock lock;
  LockGuard guard(lock);
  const auto assertElsewhere = [&] { std::thread([&] { lock.assertOwner(); }).join(); };
  EXPECT_DEATH(assertElsewhere(), "is needed by thread [0-9]+, but thread [0-9]+ holds it");
}

// Runs `body` in a forked child. Returns the child's exit status, or -1 if it did not exit.
template <class Body>
int exitStatusOfChild(Body body) {
  const pid_t child = fork();
  if (child == 0) {
    body();
    _exit(testing::Test::HasFailure() ? 1 : 0);
  }
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

TEST(UnfairLock, TheForkingThreadHoldsItInTheChild) {
  UnfairLock lock;
  LockGuard guard(lock);
  EXPECT_EQ(0, exitStatusOfChild(NOT_ANALYSED {
              lock.assertOwner();
              lock.unlock();
              lock.lock();
              lock.unlock();
            }));
  lock.assertOwner();
}

TEST(UnfairLockDeathTest, LockingTwiceInAForkedChildEndsTheProgram) {
  UnfairLock lock;
  const auto takeInChild = NOT_ANALYSED {
    lock.lock();
    if (fork() == 0) {
      lock.lock();
      _exit(0);
    }
    int status = 0;
    wait(&status);
    if (WIFSIGNALED(status) && WTERMSIG(status) == SIGABRT) abort();
  };
  EXPECT_DEATH(takeInChild(), "is taken again by thread [0-9]+, which holds it");
}

#endif

}  // namespace
