// Queued tasks when the process exits, and in the child of a fork.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <latch>
#include <thread>

#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Queues/Private/QueueRegistry.h"
#include "tests/support/QueueTest.h"
#include "tests/support/Sanitizers.h"

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;

// Exit. The tasks write to standard error, which the parent of a death test reads.

// Queues a task that occupies its queue until the process exits.
void holdUntilExit(Queue& queue, std::atomic<bool>& mayGoOn) {
  std::latch isHeld(1);
  queue.async([&] {
    isHeld.count_down();
    while (!mayGoOn) std::this_thread::yield();
  });
  isHeld.wait();
}

TEST_F(QueueDeathTest, QueuedTasksRunBeforeTheProcessExits) {
  EXPECT_EXIT(
      {
        static std::atomic<bool> mayGoOn = false;
        static const Ref<Queue> queue = rt::make<Queue>("test"_s);
        holdUntilExit(*queue, mayGoOn);
        std::atexit([] { mayGoOn = true; });  // Runs when exit has begun: the last handler runs first.
        for (int i = 1; i <= 3; ++i) queue->async([i] { std::fprintf(stderr, "task %d;", i); });
        queue->async([] { queue->async([] { std::fprintf(stderr, "task of a task;"); }); });
        std::exit(0);
      },
      testing::ExitedWithCode(0), "task 1;task 2;task 3;task of a task;");
}

TEST_F(QueueDeathTest, MainQueuesTasksRunBeforeTheMainThreadExits) {
  EXPECT_EXIT(
      {
        Queue::main()->async([] {
          std::fprintf(stderr, "on %s;", Queue::currentLabel().isEmpty() ? "nothing" : "main");
          rt::make<Queue>("other"_s)->async([] { std::fprintf(stderr, "from there elsewhere;"); });
        });
        std::exit(0);
      },
      testing::ExitedWithCode(0), "on main;from there elsewhere;");
}

TEST_F(QueueDeathTest, ATaskThatWaitsForTheMainQueueIsServedAtExit) {
  EXPECT_EXIT(
      {
        alarm(30);  // Sooner than the queues would give up.
        rt::detail::QueueRegistry::exitPatience = std::chrono::nanoseconds(std::chrono::hours(1)).count();
        static std::latch isExiting(1);
        rt::make<Queue>("test"_s)->async([] {
          isExiting.wait();
          int served = 0;
          for (int i = 0; i < 100; ++i) Queue::main()->sync([&] { ++served; });
          std::fprintf(stderr, "served %d times;", served);
        });
        Queue::main()->async([] { isExiting.count_down(); });
        std::exit(0);
      },
      testing::ExitedWithCode(0), "served 100 times;");
}

TEST_F(QueueDeathTest, TasksThatQueueThemselvesDoNotDelayExitForEver) {
  EXPECT_EXIT(
      {
        struct Again {
          Ref<Queue> queue;
          void operator()() const { queue->async(*this); }
        };
        const Ref<Queue> queue = rt::make<Queue>("test"_s);
        queue->async(Again{queue});
        std::exit(0);
      },
      testing::ExitedWithCode(0), "");
}

TEST_F(QueueDeathTest, ATaskThatDoesNotEndIsNamedAtExit) {
  EXPECT_EXIT(
      {
        static std::atomic<bool> never = false;
        rt::detail::QueueRegistry::exitPatience = 1;
        holdUntilExit(*rt::make<Queue>("stuck"_s), never);
        std::exit(3);
      },
      testing::ExitedWithCode(3), "rt: the queue \"stuck\" still runs a task at exit");
}

// Regression: a task that did not end ran on the thread that exits, and the process never ended.
TEST_F(QueueDeathTest, TheExitingThreadRunsNoTasksOfThePool) {
  EXPECT_EXIT(
      {
        static const auto exiting = std::this_thread::get_id();
        for (int i = 0; i < 50; ++i) {
          rt::make<Queue>("test"_s)->async([] {
            if (std::this_thread::get_id() == exiting) _exit(1);
          });
        }
        std::exit(0);
      },
      testing::ExitedWithCode(0), "");
}

// Regression: as long as tasks ran, the time limit was not checked.
TEST_F(QueueDeathTest, ABusyMainQueueDoesNotDelayExitForEver) {
  EXPECT_EXIT(
      {
        static std::atomic<bool> never = false;
        rt::detail::QueueRegistry::exitPatience = 1;
        holdUntilExit(*rt::make<Queue>("stuck"_s), never);
        struct Again {
          void operator()() const { Queue::main()->async(*this); }
        };
        Queue::main()->async(Again());
        alarm(30);
        std::exit(3);
      },
      testing::ExitedWithCode(3), "rt: the queue \"stuck\" still runs a task at exit");
}

// Regression: static objects that exist before the first task are destroyed after the tasks have run. Tasks
// that they queued then were lost.
TEST_F(QueueDeathTest, TasksQueuedByStaticDestructorsRunToo) {
  EXPECT_EXIT(
      {
        static Queue& queue = *new Queue("test"_s);
        struct Static {
          ~Static() {
            std::atexit([] { std::fprintf(stderr, "waited for;"); });
            queue.async([] { queue.async([] { std::fprintf(stderr, "last words;"); }); });
          }
        };
        static const Static older;
        queue.async([] { std::fprintf(stderr, "first words;"); });
        std::exit(0);
      },
      testing::ExitedWithCode(0), "first words;last words;waited for;");
}

// Regression: tasks that referred to such an object used it after its destructor.
TEST_F(QueueDeathTest, AStaticObjectMadeAfterTheFirstTaskCanWaitForTasks) {
  EXPECT_EXIT(
      {
        static std::atomic<bool> mayGoOn = false;
        static Queue& queue = *new Queue("test"_s);
        holdUntilExit(queue, mayGoOn);  // The first task.
        struct Static {
          ~Static() {
            mayGoOn = true;
            queue.barrierSync();
            std::fprintf(stderr, "destroyed;");
          }
          const char* text = "whole";
        };
        static const Static younger;
        queue.async([] { std::fprintf(stderr, "%s;", younger.text); });
        std::exit(0);
      },
      testing::ExitedWithCode(0), "whole;destroyed;");
}

TEST_F(QueueDeathTest, ATaskMayExit) {
  EXPECT_EXIT(
      {
        const Ref<Queue> queue = rt::make<Queue>("test"_s);
        const Ref<Queue> other = rt::make<Queue>("other"_s);
        static std::atomic<bool> mayGoOn = false;
        holdUntilExit(*other, mayGoOn);
        other->async([] { std::fprintf(stderr, "another queue's;"); });
        queue->async([] {
          mayGoOn = true;
          std::exit(4);
        });
        for (;;) pause();
      },
      testing::ExitedWithCode(4), "another queue's;");
}

// Fork. The child's exit status is the result.

int statusOf(pid_t child) {
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

constexpr const char* kNoThreadsAfterFork =
    "the thread sanitizer allows no new threads in the child of a fork";

TEST_F(QueueTest, QueuesAreEmptyAndUsableInTheChildOfAFork) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
  std::atomic<bool> mayGoOn = false;
  std::atomic<int> ofParent = 0;
  holdUntilExit(*queue_, mayGoOn);
  queue_->async([&] { ++ofParent; });
  Queue::main()->async([&] { ++ofParent; });
  const pid_t child = fork();
  if (child == 0) {
    alarm(30);  // Instead of a hang.
    std::latch hasRun(1);
    queue_->async([&] { hasRun.count_down(); });
    hasRun.wait();
    queue_->barrierSync();
    if (rt::MainQueue::drain() != 0) _exit(1);
    Queue::main()->async([] {});
    if (rt::MainQueue::drain() != 1) _exit(2);
    _exit(ofParent == 0 ? 0 : 3);
  }
  EXPECT_EQ(statusOf(child), 0);
  mayGoOn = true;
  queue_->barrierSync();
  EXPECT_EQ(rt::MainQueue::drain(), 1U);
  EXPECT_EQ(ofParent, 2) << "the parent has lost nothing";
}

TEST_F(QueueTest, SyncInTheChildOfAForkNeedsNoThread) {
  std::atomic<bool> mayGoOn = false;
  holdUntilExit(*queue_, mayGoOn);
  const pid_t child = fork();
  if (child == 0) {
    alarm(30);
    _exit(queue_->sync([] { return Queue::currentLabel() == "test"_s ? 0 : 1; }));
  }
  EXPECT_EQ(statusOf(child), 0);
  mayGoOn = true;
  queue_->barrierSync();
}

TEST_F(QueueTest, ATaskMayFork) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
  std::atomic<bool> mayGoOn = false;
  std::atomic<bool> isChild = false;
  std::atomic<pid_t> child = -1;
  std::latch hasForked(1);
  holdUntilExit(*queue_, mayGoOn);
  queue_->async([&] {
    child = fork();
    if (child != 0) {
      hasForked.count_down();
      return;
    }
    alarm(30);
    isChild = true;
    if (!queue_->isCurrent()) _exit(1);
    // In the child, this task comes next, and not the tasks that the parent has queued.
    queue_->async([] { _exit(0); });
  });
  queue_->async([&] {
    if (isChild) _exit(2);
  });
  mayGoOn = true;
  hasForked.wait();
  queue_->barrierSync();
  EXPECT_EQ(statusOf(child), 0);
}

constexpr const char* kLeaksAfterFork =
    "to the address sanitizer, what the parent's threads hold has leaked when the child of a fork exits";

// Regression: at exit, the child of a fork waited for the parent's tasks until the time limit.
TEST_F(QueueDeathTest, AChildDoesNotWaitAtExitForItsParentsTasks) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << kLeaksAfterFork;
  const auto exitOfTheChild = [&] {
    std::atomic<bool> never = false;
    holdUntilExit(*queue_, never);
    queue_->async([] {});
    const pid_t child = fork();
    if (child != 0) _exit(statusOf(child));
    rt::detail::QueueRegistry::exitPatience = 1;
    std::exit(3);
  };
  EXPECT_EXIT(exitOfTheChild(), testing::ExitedWithCode(3),
              testing::Not(testing::HasSubstr("still runs a task")));
}

// Exits while a task of `queue` does not end. The queue is named on standard error if the task is waited
// for.
[[noreturn]] void exitWhileBusy(Queue& queue) {
  static std::atomic<bool> never = false;
  holdUntilExit(queue, never);
  rt::detail::QueueRegistry::exitPatience = 1;
  std::exit(3);
}

// Regression: if the parent had run a task before, the child did not wait for one of its own tasks at exit.
TEST_F(QueueDeathTest, AChildWaitsAtExitForItsOwnTasks) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << kLeaksAfterFork;
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
  const auto exitOfTheChild = [&] {
    queue_->async([] {});
    queue_->barrierSync();
    const pid_t child = fork();
    if (child != 0) _exit(statusOf(child));
    exitWhileBusy(*queue_);
  };
  EXPECT_EXIT(exitOfTheChild(), testing::ExitedWithCode(3),
              "rt: the queue \"test\" still runs a task at exit");
}

// The task that forks is also the parent's, which counts it.
TEST_F(QueueDeathTest, AChildOfATaskWaitsAtExitForItsOwnTasks) {
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << kLeaksAfterFork;
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
  const auto exitOfTheChild = [&] {
    const Ref<Queue> other = rt::make<Queue>("other"_s);
    queue_->async([&] {
      const pid_t child = fork();
      if (child != 0) _exit(statusOf(child));
      other->async([&] { exitWhileBusy(*queue_); });
    });
    for (;;) pause();
  };
  EXPECT_EXIT(exitOfTheChild(), testing::ExitedWithCode(3),
              "rt: the queue \"test\" still runs a task at exit");
}

}  // namespace
