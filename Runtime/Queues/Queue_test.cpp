// Behaviour of serial queues only. Queue_conformance_test.cpp tests what all kinds of queues have in common,
// Queue_workers_test.cpp the threads that run queues, and Queue_exit_test.cpp exit and fork.

#include "Runtime/Queues/Queue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <functional>
#include <latch>
#include <random>
#include <thread>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "tests/support/QueueTest.h"

namespace {

using namespace rt::literals;
using rt::QualityOfService;
using rt::Queue;
using rt::Ref;

TEST_F(QueueTest, StoresItsLabelAndPriorities) {
  const Ref<Queue> queue = rt::make<Queue>("made"_s, QualityOfService::kUtility);
  EXPECT_EQ(queue->label(), "made"_s);
  EXPECT_EQ(queue->qualityOfService(), QualityOfService::kUtility);
  EXPECT_EQ(queue_->qualityOfService(), QualityOfService::kDefault);
  EXPECT_EQ(rt::make<Queue>(nullptr)->label(), ""_s);
}

TEST_F(QueueTest, AcceptsCallablesOfTheRightForm) {
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

TEST_F(QueueTest, AnIdleQueueRunsSyncOnTheCallersThread) {
  const auto caller = std::this_thread::get_id();
  EXPECT_EQ(queue_->sync([] { return std::this_thread::get_id(); }), caller);
}

TEST_F(QueueTest, AsyncRunsOnAnotherThread) {
  std::latch hasRun(1);
  std::thread::id runner;
  queue_->async([&] {
    runner = std::this_thread::get_id();
    hasRun.count_down();
  });
  hasRun.wait();
  EXPECT_NE(runner, std::this_thread::get_id());
}

TEST_F(QueueTest, IsDestroyedAfterItsLastReferenceAndItsLastTask) {
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
  while (weak.lock() != nullptr) std::this_thread::yield();  // Until the queue is destroyed.
}

// A thread that stops running a queue hands it to a waiting thread, but not to one whose task has run
// already.
TEST_F(QueueTest, GoesOnAfterAWaitingThreadHasRunItsTask) {
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
    const auto next = static_cast<std::size_t>(depth++);
    queues[next]->sync(descend);
  };
  queue_->async(descend);
  queue_->barrierSync();
  EXPECT_EQ(depth, kQueues);
}

// Invariant: on each queue, a thread's tasks run in the order in which it has queued them, one at a time,
// and none is lost.
TEST_F(QueueTest, ManyThreadsUseManyQueuesAtRandom) {
  constexpr std::size_t kQueues = 5;
  constexpr std::size_t kThreads = 6;
  constexpr int kSteps = 1000;
  struct State {
    Ref<Queue> queue = rt::make<Queue>("random"_s);
    std::vector<int> next = std::vector<int>(kThreads, 0);  // Only the queue's tasks touch it.
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
            // From a task of another queue, which waits. The direction is always the same, since queues that
            // wait for each other deadlock.
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

}  // namespace
