// What is particular to serial queues, and what concerns all queues: threads, exit and fork. What every
// kind of queue keeps is in Queue_conformance_test.cpp.

#include "Runtime/Queue.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iterator>
#include <latch>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/MainQueue.h"
#include "Runtime/QueueRegistry.h"
#include "Runtime/Thread.h"
#include "Runtime/ThreadIdentifier.h"
#include "Runtime/Weak.h"
#include "Runtime/WorkerPool.h"

#if defined(__SANITIZE_THREAD__)
#define RT_TEST_THREAD_SANITIZER 1
#elif defined(__has_feature)
#if __has_feature(thread_sanitizer)
#define RT_TEST_THREAD_SANITIZER 1
#endif
#if __has_feature(address_sanitizer)
#define RT_TEST_ADDRESS_SANITIZER 1
#endif
#endif

namespace {

using namespace rt::literals;
using rt::QualityOfService;
using rt::Queue;
using rt::Ref;

class QueueTest : public testing::Test {
 protected:
  QueueTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  const Ref<Queue> queue_ = rt::make<Queue>("test"_s);
};

using QueueDeathTest = QueueTest;

TEST_F(QueueTest, KeepsWhatItIsMadeOf) {
  const Ref<Queue> queue = rt::make<Queue>("made"_s, QualityOfService::kBackground, -7);
  EXPECT_EQ(queue->label(), "made"_s);
  EXPECT_EQ(queue->qualityOfService(), QualityOfService::kBackground);
  EXPECT_EQ(queue->relativePriority(), -7);
  EXPECT_EQ(queue_->qualityOfService(), QualityOfService::kDefault);
  EXPECT_EQ(queue_->relativePriority(), 0);
  EXPECT_EQ(rt::make<Queue>(nullptr)->label(), ""_s);
}

TEST_F(QueueTest, TakesWhatCanBeCalledAsItCallsIt) {
  struct CalledInPlace {
    void operator()() & {}
  };
  struct CalledOnce {
    void operator()() && {}
  };
  constexpr auto isTaken = []<class Task>(Task&& task) {
    return requires { std::declval<Queue&>().async(std::forward<Task>(task)); };
  };
  CalledInPlace inPlace;
  CalledOnce once;
  EXPECT_FALSE(isTaken(inPlace)) << "it would be called as what is given up";
  EXPECT_TRUE(isTaken(once));
}

TEST_F(QueueTest, RelativePriorityEndsAtItsLimits) {
  EXPECT_EQ(rt::make<Queue>("test"_s, QualityOfService::kUtility, -100)->relativePriority(), -15);
  EXPECT_EQ(rt::make<Queue>("test"_s, QualityOfService::kUtility, 3)->relativePriority(), 0);
}

TEST_F(QueueTest, AnIdleQueueRunsSyncOnTheCallersThread) {
  const auto caller = std::this_thread::get_id();
  EXPECT_EQ(queue_->sync([] { return std::this_thread::get_id(); }), caller);
}

TEST_F(QueueTest, AsyncRunsElsewhere) {
  std::latch hasRun(1);
  std::thread::id runner;
  queue_->async([&] {
    runner = std::this_thread::get_id();
    hasRun.count_down();
  });
  hasRun.wait();
  EXPECT_NE(runner, std::this_thread::get_id());
}

TEST_F(QueueTest, IsDestroyedOnceNobodyRefersToItAndItsTasksHaveRun) {
  Ref<Queue> queue = rt::make<Queue>("test"_s);
  const rt::Weak<Queue> weak = queue;
  std::latch isRunning(1);
  std::latch mayGoOn(1);
  bool isAlive = false;
  std::latch hasRun(1);
  queue->async([&] {
    isRunning.count_down();
    mayGoOn.wait();
  });
  isRunning.wait();
  queue->async([&] {
    isAlive = weak.lock() != nullptr;
    hasRun.count_down();
  });
  queue = nullptr;
  EXPECT_TRUE(weak.lock() != nullptr) << "it has tasks";
  mayGoOn.count_down();
  hasRun.wait();
  EXPECT_TRUE(isAlive);
  while (weak.lock() != nullptr) std::this_thread::yield();  // Ends with the queue.
}

// Whoever gives up a queue with tasks hands it to a thread that waits, but not to one that has been served.
TEST_F(QueueTest, GoesOnAfterAThreadThatWaitedWasServed) {
  for (int round = 0; round < 100; ++round) {
    std::latch isRunning(1);
    std::atomic<bool> mayGoOn = false;
    queue_->async([&] {
      isRunning.count_down();
      while (!mayGoOn) std::this_thread::yield();
    });
    isRunning.wait();
    std::latch isAboutToWait(1);
    std::thread waiting([&] {
      isAboutToWait.count_down();
      queue_->barrierSync();
    });
    isAboutToWait.wait();
    for (int give = 0; give < 3; ++give) std::this_thread::yield();  // Mostly it waits by now.
    mayGoOn = true;
    waiting.join();
    int count = 0;
    queue_->sync([&] { queue_->async([&] { ++count; }); });
    queue_->barrierSync();
    ASSERT_EQ(count, 1);
  }
}

TEST_F(QueueTest, SyncNestsFromQueueToQueue) {
  constexpr int kQueues = 100;
  std::vector<Ref<Queue>> queues;
  queues.reserve(kQueues);
  for (int i = 0; i < kQueues; ++i) queues.push_back(rt::make<Queue>("nested"_s));
  int depth = 0;
  const std::function<void()> descend = [&] {
    if (depth == kQueues) return;
    const std::size_t next = static_cast<std::size_t>(depth++);
    queues[next]->sync(descend);
  };
  queue_->async(descend);
  queue_->barrierSync();
  EXPECT_EQ(depth, kQueues);
}

// Invariant: whatever several threads do with several queues, each thread's tasks run in its order on each
// queue, one at a time, and none is lost.
TEST_F(QueueTest, ManyThreadsUseManyQueuesAtRandom) {
  constexpr std::size_t kQueues = 5;
  constexpr std::size_t kThreads = 6;
  constexpr int kSteps = 1000;
  struct State {
    Ref<Queue> queue = rt::make<Queue>("random"_s);
    std::vector<int> next = std::vector<int>(kThreads, 0);  // Touched by the queue's tasks only.
  };
  std::vector<State> states(kQueues);
  std::vector<std::vector<int>> sent(kThreads, std::vector<int>(kQueues, 0));
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (std::size_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      std::mt19937 random(static_cast<unsigned>(thread));
      for (int step = 0; step < kSteps; ++step) {
        const std::size_t chosen = random() % kQueues;
        State& state = states[chosen];
        const auto task = [&state, thread, number = sent[thread][chosen]++] {
          ASSERT_EQ(state.next[thread], number);
          ++state.next[thread];
        };
        switch (random() % 4) {
          case 0:
            state.queue->sync(task);
            break;
          case 1: {
            // From another queue's task, which waits in turn; always in one direction, or they would wait
            // for each other.
            const std::size_t other = random() % kQueues;
            if (other < chosen) {
              states[other].queue->sync([&] { state.queue->sync(task); });
            } else {
              state.queue->sync(task);
            }
            break;
          }
          default:
            state.queue->async(task);
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (std::size_t chosen = 0; chosen < kQueues; ++chosen) {
    states[chosen].queue->barrierSync();
    for (std::size_t thread = 0; thread < kThreads; ++thread) {
      EXPECT_EQ(states[chosen].next[thread], sent[thread][chosen]);
    }
  }
}

#if !defined(__APPLE__)

std::ptrdiff_t threadCount() {
  return std::distance(std::filesystem::directory_iterator("/proc/self/task"),
                       std::filesystem::directory_iterator());
}

/// Lets idle workers end at once, and waits until they have.
std::ptrdiff_t threadCountWithoutWorkers() {
  // Those that are asleep already have to be woken to see it.
  rt::detail::WorkerPool::idleTimeout = 1;
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
  std::ptrdiff_t least = threadCount();
  while (std::chrono::steady_clock::now() < deadline && least > 1) {
    for (const auto qualityOfService : {QualityOfService::kDefault, QualityOfService::kUtility}) {
      std::latch hasRun(1);
      rt::make<Queue>("wake"_s, qualityOfService)->async([&] { hasRun.count_down(); });
      hasRun.wait();
    }
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
    least = std::min(least, threadCount());
  }
  rt::detail::WorkerPool::idleTimeout = std::chrono::nanoseconds(std::chrono::seconds(5)).count();
  return least;
}

// More queues than there may be threads, all waiting for one queue that is busy. The thread that has kept
// it busy leaves while no worker is free: so one of those that wait must go on.
TEST_F(QueueTest, WaitingTasksDoNotNeedFreeThreads) {
  constexpr int kQueues = 2 * rt::detail::WorkerPool::kMaximumThreads;
  const Ref<Queue> shared = rt::make<Queue>("shared"_s);
  std::atomic<int> started = 0;
  int count = 0;
  std::vector<Ref<Queue>> queues;
  shared->sync([&] {
    for (int i = 0; i < kQueues; ++i) {
      queues.push_back(rt::make<Queue>("waiting"_s));
      queues.back()->async([&] {
        ++started;
        shared->sync([&] { ++count; });
      });
    }
    shared->async([&] { ++count; });
    while (started < rt::detail::WorkerPool::kMaximumThreads) std::this_thread::yield();
  });
  for (const Ref<Queue>& queue : queues) queue->barrierSync();
  EXPECT_EQ(count, kQueues + 1);
}

TEST_F(QueueTest, ThreadsEndWhenTheyHaveBeenIdle) {
#if defined(RT_TEST_THREAD_SANITIZER)
  GTEST_SKIP() << "the sanitizer has a thread of its own";
#endif
  queue_->async([] {});
  queue_->barrierSync();
  EXPECT_EQ(threadCountWithoutWorkers(), 1);
  int runs = 0;
  for (int i = 0; i < 10; ++i) queue_->async([&] { ++runs; });
  queue_->barrierSync();
  EXPECT_EQ(runs, 10) << "there are new threads when they are needed";
}

TEST_F(QueueDeathTest, NoThreadStartsBeforeTheFirstAsync) {
  EXPECT_EXIT(
      {
        const std::ptrdiff_t before = threadCount();
        const Ref<Queue> queue = rt::make<Queue>("test"_s);
        queue->sync([] {});
        queue->barrierSync();
        Queue::main()->async([] {});
        _exit(threadCount() == before ? 0 : 1);
      },
      testing::ExitedWithCode(0), "");
}

TEST_F(QueueTest, WorkersTakeNoSignals) {
  std::latch hasRun(1);
  sigset_t blocked;
  sigemptyset(&blocked);
  queue_->async([&] {
    pthread_sigmask(SIG_SETMASK, nullptr, &blocked);
    hasRun.count_down();
  });
  hasRun.wait();
  for (const int signal : {SIGINT, SIGTERM, SIGCHLD, SIGUSR1}) EXPECT_EQ(sigismember(&blocked, signal), 1);
  sigset_t ofCaller;
  pthread_sigmask(SIG_SETMASK, nullptr, &ofCaller);
  EXPECT_EQ(sigismember(&ofCaller, SIGUSR1), 0) << "and the caller does as before";
}

// Blocked, they ended the process and its crash handler saw nothing.
TEST_F(QueueDeathTest, FaultsOfATaskReachTheHostsHandler) {
  for (const int signal : {SIGSEGV, SIGBUS, SIGFPE, SIGILL, SIGTRAP, SIGSYS}) {
    EXPECT_EXIT(
        {
          std::signal(signal, [](int) { _exit(7); });
          queue_->async([signal] {
            std::raise(signal);
            _exit(0);
          });
          for (;;) pause();
        },
        testing::ExitedWithCode(7), "");
  }
}

TEST_F(QueueTest, WorkersDoNotBearTheNameOfWhoStartedThem) {
  std::thread([&] {
    rt::Thread::setCurrentName("Importer"_s);
    const Ref<Queue> queue =
        rt::make<Queue>("test"_s, QualityOfService::kBackground, -15);  // A worker of its own.
    std::latch hasRun(1);
    rt::String name = "untouched"_s;
    queue->async([&] {
      name = rt::Thread::currentName();
      hasRun.count_down();
    });
    hasRun.wait();
    EXPECT_TRUE(name.isNull()) << name.view();
  }).join();
}

TEST_F(QueueTest, NicenessFollowsClassAndRelativePriority) {
  const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
  const struct {
    QualityOfService qualityOfService;
    int relativePriority;
    int added;
  } cases[] = {{QualityOfService::kUserInteractive, 0, 0}, {QualityOfService::kUserInitiated, 0, 0},
               {QualityOfService::kDefault, 0, 0},         {QualityOfService::kDefault, -15, 5},
               {QualityOfService::kUtility, 0, 5},         {QualityOfService::kUtility, -4, 6},
               {QualityOfService::kBackground, 0, 10},     {QualityOfService::kBackground, -15, 15}};
  for (const auto& each : cases) {
    const Ref<Queue> queue = rt::make<Queue>("nice"_s, each.qualityOfService, each.relativePriority);
    std::latch hasRun(1);
    int ofTask = 0;
    queue->async([&] {
      ofTask = getpriority(PRIO_PROCESS, rt::currentThreadIdentifier());
      hasRun.count_down();
    });
    hasRun.wait();
    EXPECT_EQ(ofTask, std::min(19, ofProcess + each.added));
  }
}

// A thread is as nice as the one that starts it, and may not become less so without a privilege: once a
// background task had started a worker for urgent work, all urgent work was done as if in the background.
TEST_F(QueueDeathTest, NicenessDoesNotSpreadFromTheBackground) {
  EXPECT_EXIT(
      {
        if (geteuid() == 0 && setresuid(65534, 65534, 65534) != 0) _exit(1);
        const rlimit none{};
        setrlimit(RLIMIT_NICE, &none);
        rt::detail::WorkerPool::idleTimeout = std::chrono::nanoseconds(std::chrono::hours(1)).count();
        const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
        const Ref<Queue> background = rt::make<Queue>("background"_s, QualityOfService::kBackground);
        std::latch hasRun(1);
        rt::ThreadIdentifier worker = 0;
        background->async([&] {
          queue_->async([&] {
            worker = rt::currentThreadIdentifier();
            hasRun.count_down();
          });
        });
        hasRun.wait();
        const std::string path = "/proc/self/task/" + std::to_string(worker);
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
        while (std::filesystem::exists(path)) {
          if (std::chrono::steady_clock::now() > deadline) _exit(2);
          std::this_thread::yield();
        }
        queue_->async(
            [&] { _exit(getpriority(PRIO_PROCESS, rt::currentThreadIdentifier()) == ofProcess ? 0 : 3); });
        for (;;) pause();
      },
      testing::ExitedWithCode(0), "");
}

#if defined(RT_TEST_THREAD_SANITIZER) || defined(RT_TEST_ADDRESS_SANITIZER)
#define SKIP_WITHOUT_MEMORY_LIMITS() GTEST_SKIP() << "the sanitizers need more memory than a limit allows"
#else
#define SKIP_WITHOUT_MEMORY_LIMITS() static_cast<void>(0)
#endif

/// Has the system refuse threads: what memory there is stays, but a new stack is refused.
class ThreadRefusal {
 public:
  ThreadRefusal() {
    getrlimit(RLIMIT_AS, &before_);
    rlimit limit = before_;
    limit.rlim_cur = 1;
    setrlimit(RLIMIT_AS, &limit);
  }
  ~ThreadRefusal() { setrlimit(RLIMIT_AS, &before_); }
  ThreadRefusal(const ThreadRefusal&) = delete;
  ThreadRefusal& operator=(const ThreadRefusal&) = delete;

 private:
  rlimit before_{};
};

TEST_F(QueueDeathTest, TasksWaitWhereTheSystemRefusesAThread) {
  SKIP_WITHOUT_MEMORY_LIMITS();
  EXPECT_EXIT(
      {
        const Ref<Queue> queue = rt::make<Queue>("test"_s);
        const Ref<Queue> other = rt::make<Queue>("other"_s);
        std::latch haveRun(2);
        std::atomic<bool> isRefused = true;
        {
          const ThreadRefusal refusal;
          queue->async([&] {
            if (isRefused) _exit(2);
            haveRun.count_down();
          });
          isRefused = false;
        }
        other->async([&] { haveRun.count_down(); });
        haveRun.wait();
        _exit(0);
      },
      testing::ExitedWithCode(0), "");
}

// A queue that had once been refused a thread never asked again, and held its tasks until the process
// exited.
TEST_F(QueueDeathTest, AQueueThatWasRefusedAThreadAsksAgain) {
  SKIP_WITHOUT_MEMORY_LIMITS();
  EXPECT_EXIT(
      {
        alarm(30);  // Instead of a hang.
        std::latch haveRun(3);
        {
          const ThreadRefusal refusal;
          for (int i = 0; i < 2; ++i) queue_->async([&] { haveRun.count_down(); });
        }
        queue_->async([&] { haveRun.count_down(); });
        haveRun.wait();
        _exit(0);
      },
      testing::ExitedWithCode(0), "");
}

TEST_F(QueueDeathTest, TasksRunBeforeTheProcessExitsAlsoWithoutThreads) {
  SKIP_WITHOUT_MEMORY_LIMITS();
  EXPECT_EXIT(
      {
        static const ThreadRefusal refusal;
        queue_->async([&] {
          std::fprintf(stderr, "without a thread;");
          queue_->async([] { std::fprintf(stderr, "and its task;"); });
        });
        std::exit(0);
      },
      testing::ExitedWithCode(0), "without a thread;and its task;");
}

#endif  // !defined(__APPLE__)

// Exit. The tasks report on standard error, which is what the parent of a death test sees.

/// A task that holds its queue until the process exits.
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
        std::atexit([] { mayGoOn = true; });  // Once exit has begun, as handlers run in turn from the last.
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
        alarm(30);  // Before patience ends.
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

TEST_F(QueueDeathTest, TasksThatQueueThemselvesForEverDoNotKeepTheProcess) {
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

// A task that did not end and came to run on the thread that exits kept the process for ever.
TEST_F(QueueDeathTest, TheThreadThatExitsRunsNoTasksOfThePool) {
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

// As long as anything ran, nobody looked at the clock.
TEST_F(QueueDeathTest, ABusyMainQueueDoesNotKeepTheProcess) {
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

// Static objects that are older than the first task are destroyed after the tasks have run, and what they
// queued was lost.
TEST_F(QueueDeathTest, WhatStaticObjectsQueueInTheirDestructorsRunsToo) {
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

// Fork. The child reports by its exit status.

int statusOf(pid_t child) {
  int status = 0;
  if (child < 0 || waitpid(child, &status, 0) != child) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

#if defined(RT_TEST_THREAD_SANITIZER)
#define SKIP_WITHOUT_THREADS_AFTER_FORK() \
  GTEST_SKIP() << "the thread sanitizer allows no new threads in the child of a fork"
#else
#define SKIP_WITHOUT_THREADS_AFTER_FORK() static_cast<void>(0)
#endif

TEST_F(QueueTest, QueuesAreEmptyInTheChildOfAForkAndWork) {
  SKIP_WITHOUT_THREADS_AFTER_FORK();
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
  SKIP_WITHOUT_THREADS_AFTER_FORK();
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
    // After this task, in the child, comes this one, and not what the parent has queued.
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

}  // namespace
