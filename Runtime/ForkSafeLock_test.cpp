#include "Runtime/ForkSafeLock.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <thread>
#include <vector>

namespace {

// What a lock guards: two numbers that are the same whenever it is free.
struct Pair {
  rt::ForkSafeLock lock;
  int first RT_GUARDED_BY(lock) = 0;
  int second RT_GUARDED_BY(lock) = 0;

  void change() {
    const rt::LockGuard guard(lock);
    ++first;
    std::this_thread::yield();
    ++second;
  }

  bool isWhole() {
    const rt::LockGuard guard(lock);
    return first == second;
  }
};

constinit Pair first;
constinit Pair second;
constinit Pair unused;

TEST(ForkSafeLock, KeepsThreadsApart) {
  static constinit Pair pair;
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      for (int j = 0; j < 1000; ++j) pair.change();
    });
  }
  for (std::thread& thread : threads) thread.join();
  const rt::LockGuard guard(pair.lock);
  EXPECT_EQ(pair.first, 4000);
  EXPECT_EQ(pair.second, 4000);
}

// Invariant: whatever the other threads were doing, all locks are free in the child, and what they guard is
// whole.
TEST(ForkSafeLock, IsFreeInTheChildOfAFork) {
  std::atomic<bool> isEnding = false;
  std::vector<std::thread> threads;
  for (Pair* const pair : {&first, &second}) {
    threads.emplace_back([&isEnding, pair] {
      while (!isEnding) pair->change();
    });
  }
  for (int i = 0; i < 100; ++i) {
    const pid_t child = fork();
    if (child == 0) {
      const bool isWhole = first.isWhole() && second.isWhole();
      first.change();
      unused.change();  // used by the child alone
      // In a child of the child, too.
      const pid_t grandchild = fork();
      if (grandchild == 0) _exit(first.isWhole() ? 0 : 1);
      int status = -1;
      waitpid(grandchild, &status, 0);
      _exit(isWhole && status == 0 ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }
  isEnding = true;
  for (std::thread& thread : threads) thread.join();
  EXPECT_TRUE(first.isWhole());
  EXPECT_TRUE(second.isWhole());
}

}  // namespace
