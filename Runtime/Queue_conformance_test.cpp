// What every kind of queue keeps: one suite, run by each of them.

#include <gtest/gtest.h>
#include <poll.h>

#include <array>
#include <atomic>
#include <cstddef>
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

#include "Runtime/MainQueue.h"
#include "Runtime/Queue.h"
#include "Runtime/ThreadIdentifier.h"
#include "tests/AllocationCount.h"

#if !defined(__APPLE__)
#include <sys/resource.h>
#include <unistd.h>
#endif

namespace {

using namespace rt::literals;
using rt::Queue;
using rt::Ref;

// Each kind makes a queue for a test and runs the test's body while the queue is being served.

struct SerialQueue {
  static constexpr rt::String kLabel = "conformance"_s;
  static constexpr int kNiceness = 5;
  static Ref<Queue> make() { return rt::make<Queue>(kLabel, rt::QualityOfService::kUtility, -2); }
  template <class Body>
  static void serveDuring(Body body) {
    body();
  }
};

struct RunMainQueue {
  static constexpr rt::String kLabel = rt::MainQueue::kLabel;
  static constexpr int kNiceness = 0;
  static Ref<Queue> make() { return Queue::main(); }
  template <class Body>
  static void serveDuring(Body body) {
    std::thread thread([&] {
      body();
      rt::MainQueue::stop();
    });
    rt::MainQueue::run();
    thread.join();
  }
};

struct PolledMainQueue : RunMainQueue {
  template <class Body>
  static void serveDuring(Body body) {
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
};

template <class Kind>
class QueueConformance : public testing::Test {
 protected:
  QueueConformance() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  /// Runs `body(queue)` while the queue is being served, and until all that it has queued has run.
  template <class Body>
  void serve(Body body) {
    Kind::serveDuring([&] {
      const Ref<Queue> queue = Kind::make();
      body(*queue);
      queue->barrierSync();
    });
  }

  template <class Body>
  static void inThreads(int count, Body body) {
    std::vector<std::thread> threads;
    threads.reserve(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i) threads.emplace_back([&body, i] { body(i); });
    for (std::thread& thread : threads) thread.join();
  }
};

class NameOfKind {
 public:
  template <class Kind>
  static std::string GetName(int) {
    if (std::is_same_v<Kind, SerialQueue>) return "Serial";
    return std::is_same_v<Kind, RunMainQueue> ? "Main" : "PolledMain";
  }
};

using Kinds = testing::Types<SerialQueue, RunMainQueue, PolledMainQueue>;
TYPED_TEST_SUITE(QueueConformance, Kinds, NameOfKind);

TYPED_TEST(QueueConformance, BarrierOfAnEmptyQueueReturns) {
  this->serve([](Queue& queue) {
    queue.barrierSync();
    queue.barrierSync([] {});
  });
}

TYPED_TEST(QueueConformance, RunsATaskOnce) {
  int runs = 0;
  this->serve([&](Queue& queue) { queue.async([&] { ++runs; }); });
  EXPECT_EQ(runs, 1);
}

TYPED_TEST(QueueConformance, KeepsTheOrder) {
  constexpr int kTasks = 1000;
  std::vector<int> order;
  this->serve([&](Queue& queue) {
    for (int i = 0; i < kTasks; ++i) queue.async([&order, i] { order.push_back(i); });
  });
  ASSERT_EQ(order.size(), std::size_t{kTasks});
  for (int i = 0; i < kTasks; ++i) ASSERT_EQ(order[static_cast<std::size_t>(i)], i);
}

TYPED_TEST(QueueConformance, SyncRunsAfterWhatIsQueued) {
  this->serve([](Queue& queue) {
    int count = 0;
    for (int round = 1; round <= 200; ++round) {
      queue.async([&] { ++count; });
      ASSERT_EQ(queue.sync([&] { return count; }), round);
    }
  });
}

TYPED_TEST(QueueConformance, BarrierWaitsForAllBefore) {
  this->serve([](Queue& queue) {
    std::atomic<int> count = 0;
    for (int round = 1; round <= 100; ++round) {
      for (int i = 0; i < 10; ++i) queue.async([&] { ++count; });
      queue.barrierSync();
      ASSERT_EQ(count, 10 * round);
    }
  });
}

TYPED_TEST(QueueConformance, SyncReturnsWhatTheTaskReturns) {
  this->serve([](Queue& queue) {
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

TYPED_TEST(QueueConformance, SyncThrowsWhatTheTaskThrows) {
  this->serve([](Queue& queue) {
    try {
      queue.sync([]() -> int { throw std::out_of_range("of the task"); });
      ADD_FAILURE() << "nothing was thrown";
    } catch (const std::out_of_range& exception) {
      EXPECT_STREQ(exception.what(), "of the task");
    }
    EXPECT_EQ(queue.sync([] { return 1; }), 1) << "the queue goes on";
  });
}

TYPED_TEST(QueueConformance, SyncThrowsAlsoWhenTheQueueIsBusy) {
  this->serve([](Queue& queue) {
    for (int round = 0; round < 50; ++round) {
      queue.async([] { std::this_thread::yield(); });
      EXPECT_THROW(queue.sync([] { throw std::runtime_error("of the task"); }), std::runtime_error);
    }
  });
}

TYPED_TEST(QueueConformance, TasksMayOnlyBeMovable) {
  int value = 0;
  this->serve(
      [&](Queue& queue) { queue.async([&value, owned = std::make_unique<int>(5)] { value = *owned; }); });
  EXPECT_EQ(value, 5);
}

// Invariant: a task has gone, with all that it holds, when the next one starts.
TYPED_TEST(QueueConformance, ATaskIsDestroyedOnceItHasRun) {
  this->serve([](Queue& queue) {
    auto held = std::make_shared<int>(0);
    queue.async([held] {});
    EXPECT_EQ(queue.sync([&] { return held.use_count(); }), 1);
  });
}

TYPED_TEST(QueueConformance, NothingIsQueuedWhenTheTaskCannotBeCopied) {
  struct Uncopyable {
    Uncopyable() = default;
    Uncopyable(const Uncopyable&) { throw std::bad_alloc(); }
    void operator()() const { ADD_FAILURE() << "was queued"; }
  };
  this->serve([](Queue& queue) {
    const Uncopyable task;
    EXPECT_THROW(queue.async(task), std::bad_alloc);
  });
}

TYPED_TEST(QueueConformance, TasksThatTasksQueueComeAfterWhatIsQueued) {
  std::vector<int> order;
  this->serve([&](Queue& queue) {
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

TYPED_TEST(QueueConformance, TasksQueueTasksManyTimesOver) {
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
  this->serve([&](Queue& queue) {
    queue.async(Next{queue, count, allHaveRun});
    allHaveRun.wait();
  });
  EXPECT_EQ(count, kTasks);
}

// Invariant: at most one task is inside at any time, whoever queues and however.
TYPED_TEST(QueueConformance, TasksDoNotOverlap) {
  std::atomic<int> inside = 0;
  const auto task = [&] {
    EXPECT_EQ(inside.fetch_add(1), 0);
    std::this_thread::yield();
    EXPECT_EQ(inside.fetch_sub(1), 1);
  };
  this->serve([&](Queue& queue) {
    this->inThreads(4, [&](int thread) {
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

// Invariant: `sum` and `last` are plain data that only tasks touch, so each task sees what the one before
// it has left there, on whichever thread; the thread sanitizer sees no race.
TYPED_TEST(QueueConformance, TasksSeeWhatTasksHaveWritten) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 250;
  long sum = 0;
  std::string last;
  this->serve([&](Queue& queue) {
    this->inThreads(kThreads, [&](int thread) {
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

// Invariant: what one thread queues runs in that thread's order, whatever the other threads do.
TYPED_TEST(QueueConformance, EveryThreadsOrderIsKept) {
  constexpr int kThreads = 8;
  constexpr int kTasks = 1000;
  std::vector<int> next(kThreads, 0);
  this->serve([&](Queue& queue) {
    this->inThreads(kThreads, [&](int thread) {
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

// Against a model: a thread that queues and waits in a random order sees the queue as if its tasks had run
// at once.
TYPED_TEST(QueueConformance, IsLikeRunningTasksAtOnceForOneThread) {
  this->serve([](Queue& queue) {
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

TYPED_TEST(QueueConformance, LabelIsTheCurrentOneInTasksOnly) {
  EXPECT_EQ(Queue::currentLabel(), ""_s);
  this->serve([](Queue& queue) {
    EXPECT_EQ(queue.label(), TypeParam::kLabel);
    EXPECT_EQ(Queue::currentLabel(), ""_s);
    rt::String inAsync;
    queue.async([&] { inAsync = Queue::currentLabel(); });
    EXPECT_EQ(queue.sync([] { return Queue::currentLabel(); }), TypeParam::kLabel);
    EXPECT_EQ(inAsync, TypeParam::kLabel);
    EXPECT_THROW(queue.sync([] { throw std::runtime_error("of the task"); }), std::runtime_error);
    EXPECT_EQ(Queue::currentLabel(), ""_s);
  });
  EXPECT_EQ(Queue::currentLabel(), ""_s);
}

TYPED_TEST(QueueConformance, LabelOfTheInnerQueueIsTheCurrentOne) {
  this->serve([](Queue& queue) {
    const Ref<Queue> inner = rt::make<Queue>("inner"_s);
    queue.sync([&] {
      EXPECT_EQ(inner->sync([] { return Queue::currentLabel(); }), "inner"_s);
      EXPECT_EQ(Queue::currentLabel(), TypeParam::kLabel);
    });
  });
}

TYPED_TEST(QueueConformance, KnowsItsOwnTasks) {
  this->serve([](Queue& queue) {
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
TYPED_TEST(QueueConformance, AsyncTasksRunWithTheNicenessOfTheirClass) {
  const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
  this->serve([&](Queue& queue) {
    std::latch hasRun(1);
    int ofTask = 0;
    queue.async([&] {
      ofTask = getpriority(PRIO_PROCESS, rt::currentThreadIdentifier());
      hasRun.count_down();
    });
    hasRun.wait();
    EXPECT_EQ(ofTask, std::min(19, ofProcess + TypeParam::kNiceness));
  });
}
#endif

// Invariant: a queue that nobody refers to any more lives until its tasks have run.
TYPED_TEST(QueueConformance, ReleasedWithTasksItRunsThemAll) {
  TypeParam::serveDuring([] {
    std::latch mayGoOn(1);
    std::latch allHaveRun(100);
    Ref<Queue> queue = TypeParam::make();
    queue->async([&] { mayGoOn.wait(); });
    for (int i = 0; i < 100; ++i) queue->async([&] { allHaveRun.count_down(); });
    queue = nullptr;
    mayGoOn.count_down();
    allHaveRun.wait();
  });
}

TYPED_TEST(QueueConformance, ATaskMayReleaseItsQueue) {
  TypeParam::serveDuring([] {
    Ref<Queue> queue = TypeParam::make();
    std::latch hasRun(2);
    queue->async([&] { hasRun.count_down(); });
    Queue& alias = *queue;
    alias.sync([&] {
      queue->async([&] { hasRun.count_down(); });
      queue = nullptr;
      EXPECT_EQ(Queue::currentLabel(), TypeParam::kLabel);
    });
    hasRun.wait();
  });
}

constinit std::atomic<int> uncaughtCount = 0;

TYPED_TEST(QueueConformance, UncaughtExceptionsGoToTheHandler) {
  const auto before = Queue::setUncaughtExceptionHandler([](const Queue& queue) {
    EXPECT_EQ(queue.label(), TypeParam::kLabel);
    EXPECT_EQ(Queue::currentLabel(), TypeParam::kLabel);
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
  this->serve([&](Queue& queue) {
    queue.async([] { throw std::runtime_error("of the task"); });
    queue.async([&] { hasGoneOn = true; });
  });
  EXPECT_EQ(uncaughtCount, 1);
  EXPECT_TRUE(hasGoneOn);
  EXPECT_NE(Queue::setUncaughtExceptionHandler(nullptr), nullptr);
}

TYPED_TEST(QueueConformance, AsyncAllocatesOnceAndSyncNever) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  this->serve([](Queue& queue) {
    queue.async([] {});
    queue.barrierSync();  // What is made once has been made.
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

template <class Kind>
using QueueConformanceDeathTest = QueueConformance<Kind>;
TYPED_TEST_SUITE(QueueConformanceDeathTest, Kinds, NameOfKind);

std::string textOfRefusal(const rt::String& label) {
  return "rt: sync on the queue \"" + std::string(label.view()) + "\" from one of its own tasks";
}

TYPED_TEST(QueueConformanceDeathTest, SyncFromASyncTaskIsRefused) {
  EXPECT_DEATH(this->serve([](Queue& queue) {
    queue.sync([&]() RT_NO_THREAD_SAFETY_ANALYSIS { queue.sync([] {}); });
  }),
               textOfRefusal(TypeParam::kLabel));
}

TYPED_TEST(QueueConformanceDeathTest, BarrierFromAnAsyncTaskIsRefused) {
  EXPECT_DEATH(this->serve([](Queue& queue) { queue.async([&] { queue.barrierSync(); }); }),
               textOfRefusal(TypeParam::kLabel));
}

TYPED_TEST(QueueConformanceDeathTest, SyncFromWithinAnotherQueuesTaskIsRefused) {
  EXPECT_DEATH(this->serve([](Queue& queue) {
    queue.sync([&] { rt::make<Queue>("other"_s)->sync([&] { queue.sync([] {}); }); });
  }),
               textOfRefusal(TypeParam::kLabel));
}

TYPED_TEST(QueueConformanceDeathTest, UncaughtExceptionsEndTheProgram) {
  EXPECT_DEATH(
      this->serve([](Queue& queue) { queue.async([] { throw std::runtime_error("what it says"); }); }),
      "rt: an exception has left a task of the queue \"" + std::string(TypeParam::kLabel.view()) +
          "\": what it says");
  EXPECT_DEATH(this->serve([](Queue& queue) { queue.async([] { throw 1; }); }),
               "\"" + std::string(TypeParam::kLabel.view()) + "\": something that is no std::exception");
}

TYPED_TEST(QueueConformanceDeathTest, AssertIsCurrentOutsideEndsTheProgram) {
  EXPECT_DEATH(this->serve([](Queue& queue) { queue.assertIsCurrent(); }),
               "rt: outside of the tasks of the queue \"" + std::string(TypeParam::kLabel.view()) + "\"");
}

}  // namespace
