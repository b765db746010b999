#include "Runtime/Locks/Private/ThreadIdentifier.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <latch>
#include <set>
#include <thread>
#include <vector>

#include "tests/support/ForkTest.h"

namespace {

TEST(ThreadIdentifier, IsTheSystemsNumberAndDoesNotChange) {
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

// Forks in the calling thread. Returns 0 if the child has a new identifier, has kept its thread's token and
// is the main thread now.
int statusOfForkedChild() {
  const rt::ThreadIdentifier inParent = rt::currentThreadIdentifier();
  const rt::ThreadToken token = rt::currentThreadToken();
  const pid_t child = fork();
  if (child == 0) {
    if (rt::currentThreadIdentifier() != rt::detail::systemThreadIdentifier()) _exit(1);
    if (rt::currentThreadIdentifier() == inParent) _exit(2);
    if (rt::currentThreadToken() != token || rt::isThreadGone(token)) _exit(3);
    if (!rt::isMainThread()) _exit(4);
    _exit(0);
  }
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child || !WIFEXITED(status)) return -1;
  return WEXITSTATUS(status);
}

TEST(ThreadIdentifier, IsRenewedInAForkedChild) {
  EXPECT_EQ(statusOfForkedChild(), 0);
}

TEST(ThreadIdentifier, TheForkingThreadIsTheMainThreadOfTheChild) {
  int status = -1;
  std::thread([&] { status = statusOfForkedChild(); }).join();
  EXPECT_EQ(status, 0);
}

// A thread that lives as long as the object, and its token.
class Other {
 public:
  Other() { hasAsked_.wait(); }
  Other(const Other&) = delete;
  Other& operator=(const Other&) = delete;
  ~Other() {
    mayEnd_.count_down();
    thread_.join();
  }

  rt::ThreadToken token() const { return token_; }

 private:
  rt::ThreadToken token_ = 0;
  std::latch hasAsked_{1};
  std::latch mayEnd_{1};
  std::thread thread_{[this] {
    token_ = rt::currentThreadToken();
    hasAsked_.count_down();
    mayEnd_.wait();
  }};
};

TEST(ThreadToken, DiffersBetweenThreadsAndDoesNotChange) {
  const Other other;
  EXPECT_NE(other.token(), 0U);
  EXPECT_NE(other.token(), rt::currentThreadToken());
  EXPECT_LT(rt::currentThreadToken(), 0x80000000U);
  EXPECT_EQ(rt::currentThreadToken(), rt::currentThreadToken());
  EXPECT_FALSE(rt::isThreadGone(other.token()));
}

TEST(ThreadToken, OfEveryThreadButTheForkingOneIsGoneInAForkedChild) {
  const Other other;
  const rt::ThreadToken own = rt::currentThreadToken();
  EXPECT_EQ(statusOfChild([&] {
              if (!rt::isThreadGone(other.token()) || rt::isThreadGone(own)) return 1;
              if (RT_TEST_THREAD_SANITIZER) return 0;  // The sanitizer allows no new threads in the child.
              const Other ofChild;
              if (rt::isThreadGone(ofChild.token()) || ofChild.token() == other.token()) return 2;
              return statusOfChild([&] {
                if (!rt::isThreadGone(other.token()) || !rt::isThreadGone(ofChild.token())) return 3;
                return rt::isThreadGone(own) ? 4 : 0;
              });
            }),
            0);
  EXPECT_FALSE(rt::isThreadGone(other.token()));
}

}  // namespace
