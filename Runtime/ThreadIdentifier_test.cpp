#include "Runtime/ThreadIdentifier.h"

#include <gtest/gtest.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <latch>
#include <set>
#include <thread>
#include <vector>

namespace {

TEST(ThreadIdentifier, IsTheSystemsAndStays) {
  const rt::ThreadIdentifier identifier = rt::currentThreadIdentifier();
  EXPECT_EQ(identifier, rt::detail::systemThreadIdentifier());
  EXPECT_EQ(identifier, rt::currentThreadIdentifier());
  EXPECT_NE(identifier, 0U);
  EXPECT_LT(identifier, 0x80000000U);
}

TEST(ThreadIdentifier, DiffersBetweenThreadsThatAreAlive) {
  constexpr int kThreads = 16;
  std::vector<rt::ThreadIdentifier> identifiers(kThreads);
  std::latch allHaveAsked(kThreads);
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (rt::ThreadIdentifier& identifier : identifiers) {
    threads.emplace_back([&] {
      identifier = rt::currentThreadIdentifier();
      allHaveAsked.arrive_and_wait();
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::set<rt::ThreadIdentifier> different(identifiers.begin(), identifiers.end());
  different.insert(rt::currentThreadIdentifier());
  EXPECT_EQ(different.size(), kThreads + 1U);
}

TEST(ThreadIdentifier, OnlyTheMainThreadIsMain) {
  EXPECT_TRUE(rt::isMainThread());
  bool isMain = true;
  std::thread([&] { isMain = rt::isMainThread(); }).join();
  EXPECT_FALSE(isMain);
}

/// Forks in the calling thread; 0 when the child knows its own identifier, the one its thread had in the
/// parent, and that it is the main thread now.
int statusOfForkedChild() {
  const rt::ThreadIdentifier inParent = rt::currentThreadIdentifier();
  const pid_t child = fork();
  if (child == 0) {
    if (rt::currentThreadIdentifier() != rt::detail::systemThreadIdentifier()) _exit(1);
    if (rt::currentThreadIdentifier() == inParent) _exit(2);
    if (!rt::isOrWasCurrentThread(inParent)) _exit(3);
    if (!rt::isMainThread()) _exit(4);
    _exit(0);
  }
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child || !WIFEXITED(status)) return -1;
  return WEXITSTATUS(status);
}

TEST(ThreadIdentifier, IsLearnedAnewInTheChildOfAFork) {
  EXPECT_EQ(statusOfForkedChild(), 0);
}

TEST(ThreadIdentifier, ForkingThreadIsTheChildsMainThread) {
  int status = -1;
  std::thread([&] { status = statusOfForkedChild(); }).join();
  EXPECT_EQ(status, 0);
}

TEST(ThreadIdentifier, AnotherThreadsIsNotTheCallers) {
  rt::ThreadIdentifier other = 0;
  std::latch hasAsked(1);
  std::latch mayEnd(1);
  std::thread thread([&] {
    other = rt::currentThreadIdentifier();
    hasAsked.count_down();
    mayEnd.wait();
  });
  hasAsked.wait();
  EXPECT_FALSE(rt::isOrWasCurrentThread(other));
  EXPECT_TRUE(rt::isOrWasCurrentThread(rt::currentThreadIdentifier()));
  mayEnd.count_down();
  thread.join();
}

}  // namespace
