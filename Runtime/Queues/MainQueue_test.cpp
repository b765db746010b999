// Behaviour of the main queue only. Queue_conformance_test.cpp tests what all kinds of queues have in
// common.

#include "Runtime/Queues/MainQueue.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <latch>
#include <system_error>
#include <thread>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "tests/support/Sanitizers.h"

namespace {

using namespace rt::literals;
using rt::MainQueue;
using rt::Queue;

bool isReadable(int descriptor) {
  pollfd event{.fd = descriptor, .events = POLLIN, .revents = 0};
  return poll(&event, 1, 0) == 1;
}

class MainQueueTest : public testing::Test {
 protected:
  MainQueueTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
};

using MainQueueDeathTest = MainQueueTest;

TEST_F(MainQueueTest, IsTheSameAtEveryCall) {
  EXPECT_EQ(Queue::main(), Queue::main());
  EXPECT_EQ(Queue::main()->label(), "main"_s);
}

TEST_F(MainQueueTest, DrainOfAnEmptyQueueRunsNothing) {
  EXPECT_EQ(MainQueue::drain(), 0U);
}

TEST_F(MainQueueTest, TasksWaitUntilTheMainThreadRunsThem) {
  bool hasRun = false;
  bool wasMain = false;
  std::thread([&] {
    Queue::main()->async([&] {
      hasRun = true;
      wasMain = rt::isMainThread();
    });
  }).join();
  EXPECT_FALSE(hasRun);
  EXPECT_EQ(MainQueue::drain(), 1U);
  EXPECT_TRUE(hasRun);
  EXPECT_TRUE(wasMain);
}

TEST_F(MainQueueTest, DrainLeavesTasksThatItsTasksQueue) {
  std::vector<int> order;
  Queue::main()->async([&] {
    order.push_back(1);
    Queue::main()->async([&] { order.push_back(2); });
  });
  EXPECT_EQ(MainQueue::drain(), 1U);
  EXPECT_EQ(order, std::vector<int>{1});
  EXPECT_EQ(MainQueue::drain(), 1U);
  EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST_F(MainQueueTest, DrainWithinATaskRunsNothing) {
  std::size_t inner = 9;
  Queue::main()->async([&] {
    Queue::main()->async([] {});
    inner = MainQueue::drain();
  });
  EXPECT_EQ(MainQueue::drain(), 1U);
  EXPECT_EQ(inner, 0U);
  EXPECT_EQ(MainQueue::drain(), 1U) << "it is still there";
}

TEST_F(MainQueueTest, SyncOnTheMainThreadRunsQueuedTasksFirst) {
  std::vector<int> order;
  Queue::main()->async([&] { order.push_back(1); });
  Queue::main()->sync([&] { order.push_back(2); });
  EXPECT_EQ(order, (std::vector<int>{1, 2}));
  EXPECT_EQ(MainQueue::drain(), 0U);
}

TEST_F(MainQueueTest, DescriptorIsReadableWhileThereIsWork) {
  const int descriptor = MainQueue::fileDescriptor();
  EXPECT_EQ(descriptor, MainQueue::fileDescriptor());
  MainQueue::drain();
  EXPECT_FALSE(isReadable(descriptor));
  Queue::main()->async([] {});
  EXPECT_TRUE(isReadable(descriptor));
  Queue::main()->async([] { Queue::main()->async([] {}); });
  EXPECT_EQ(MainQueue::drain(), 2U);
  EXPECT_TRUE(isReadable(descriptor)) << "a task has queued a task";
  EXPECT_EQ(MainQueue::drain(), 1U);
  EXPECT_FALSE(isReadable(descriptor));
}

TEST_F(MainQueueTest, StopLeavesTheOtherTasksQueued) {
  std::vector<int> order;
  Queue::main()->async([&] {
    order.push_back(1);
    MainQueue::stop();
  });
  Queue::main()->async([&] { order.push_back(2); });
  Queue::main()->async([&] { order.push_back(3); });
  MainQueue::run();
  EXPECT_EQ(order, std::vector<int>{1});
  Queue::main()->async([&] { order.push_back(4); });
  EXPECT_TRUE(isReadable(MainQueue::fileDescriptor()));
  EXPECT_EQ(MainQueue::drain(), 3U);
  EXPECT_EQ(order, (std::vector<int>{1, 2, 3, 4}));
}

TEST_F(MainQueueTest, StopBeforeRunMakesItReturnAtOnce) {
  bool hasRun = false;
  MainQueue::stop();
  Queue::main()->async([&] { hasRun = true; });
  MainQueue::run();
  EXPECT_FALSE(hasRun);
  EXPECT_EQ(MainQueue::drain(), 1U);
}

TEST_F(MainQueueTest, StopFromAnotherThreadWakesRun) {
  std::latch isRunning(1);
  Queue::main()->async([&] { isRunning.count_down(); });
  std::thread other([&] {
    isRunning.wait();
    MainQueue::stop();
  });
  MainQueue::run();
  other.join();
}

// Invariant: each queued task ends a wait of the main thread. So no task is left when the last one has
// called `stop`.
TEST_F(MainQueueTest, LosesNoWakeUp) {
  constexpr int kRounds = 5000;
  int count = 0;
  std::thread other([&] {
    for (int i = 0; i < kRounds; ++i) {
      std::latch hasRun(1);
      Queue::main()->async([&] {
        ++count;
        hasRun.count_down();
      });
      hasRun.wait();
    }
    MainQueue::stop();
  });
  MainQueue::run();
  other.join();
  EXPECT_EQ(count, kRounds);
}

TEST_F(MainQueueTest, OtherThreadsWaitForTheMainThread) {
  std::thread other([] {
    EXPECT_TRUE(Queue::main()->sync([] { return rt::isMainThread(); }));
    EXPECT_FALSE(rt::isMainThread());
    MainQueue::stop();
  });
  MainQueue::run();
  other.join();
}

TEST_F(MainQueueTest, TheChildOfAForkHasADescriptorOfItsOwn) {
  const int descriptor = MainQueue::fileDescriptor();
  MainQueue::drain();
  const pid_t child = fork();
  if (child == 0) {
    Queue::main()->async([] {});
    if (MainQueue::fileDescriptor() != descriptor || !isReadable(descriptor)) _exit(1);
    _exit(MainQueue::drain() == 1 && !isReadable(descriptor) ? 0 : 2);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
  EXPECT_FALSE(isReadable(descriptor)) << "what the child queued is not the parent's";
}

TEST_F(MainQueueTest, TheForkingThreadIsTheChildsMainThread) {
  int status = -1;
  std::thread([&] {
    const pid_t child = fork();
    if (child == 0) {
      Queue::main()->async([] {});
      _exit(MainQueue::drain() == 1 ? 0 : 1);
    }
    waitpid(child, &status, 0);
  }).join();
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
}

constexpr const char* kSanitizerNeedsDescriptors = "the address sanitizer needs descriptors for its checks";

// Makes the system refuse descriptors.
class DescriptorRefusal {
 public:
  DescriptorRefusal() {
    getrlimit(RLIMIT_NOFILE, &before_);
    rlimit limit = before_;
    limit.rlim_cur = 0;
    setrlimit(RLIMIT_NOFILE, &limit);
  }
  ~DescriptorRefusal() { setrlimit(RLIMIT_NOFILE, &before_); }
  DescriptorRefusal(const DescriptorRefusal&) = delete;
  DescriptorRefusal& operator=(const DescriptorRefusal&) = delete;

 private:
  rlimit before_{};
};

TEST_F(MainQueueDeathTest, ReportsAMissingDescriptorAndTriesAgain) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << kSanitizerNeedsDescriptors;
  EXPECT_EXIT(
      {
        {
          const DescriptorRefusal refusal;
          EXPECT_THROW(MainQueue::fileDescriptor(), std::system_error);
        }
        Queue::main()->async([] {});
        _exit(isReadable(MainQueue::fileDescriptor()) && !HasFailure() ? 0 : 1);
      },
      testing::ExitedWithCode(0), "");
}

// Regression: if the parent had made no queue, the child kept the parent's descriptor.
TEST_F(MainQueueDeathTest, ChildHasNoDescriptorIfTheSystemHasNone) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << kSanitizerNeedsDescriptors;
  EXPECT_EXIT(
      {
        const int ofParent = MainQueue::fileDescriptor();
        const DescriptorRefusal refusal;
        const pid_t child = fork();
        if (child != 0) {
          int status = -1;
          waitpid(child, &status, 0);
          _exit(WIFEXITED(status) ? WEXITSTATUS(status) : 3);
        }
        try {
          MainQueue::fileDescriptor();
        } catch (const std::system_error&) {
          _exit(fcntl(ofParent, F_GETFD) == -1 ? 0 : 1);
        }
        _exit(2);
      },
      testing::ExitedWithCode(0), "");
}

TEST_F(MainQueueDeathTest, OnlyTheMainThreadRunsIt) {
  EXPECT_DEATH(std::thread([] { MainQueue::drain(); }).join(),
               "rt: MainQueue::drain on thread [0-9]+, which is not the main thread");
  EXPECT_DEATH(std::thread([] { MainQueue::run(); }).join(),
               "rt: MainQueue::run on thread [0-9]+, which is not the main thread");
}

TEST_F(MainQueueDeathTest, RunWithinATaskEndsTheProgram) {
  EXPECT_DEATH(Queue::main()->sync([] { MainQueue::run(); }),
               "rt: MainQueue::run from a task of the main queue");
}

}  // namespace
