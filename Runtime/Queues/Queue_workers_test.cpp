// The threads that run the tasks of queues.

#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <iterator>
#include <latch>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/Private/WorkerPool.h"
#include "tests/support/ClockHook.h"
#include "tests/support/ForkTest.h"
#include "tests/support/QueueTest.h"
#include "tests/support/Sanitizers.h"

namespace {

using namespace rt::literals;
using rt::QualityOfService;
using rt::Queue;
using rt::Ref;

constexpr const char* kNoCount = "only Linux tells how many threads a process has";

// Returns how many threads this process has. Linux only.
std::ptrdiff_t threadCount() {
  return std::distance(std::filesystem::directory_iterator("/proc/self/task"),
                       std::filesystem::directory_iterator());
}

// Makes idle workers end, and returns when there are none.
void waitUntilWorkersHaveEnded() {
  // Workers that sleep already see the new timeout only when they are woken.
  rt::detail::WorkerPool::idleTimeout = 1;
  while (threadCount() > 1) {
    for (const auto qualityOfService : {QualityOfService::kDefault, QualityOfService::kUtility}) {
      std::latch hasRun(1);
      rt::make<Queue>("wake"_s, qualityOfService)->async([&] { hasRun.count_down(); });
      hasRun.wait();
    }
    std::this_thread::yield();
  }
  rt::detail::WorkerPool::idleTimeout = std::chrono::nanoseconds(std::chrono::seconds(5)).count();
}

// More queues than threads wait for one busy queue. The thread that has kept it busy stops while no worker
// is free. So one of the waiting threads must run the queue.
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

TEST_F(QueueTest, IdleThreadsEnd) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer has a thread of its own";
  if (RT_TEST_IS_APPLE) GTEST_SKIP() << kNoCount;
  queue_->async([] {});
  queue_->barrierSync();
  waitUntilWorkersHaveEnded();
  int runs = 0;
  for (int i = 0; i < 10; ++i) queue_->async([&] { ++runs; });
  queue_->barrierSync();
  EXPECT_EQ(runs, 10) << "there are new threads when they are needed";
}

// What a worker queues when it next reads the clock, by which it finds that its timeout is over.
constinit thread_local Queue* queuedWhenIdle = nullptr;
constinit std::atomic<bool> hasRunAfterwards = false;

// Regression: work that a worker got between the end of its wait and its own end was lost. Here the worker
// itself queues the work, when it reads the clock.
TEST_F(QueueDeathTest, AWorkerThatGetsWorkAsItsIdleTimeEndsRunsIt) {
  EXPECT_EXIT(
      {
        alarm(30);  // Instead of a hang.
        rt::detail::WorkerPool::idleTimeout = 0;
        clockHook = [](clockid_t /*clock*/, timespec& /*time*/) {
          if (Queue* queue = std::exchange(queuedWhenIdle, nullptr))
            queue->async([] { hasRunAfterwards = true; });
        };
        const Ref<Queue> other = rt::make<Queue>("other"_s);
        queue_->async([&] { queuedWhenIdle = other.get(); });
        while (!hasRunAfterwards) std::this_thread::yield();
        _exit(0);
      },
      testing::ExitedWithCode(0), "");
}

TEST_F(QueueDeathTest, NoThreadStartsBeforeTheFirstAsync) {
  if (RT_TEST_IS_APPLE) GTEST_SKIP() << kNoCount;
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

TEST_F(QueueTest, WorkersBlockSignals) {
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

// Regression: the signals of a task's own faults were blocked. They ended the process without its crash
// handler.
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

TEST_F(QueueTest, WorkersDoNotBearTheNameOfTheirStarter) {
  if (!(RT_TEST_THREAD_SANITIZER || RT_TEST_IS_APPLE)) waitUntilWorkersHaveEnded();
  std::thread([&] {
    rt::Thread::setCurrentName("Importer"_s);
    const Ref<Queue> queue = rt::make<Queue>("test"_s);
    std::latch hasRun(1);
    rt::String name = "untouched"_s;
    char ofSystem[16] = "";
    queue->async([&] {
      name = rt::Thread::currentName();
      pthread_getname_np(pthread_self(), ofSystem, sizeof ofSystem);
      hasRun.count_down();
    });
    hasRun.wait();
    EXPECT_TRUE(name.isNull()) << name.view();
    EXPECT_STRNE(ofSystem, "Importer");
  }).join();
}

#if defined(__APPLE__)

TEST_F(QueueTest, ClassOfThreadsFollowsQualityOfService) {
  const struct {
    QualityOfService qualityOfService;
    qos_class_t ofSystem;
  } cases[] = {{QualityOfService::kUserInteractive, QOS_CLASS_DEFAULT},
               {QualityOfService::kDefault, QOS_CLASS_DEFAULT},
               {QualityOfService::kUtility, QOS_CLASS_UTILITY}};
  for (const auto& each : cases) {
    const Ref<Queue> queue = rt::make<Queue>("class"_s, each.qualityOfService);
    std::latch hasRun(1);
    qos_class_t ofTask = QOS_CLASS_UNSPECIFIED;
    queue->async([&] {
      ofTask = qos_class_self();
      hasRun.count_down();
    });
    hasRun.wait();
    EXPECT_EQ(ofTask, each.ofSystem);
  }
}

#else

TEST_F(QueueTest, NicenessFollowsQualityOfService) {
  const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
  const struct {
    QualityOfService qualityOfService;
    int added;
  } cases[] = {{QualityOfService::kUserInteractive, 0},
               {QualityOfService::kDefault, 0},
               {QualityOfService::kUtility, 5}};
  for (const auto& each : cases) {
    const Ref<Queue> queue = rt::make<Queue>("nice"_s, each.qualityOfService);
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

// Regression: a thread is as nice as the thread that starts it, and becoming less nice takes a privilege.
// Once a utility task had started a worker for urgent work, all urgent work ran as nicely.
TEST_F(QueueDeathTest, NicenessDoesNotSpreadToUrgentWork) {
  EXPECT_EXIT(
      {
        if (geteuid() == 0 && setresuid(65534, 65534, 65534) != 0) _exit(1);
        alarm(30);  // Instead of a hang.
        const rlimit none{};
        setrlimit(RLIMIT_NICE, &none);
        rt::detail::WorkerPool::idleTimeout = std::chrono::nanoseconds(std::chrono::hours(1)).count();
        const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
        const Ref<Queue> utility = rt::make<Queue>("utility"_s, QualityOfService::kUtility);
        std::latch hasRun(1);
        rt::ThreadIdentifier worker = 0;
        utility->async([&] {
          queue_->async([&] {
            worker = rt::currentThreadIdentifier();
            hasRun.count_down();
          });
        });
        hasRun.wait();
        const std::string path = "/proc/self/task/" + std::to_string(worker);
        while (std::filesystem::exists(path)) std::this_thread::yield();
        queue_->async(
            [&] { _exit(getpriority(PRIO_PROCESS, rt::currentThreadIdentifier()) == ofProcess ? 0 : 3); });
        for (;;) pause();
      },
      testing::ExitedWithCode(0), "");
}

#endif

// Where the system refuses threads.
class QueueWithoutThreadsDeathTest : public QueueTest {
 protected:
  void SetUp() override {
    if (RT_TEST_THREAD_SANITIZER || RT_TEST_ADDRESS_SANITIZER) {
      GTEST_SKIP() << "the sanitizers need more memory than a limit allows";
    }
    if (RT_TEST_IS_APPLE) GTEST_SKIP() << "macOS does not limit the memory for stacks";
  }
};

// Makes the system refuse threads. Existing memory stays usable, but a new stack is refused.
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

TEST_F(QueueWithoutThreadsDeathTest, TasksWaitIfTheSystemRefusesAThread) {
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

// Regression: a queue that had been refused a thread once never asked again. Its tasks waited until the
// process exited.
TEST_F(QueueWithoutThreadsDeathTest, AQueueTriesAgainAfterAThreadWasRefused) {
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

TEST_F(QueueWithoutThreadsDeathTest, TasksRunBeforeTheProcessExitsAlsoWithoutThreads) {
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

}  // namespace
