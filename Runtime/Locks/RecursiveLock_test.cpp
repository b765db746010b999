#include "Runtime/Locks/RecursiveLock.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <thread>
#include <vector>

#include "tests/support/ForkTest.h"

namespace {

using rt::LockGuard;
using rt::RecursiveLock;

// Not analysed: the analysis sees one function at a time and takes a second `lock` in it for a mistake.
#define NOT_ANALYSED [&]() RT_NO_THREAD_SAFETY_ANALYSIS

bool anotherThreadCanTake(RecursiveLock& lock) {
  bool taken = false;
  std::thread([&] {
    if (lock.tryLock()) {
      taken = true;
      lock.unlock();
    }
  }).join();
  return taken;
}

TEST(RecursiveLock, IsLockedAndUnlocked) {
  RecursiveLock lock;
  lock.lock();
  lock.assertOwner();
  EXPECT_FALSE(anotherThreadCanTake(lock));
  lock.unlock();
  EXPECT_TRUE(anotherThreadCanTake(lock));
}

TEST(RecursiveLock, IsFreeAfterTheLastUnlock) {
  RecursiveLock lock;
  const auto takeThreeTimes = NOT_ANALYSED {
    lock.lock();
    lock.lock();
    EXPECT_TRUE(lock.tryLock());
    lock.unlock();
    EXPECT_FALSE(anotherThreadCanTake(lock));
    lock.unlock();
    EXPECT_FALSE(anotherThreadCanTake(lock));
    lock.unlock();
    EXPECT_TRUE(anotherThreadCanTake(lock));
  };
  takeThreeTimes();
}

class Switchboard {
 public:
  void add() {
    LockGuard guard(lock_);
    ++count_;
  }
  void addTwice() {
    LockGuard guard(lock_);
    add();
    add();
  }
  int count() {
    LockGuard guard(lock_);
    return count_;
  }

 private:
  RecursiveLock lock_;
  int count_ RT_GUARDED_BY(lock_) = 0;
};

// Invariant: a thread makes both of its additions under one lock, so nobody ever sees an odd count.
TEST(RecursiveLock, ManyThreadsCountTogether) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 5'000;
  Switchboard switchboard;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < kRounds; ++round) {
        switchboard.addTwice();
        EXPECT_EQ(switchboard.count() % 2, 0);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(switchboard.count(), 2 * kThreads * kRounds);
}

#if !defined(__APPLE__)

TEST(RecursiveLock, TheForkingThreadHoldsItInTheChild) {
  RecursiveLock lock;
  const auto forkWithTheLock = NOT_ANALYSED {
    lock.lock();
    const pid_t child = fork();
    if (child == 0) {
      alarm(30);  // Ends the child if it hangs.
      lock.assertOwner();
      lock.lock();
      lock.unlock();
      lock.unlock();
      if (!lock.tryLock()) _exit(1);
      lock.unlock();
      _exit(0);
    }
    int status = 0;
    waitpid(child, &status, 0);
    lock.unlock();
    return status;
  };
  EXPECT_EQ(forkWithTheLock(), 0);
}

// In the child, the lock's depth is left over from the other thread, too.
TEST(RecursiveLock, IsFreeInAForkedChildIfAnotherThreadHeldIt) {
  RecursiveLock lock;
  struct Twice {
    void lock() RT_NO_THREAD_SAFETY_ANALYSIS {
      inner.lock();
      inner.lock();
    }
    void unlock() RT_NO_THREAD_SAFETY_ANALYSIS {
      inner.unlock();
      inner.unlock();
    }
    RecursiveLock& inner;
  } twice{lock};
  const HeldElsewhere holder(twice);
  EXPECT_EQ(statusOfChild(NOT_ANALYSED {
              if (!lock.tryLock()) return 1;
              lock.lock();
              lock.unlock();
              lock.assertOwner();
              lock.unlock();
              lock.lock();
              lock.unlock();
              // The thread sanitizer allows no new threads here.
              return RT_TEST_THREAD_SANITIZER || anotherThreadCanTake(lock) ? 0 : 2;
            }),
            0);
}

TEST(RecursiveLockDeathTest, UnlockingAFreeLockEndsTheProgram) {
  RecursiveLock lock;
  const auto letGo = NOT_ANALYSED {
    lock.unlock();
  };
  EXPECT_DEATH(letGo(), "is unlocked by thread [0-9]+, but no thread holds it");
}

TEST(RecursiveLockDeathTest, OneUnlockTooManyEndsTheProgram) {
  RecursiveLock lock;
  const auto letGoTwice = NOT_ANALYSED {
    lock.lock();
    lock.unlock();
    lock.unlock();
  };
  EXPECT_DEATH(letGoTwice(), "is unlocked by thread [0-9]+, but no thread holds it");
}

TEST(RecursiveLockDeathTest, UnlockingAnotherThreadsLockEndsTheProgram) {
  RecursiveLock lock;
  const auto letGoForeign = NOT_ANALYSED {
    lock.lock();
    std::thread([&]() RT_NO_THREAD_SAFETY_ANALYSIS { lock.unlock(); }).join();
  };
  EXPECT_DEATH(letGoForeign(), "is unlocked by thread [0-9]+, but thread [0-9]+ holds it");
}

TEST(RecursiveLockDeathTest, AssertingAFreeLockEndsTheProgram) {
  RecursiveLock lock;
  EXPECT_DEATH(lock.assertOwner(), "is needed by thread [0-9]+, but no thread holds it");
}

#endif

}  // namespace
