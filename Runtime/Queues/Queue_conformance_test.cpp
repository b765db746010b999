// What all kinds of queues have in common. Each kind runs this suite.

#include <gtest/gtest.h>
#include <poll.h>

#include <array>
#include <atomic>
#include <cstddef>
#include <functional>
#include <latch>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <type_traits>
#include <utility>
#include <vector>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Queues/Queue.h"
#include "tests/support/AllocationCount.h"

#if !defined(__APPLE__)
#include <sys/resource.h>
#include <unistd.h>
#endif

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;

// A kind of queue. It makes a queue for a test, and runs the test's body while a thread serves the queue.
// It is a value and not a type, so that the suite is compiled once.
struct Kind {
  std::string name;
  rt::String label;
  int niceness;
  Ref<Queue> (*make)();
  void (*serveDuring)(const std::function<void()>& body);
};

Ref<Queue> makeSerialQueue() {
  return rt::make<Queue>("conformance"_s, rt::QualityOfService::kUtility);
}

Ref<Queue> mainQueue() {
  return Queue::main();
}

void runBody(const std::function<void()>& body) {
  body();
}

void runMainQueueDuring(const std::function<void()>& body) {
  std::thread thread([&] {
    body();
    rt::MainQueue::stop();
  });
  rt::MainQueue::run();
  thread.join();
}

void pollMainQueueDuring(const std::function<void()>& body) {
  std::atomic<bool> isDone = false;
  std::thread thread([&] {
    body();
    Queue::main()->async([&] { isDone = true; });
  });
  pollfd event{.fd = rt::MainQueue::fileDescriptor(), .events = POLLIN, .revents = 0};
  while (!isDone) {
    EXPECT_EQ(poll(&event, 1, -1), 1);
    rt::MainQueue::drain();
  }
  thread.join();
}

class QueueConformance : public testing::TestWithParam<Kind> {
 protected:
  QueueConformance() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  // Runs `body(queue)` while a thread serves the queue, and until all tasks that `body` has queued have run.
  static void serve(const std::function<void(Queue&)>& body) {
    GetParam().serveDuring([&] {
      const Ref<Queue> queue = GetParam().make();
      body(*queue);
      queue->barrierSync();
    });
  }

  static void inThreads(int count, const std::function<void(int)>& body) {
    std::vector<std::thread> threads;
    threads.reserve(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i) threads.emplace_back([&body, i] { body(i); });
    for (std::thread& thread : threads) thread.join();
  }
};

using QueueConformanceDeathTest = QueueConformance;

const Kind kKinds[] = {
    {"Serial", "conformance"_s, 5, makeSerialQueue, runBody},
    {"Main", rt::MainQueue::kLabel, 0, mainQueue, runMainQueueDuring},
    {"PolledMain", rt::MainQueue::kLabel, 0, mainQueue, pollMainQueueDuring},
};

std::string nameOf(const testing::TestParamInfo<Kind>& info) {
  return info.param.name;
}

INSTANTIATE_TEST_SUITE_P(Each, QueueConformance, testing::ValuesIn(kKinds), nameOf);
INSTANTIATE_TEST_SUITE_P(Each, QueueConformanceDeathTest, testing::ValuesIn(kKinds), nameOf);

TEST_P(QueueConformance, BarrierOfAnEmptyQueueReturns) {
  serve([](Queue& queue) {
    queue.barrierSync();
    queue.barrierSync([] {});
  });
}

TEST_P(QueueConformance, RunsATaskOnce) {
  int runs = 0;
  serve([&](Queue& queue) { queue.async([&] { ++runs; }); });
  EXPECT_EQ(runs, 1);
}

TEST_P(QueueConformance, KeepsTheOrder) {
  constexpr int kTasks = 1000;
  std::vector<int> order;
  serve([&](Queue& queue) {
    for (int i = 0; i < kTasks; ++i) queue.async([&order, i] { order.push_back(i); });
  });
  ASSERT_EQ(order.size(), std::size_t{kTasks});
  for (int i = 0; i < kTasks; ++i) ASSERT_EQ(order[static_cast<std::size_t>(i)], i);
}

TEST_P(QueueConformance, SyncRunsAfterQueuedTasks) {
  serve([](Queue& queue) {
    int count = 0;
    for (int round = 1; round <= 200; ++round) {
      queue.async([&] { ++count; });
      ASSERT_EQ(queue.sync([&] { return count; }), round);
    }
  });
}

TEST_P(QueueConformance, BarrierWaitsForAllEarlierTasks) {
  serve([](Queue& queue) {
    std::atomic<int> count = 0;
    for (int round = 1; round <= 100; ++round) {
      for (int i = 0; i < 10; ++i) queue.async([&] { ++count; });
      queue.barrierSync();
      ASSERT_EQ(count, 10 * round);
    }
  });
}

TEST_P(QueueConformance, SyncReturnsWhatTheTaskReturns) {
  serve([](Queue& queue) {
    std::string text = "changed in place";
    EXPECT_EQ(queue.sync([] { return 42; }), 42);
    EXPECT_EQ(queue.barrierSync([] { return std::string("moved"); }), "moved");
    EXPECT_EQ(*queue.sync([] { return std::make_unique<int>(7); }), 7);
    static_assert(std::is_same_v<decltype(queue.sync([&]() -> std::string& { return text; })), std::string&>);
    EXPECT_EQ(&queue.sync([&]() -> std::string& { return text; }), &text);
    static_assert(std::is_void_v<decltype(queue.sync([] {}))>);
    // A task that can be called once only, and moved but not copied.
    EXPECT_EQ(
        queue.sync([owned = std::make_unique<int>(3)]() mutable { return std::move(owned); }).operator*(), 3);
  });
}

TEST_P(QueueConformance, SyncThrowsWhatTheTaskThrows) {
  serve([](Queue& queue) {
    try {
      queue.sync([]() -> int { throw std::out_of_range("of the task"); });
      ADD_FAILURE() << "nothing was thrown";
    } catch (const std::out_of_range& exception) {
      EXPECT_STREQ(exception.what(), "of the task");
    }
    EXPECT_EQ(queue.sync([] { return 1; }), 1) << "the queue goes on";
  });
}

TEST_P(QueueConformance, SyncThrowsEvenIfTheQueueIsBusy) {
  serve([](Queue& queue) {
    for (int round = 0; round < 50; ++round) {
      queue.async([] { std::this_thread::yield(); });
      EXPECT_THROW(queue.sync([] { throw std::runtime_error("of the task"); }), std::runtime_error);
    }
  });
}

TEST_P(QueueConformance, TasksMayOnlyBeMovable) {
  int value = 0;
  serve([&](Queue& queue) { queue.async([&value, owned = std::make_unique<int>(5)] { value = *owned; }); });
  EXPECT_EQ(value, 5);
}

// Invariant: a task and its captures are destroyed before the next task starts.
TEST_P(QueueConformance, ATaskIsDestroyedOnceItHasRun) {
  serve([](Queue& queue) {
    auto held = std::make_shared<int>(0);
    queue.async([held] {});
    EXPECT_EQ(queue.sync([&] { return held.use_count(); }), 1);
  });
}

TEST_P(QueueConformance, QueuesNothingIfCopyingTheTaskThrows) {
  struct Uncopyable {
    Uncopyable() = default;
    Uncopyable(const Uncopyable&) { throw std::bad_alloc(); }
    void operator()() const { ADD_FAILURE() << "was queued"; }
  };
  serve([](Queue& queue) {
    const Uncopyable task;
    EXPECT_THROW(queue.async(task), std::bad_alloc);
  });
}

TEST_P(QueueConformance, TasksQueuedByTasksRunAfterEarlierOnes) {
  std::vector<int> order;
  serve([&](Queue& queue) {
    queue.sync([&] {
      queue.async([&] {
        order.push_back(1);
        queue.async([&] { order.push_back(3); });
      });
      queue.async([&] { order.push_back(2); });
    });
    queue.barrierSync();
  });
  EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
}

TEST_P(QueueConformance, TasksQueueTasksManyTimesOver) {
  constexpr int kTasks = 2000;
  int count = 0;
  std::latch allHaveRun(1);
  struct Next {
    Queue& queue;
    int& count;
    std::latch& allHaveRun;
    void operator()() const {
      if (++count == kTasks) {
        allHaveRun.count_down();
      } else {
        queue.async(*this);
      }
    }
  };
  serve([&](Queue& queue) {
    queue.async(Next{queue, count, allHaveRun});
    allHaveRun.wait();
  });
  EXPECT_EQ(count, kTasks);
}

// Invariant: at most one task runs at any time, whichever threads queue tasks and in whatever way.
TEST_P(QueueConformance, TasksDoNotOverlap) {
  std::atomic<int> inside = 0;
  const auto task = [&] {
    EXPECT_EQ(inside.fetch_add(1), 0);
    std::this_thread::yield();
    EXPECT_EQ(inside.fetch_sub(1), 1);
  };
  serve([&](Queue& queue) {
    inThreads(4, [&](int thread) {
      for (int i = 0; i < 200; ++i) {
        if ((i + thread) % 3 == 0) {
          queue.sync(task);
        } else {
          queue.async(task);
        }
      }
    });
  });
}

// Invariant: only tasks touch the plain variables `sum` and `last`. Each task sees what the task before it
// has written, on whichever thread, and the thread sanitizer finds no race.
TEST_P(QueueConformance, TasksSeeTheWritesOfEarlierTasks) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 250;
  long sum = 0;
  std::string last;
  serve([&](Queue& queue) {
    inThreads(kThreads, [&](int thread) {
      for (int i = 0; i < kRounds; ++i) {
        queue.async([&, text = std::to_string(thread) + " in a string of its own"] {
          sum += 1;
          last = text;
        });
        if (i % 10 == 0) {
          queue.sync([&] {
            sum += 1;
            last += "!";
          });
        }
      }
    });
    EXPECT_EQ(queue.sync([&] { return sum; }), kThreads * (kRounds + kRounds / 10));
  });
}

// Invariant: tasks of one thread run in the order in which that thread has queued them.
TEST_P(QueueConformance, KeepsTheOrderOfEachThread) {
  constexpr int kThreads = 8;
  constexpr int kTasks = 1000;
  std::vector<int> next(kThreads, 0);
  serve([&](Queue& queue) {
    inThreads(kThreads, [&](int thread) {
      for (int i = 0; i < kTasks; ++i) {
        queue.async([&mine = next[static_cast<std::size_t>(thread)], i] {
          ASSERT_EQ(mine, i);
          ++mine;
        });
      }
    });
  });
  EXPECT_EQ(next, std::vector<int>(kThreads, kTasks));
}

// Compares with a model. For a thread that queues and waits in a random order, it is as if each task had
// run at once.
TEST_P(QueueConformance, BehavesForOneThreadAsIfTasksRanAtOnce) {
  serve([](Queue& queue) {
    std::mt19937 random(20240611);
    std::vector<unsigned> ours;
    std::vector<unsigned> model;
    for (unsigned i = 0; i < 3000; ++i) {
      switch (random() % 8) {
        case 0:
          queue.sync([&] { ours.push_back(i); });
          model.push_back(i);
          break;
        case 1:
          ASSERT_EQ(queue.sync([&] { return ours; }), model);
          break;
        case 2:
          queue.barrierSync();
          break;
        case 3:
          queue.async([&] {
            if (!ours.empty()) ours.pop_back();
          });
          if (!model.empty()) model.pop_back();
          break;
        default:
          queue.async([&ours, i] { ours.push_back(i); });
          model.push_back(i);
      }
    }
    ASSERT_EQ(queue.sync([&] { return ours; }), model);
  });
}

TEST_P(QueueConformance, CurrentLabelIsSetOnlyInTasks) {
  EXPECT_EQ(Queue::currentLabel(), ""_s);
  serve([](Queue& queue) {
    EXPECT_EQ(queue.label(), GetParam().label);
    EXPECT_EQ(Queue::currentLabel(), ""_s);
    rt::String inAsync;
    queue.async([&] { inAsync = Queue::currentLabel(); });
    EXPECT_EQ(queue.sync([] { return Queue::currentLabel(); }), GetParam().label);
    EXPECT_EQ(inAsync, GetParam().label);
    EXPECT_THROW(queue.sync([] { throw std::runtime_error("of the task"); }), std::runtime_error);
    EXPECT_EQ(Queue::currentLabel(), ""_s);
  });
  EXPECT_EQ(Queue::currentLabel(), ""_s);
}

TEST_P(QueueConformance, CurrentLabelIsThatOfTheInnerQueue) {
  serve([](Queue& queue) {
    const Ref<Queue> inner = rt::make<Queue>("inner"_s);
    queue.sync([&] {
      EXPECT_EQ(inner->sync([] { return Queue::currentLabel(); }), "inner"_s);
      EXPECT_EQ(Queue::currentLabel(), GetParam().label);
    });
  });
}

TEST_P(QueueConformance, KnowsItsOwnTasks) {
  serve([](Queue& queue) {
    const Ref<Queue> other = rt::make<Queue>("other"_s);
    EXPECT_FALSE(queue.isCurrent());
    queue.sync([&] {
      queue.assertIsCurrent();
      EXPECT_TRUE(queue.isCurrent());
      EXPECT_FALSE(other->isCurrent());
    });
    EXPECT_FALSE(queue.isCurrent());
  });
}

#if !defined(__APPLE__)
TEST_P(QueueConformance, AsyncTasksRunWithTheNicenessOfTheirClass) {
  const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
  serve([&](Queue& queue) {
    std::latch hasRun(1);
    int ofTask = 0;
    queue.async([&] {
      ofTask = getpriority(PRIO_PROCESS, rt::currentThreadIdentifier());
      hasRun.count_down();
    });
    hasRun.wait();
    EXPECT_EQ(ofTask, std::min(19, ofProcess + GetParam().niceness));
  });
}
#endif

// Invariant: a queue without references exists until its tasks have run.
TEST_P(QueueConformance, RunsAllTasksAfterItsLastReferenceIsReleased) {
  GetParam().serveDuring([] {
    std::latch mayGoOn(1);
    std::latch allHaveRun(100);
    Ref<Queue> queue = GetParam().make();
    queue->async([&] { mayGoOn.wait(); });
    for (int i = 0; i < 100; ++i) queue->async([&] { allHaveRun.count_down(); });
    queue = nullptr;
    mayGoOn.count_down();
    allHaveRun.wait();
  });
}

TEST_P(QueueConformance, ATaskMayReleaseItsQueue) {
  GetParam().serveDuring([] {
    Ref<Queue> queue = GetParam().make();
    std::latch hasRun(2);
    queue->async([&] { hasRun.count_down(); });
    Queue& alias = *queue;
    alias.sync([&] {
      queue->async([&] { hasRun.count_down(); });
      queue = nullptr;
      EXPECT_EQ(Queue::currentLabel(), GetParam().label);
    });
    hasRun.wait();
  });
}

constinit std::atomic<int> uncaughtCount = 0;

TEST_P(QueueConformance, UncaughtExceptionsGoToTheHandler) {
  const auto before = Queue::setUncaughtExceptionHandler([](const Queue& queue) {
    EXPECT_EQ(queue.label(), GetParam().label);
    EXPECT_EQ(Queue::currentLabel(), GetParam().label);
    try {
      std::rethrow_exception(std::current_exception());
    } catch (const std::runtime_error& exception) {
      EXPECT_STREQ(exception.what(), "of the task");
    }
    ++uncaughtCount;
  });
  EXPECT_EQ(before, nullptr);
  uncaughtCount = 0;
  bool hasGoneOn = false;
  serve([&](Queue& queue) {
    queue.async([] { throw std::runtime_error("of the task"); });
    queue.async([&] { hasGoneOn = true; });
  });
  EXPECT_EQ(uncaughtCount, 1);
  EXPECT_TRUE(hasGoneOn);
  EXPECT_NE(Queue::setUncaughtExceptionHandler(nullptr), nullptr);
}

TEST_P(QueueConformance, AsyncAllocatesOnceAndSyncNever) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  serve([](Queue& queue) {
    queue.async([] {});
    queue.barrierSync();  // Allocates what the queue allocates only once.
    std::latch mayGoOn(1);
    queue.async([&] { mayGoOn.wait(); });
    const AllocationCount count;
    for (int i = 0; i < 100; ++i) queue.async([i, big = std::array<int, 100>()] { EXPECT_GE(i, big[0]); });
    EXPECT_EQ(count.allocations(), 100);
    mayGoOn.count_down();
    queue.barrierSync();
    const AllocationCount ofSync;
    for (int i = 0; i < 100; ++i) EXPECT_EQ(queue.sync([i] { return i; }), i);
    EXPECT_EQ(ofSync.allocations(), 0);
  });
}

std::string textOfRefusal(const rt::String& label) {
  return "rt: sync on the queue \"" + std::string(label.view()) + "\" from one of its own tasks";
}

TEST_P(QueueConformanceDeathTest, SyncFromASyncTaskIsRefused) {
  EXPECT_DEATH(
      serve([](Queue& queue) { queue.sync([&]() RT_NO_THREAD_SAFETY_ANALYSIS { queue.sync([] {}); }); }),
      textOfRefusal(GetParam().label));
}

TEST_P(QueueConformanceDeathTest, BarrierFromAnAsyncTaskIsRefused) {
  EXPECT_DEATH(serve([](Queue& queue) { queue.async([&] { queue.barrierSync(); }); }),
               textOfRefusal(GetParam().label));
}

TEST_P(QueueConformanceDeathTest, SyncFromWithinAnotherQueuesTaskIsRefused) {
  EXPECT_DEATH(serve([](Queue& queue) {
                 queue.sync([&] { rt::make<Queue>("other"_s)->sync([&] { queue.sync([] {}); }); });
               }),
               textOfRefusal(GetParam().label));
}

TEST_P(QueueConformanceDeathTest, UncaughtExceptionsEndTheProgram) {
  EXPECT_DEATH(serve([](Queue& queue) { queue.async([] { throw std::runtime_error("what it says"); }); }),
               "rt: an exception has left a task of the queue \"" + std::string(GetParam().label.view()) +
                   "\": what it says");
  EXPECT_DEATH(serve([](Queue& queue) { queue.async([] { throw 1; }); }),
               "\"" + std::string(GetParam().label.view()) + "\": something that is no std::exception");
}

TEST_P(QueueConformanceDeathTest, AssertIsCurrentOutsideEndsTheProgram) {
  EXPECT_DEATH(serve([](Queue& queue) { queue.assertIsCurrent(); }),
               "rt: outside of the tasks of the queue \"" + std::string(GetParam().label.view()) + "\"");
}

}  // namespace
