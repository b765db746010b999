#include "Runtime/Locks/LongLock.h"

#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <thread>

#include "Runtime/Locks/ForkGate.h"
#include "tests/support/ForkTest.h"

namespace {

using rt::LockGuard;
using rt::LongLock;

static_assert(sizeof(LongLock) == 4);
constinit LongLock lockAtNamespaceScope;

// Not analysed: death tests end the program on purpose, and other tests try a lock twice. The analysis cannot
// know that.
#define NOT_ANALYSED [&]() RT_NO_THREAD_SAFETY_ANALYSIS

TEST(LongLock, IsLockedAndUnlocked) {
  lockAtNamespaceScope.lock();
  lockAtNamespaceScope.assertOwner();
  lockAtNamespaceScope.unlock();
  const auto tryTwice = NOT_ANALYSED {
    LongLock lock;
    EXPECT_TRUE(lock.tryLock());
    EXPECT_FALSE(lock.tryLock());
    EXPECT_FALSE(lock.isAbandoned());
    lock.unlock();
    EXPECT_FALSE(lock.isAbandoned());
  };
  tryTwice();
}

TEST(LongLock, KeepsThreadsApart) {
  LongLock lock;
  int value = 0;
  std::array<std::thread, 4> threads;
  for (std::thread& each : threads) {
    each = std::thread([&] {
      for (int i = 0; i < 5000; ++i) {
        const LockGuard guard(lock);
        value = value + 1;
      }
    });
  }
  for (std::thread& each : threads) each.join();
  EXPECT_EQ(value, 20'000);
}

TEST(LongLock, IsNotCountedForForks) {
  LongLock lock;
  const LockGuard guard(lock);
  EXPECT_EQ(rt::detail::ForkGate::heldLocks(), 0U);
}

TEST(LongLock, IsFreeInAForkedChildIfAnotherThreadHeldIt) {
  LongLock lock;
  const HeldElsewhere holder(lock);
  EXPECT_FALSE(lock.isAbandoned());
  EXPECT_EQ(statusOfChild(NOT_ANALYSED {
              if (!lock.isAbandoned()) return 1;
              if (!lock.tryLock()) return 2;
              if (lock.isAbandoned()) return 3;
              lock.unlock();
              return 0;
            }),
            0);
  EXPECT_EQ(statusOfChild(NOT_ANALYSED {
              const LockGuard guard(lock);
              lock.assertOwner();
              return 0;
            }),
            0);
}

TEST(LongLock, TheForkingThreadKeepsItThroughGenerations) {
  LongLock lock;
  const LockGuard guard(lock);
  EXPECT_EQ(statusOfChild(NOT_ANALYSED {
              lock.assertOwner();
              const int status = statusOfChild(NOT_ANALYSED {
                if (lock.isAbandoned()) return 1;
                lock.unlock();
                lock.lock();
                return 0;
              });
              lock.unlock();
              return status;
            }),
            0);
  lock.assertOwner();
}

// In the child, the forking thread holds the lock, so no other thread can take it. If another thread of the
// child forks, the holder does not exist in the grandchild.
TEST(LongLock, IsFreeInAGrandchildIfItsHolderIsGone) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer allows no new threads in the child";
  LongLock lock;
  LongLock other;
  const LockGuard guard(lock);
  EXPECT_EQ(statusOfChild(NOT_ANALYSED {
              int status = -1;
              std::thread([&]() RT_NO_THREAD_SAFETY_ANALYSIS {
                if (lock.isAbandoned() || lock.tryLock()) {
                  status = 10;
                  return;
                }
                const LockGuard otherGuard(other);
                status = statusOfChild(NOT_ANALYSED {
                  other.assertOwner();
                  if (!lock.isAbandoned()) return 1;
                  lock.lock();
                  return 0;
                });
              }).join();
              return status;
            }),
            0);
}

TEST(LongLock, ItsHolderKeepsItThroughALongLineOfForks) {
  LongLock lock;
  LongLock free;
  const LockGuard guard(lock);
  const std::function<int(int)> descend = [&](int generations) {
    lock.assertOwner();
    const LockGuard freeGuard(free);
    return generations == 0 ? 0 : statusOfChild([&]() RT_NO_THREAD_SAFETY_ANALYSIS {
      free.unlock();
      const int status = descend(generations - 1);
      free.lock();
      return status;
    });
  };
  EXPECT_EQ(descend(20), 0);
}

TEST(LongLockDeathTest, MisuseEndsTheProgram) {
  LongLock lock;
  EXPECT_DEATH((NOT_ANALYSED {
                 lock.lock();
                 lock.lock();
               })(),
               "is taken again by thread [0-9]+, which holds it");
  EXPECT_DEATH((NOT_ANALYSED { lock.unlock(); })(), "is unlocked by thread [0-9]+, but no thread holds it");
  const HeldElsewhere holder(lock);
  EXPECT_DEATH((NOT_ANALYSED { lock.unlock(); })(),
               "is unlocked by thread [0-9]+, but thread [0-9]+ holds it");
}

}  // namespace
