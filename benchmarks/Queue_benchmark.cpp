#include <benchmark/benchmark.h>

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Comparison.h"
#include "Runtime/Queues/Queue.h"

namespace {

using namespace rt::literals;

// A queue as one writes it by hand, with a thread, a mutex and a condition variable.
class ConditionQueue {
 public:
  ConditionQueue() : thread_([this] { run(); }) {}
  ~ConditionQueue() {
    {
      const std::lock_guard guard(mutex_);
      isStopping_ = true;
    }
    hasTasks_.notify_one();
    thread_.join();
  }
  ConditionQueue(const ConditionQueue&) = delete;
  ConditionQueue& operator=(const ConditionQueue&) = delete;

  void async(std::function<void()> task) {
    {
      const std::lock_guard guard(mutex_);
      tasks_.push_back(std::move(task));
    }
    hasTasks_.notify_one();
  }

 private:
  void run() {
    std::unique_lock lock(mutex_);
    for (;;) {
      hasTasks_.wait(lock, [&] { return isStopping_ || !tasks_.empty(); });
      if (tasks_.empty()) return;
      const std::function<void()> task = std::move(tasks_.front());
      tasks_.pop_front();
      lock.unlock();
      task();
      lock.lock();
    }
  }

  std::mutex mutex_;
  std::condition_variable hasTasks_;
  std::deque<std::function<void()>> tasks_;
  bool isStopping_ = false;
  std::thread thread_;
};

// Our queue with the same interface.
class OurQueue {
 public:
  template <class Task>
  void async(Task&& task) {
    queue_->async(std::forward<Task>(task));
  }

 private:
  rt::Ref<rt::Queue> queue_ = rt::make<rt::Queue>("benchmark"_s);
};

template <class Queue>
void waitForAll(Queue& queue) {
  std::atomic<bool> isDone = false;
  queue.async([&] {
    isDone = true;
    isDone.notify_one();
  });
  isDone.wait(false);
}

// Measures many small tasks from `kThreads` threads, until the last of them has run.
template <class Queue, int kThreads>
void throughput(benchmark::State& state) {
  constexpr int kTasks = 20'000;
  Queue queue;
  std::uint64_t count = 0;
  for (auto _ : state) {
    const auto post = [&] {
      for (int task = 0; task < kTasks; ++task) {
        queue.async([&count, task] { count += static_cast<std::uint64_t>(task); });
      }
    };
    std::vector<std::thread> others;
    for (int thread = 1; thread < kThreads; ++thread) others.emplace_back(post);
    post();
    for (std::thread& thread : others) thread.join();
    waitForAll(queue);
  }
  benchmark::DoNotOptimize(count);
  state.SetItemsProcessed(state.iterations() * kThreads * kTasks);
}

// Measures tasks that capture a text and two numbers, as a log record would.
template <class Queue>
void payload(benchmark::State& state) {
  constexpr int kTasks = 20'000;
  Queue queue;
  std::size_t length = 0;
  const std::string text = "a line of text that does not fit a small string";
  for (auto _ : state) {
    for (int task = 0; task < kTasks; ++task) {
      queue.async(
          [&length, text, level = task, line = task] { length += text.size() + std::size_t(level > line); });
    }
    waitForAll(queue);
  }
  benchmark::DoNotOptimize(length);
  state.SetItemsProcessed(state.iterations() * kTasks);
}

// Measures one task at a time, from `async` on an idle queue to the answer from its thread.
template <class Queue>
void roundTrip(benchmark::State& state) {
  Queue queue;
  for (auto _ : state) waitForAll(queue);
}

// Measures the same after a pause in which the queue's thread has gone to sleep.
template <class Queue>
void wakeUp(benchmark::State& state) {
  Queue queue;
  for (auto _ : state) {
    std::this_thread::sleep_for(std::chrono::microseconds(200));
    const auto start = std::chrono::steady_clock::now();
    waitForAll(queue);
    state.SetIterationTime(std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count());
  }
}

BENCHMARK(throughput<OurQueue, 1>)->Name("Queue/async/ours")->UseRealTime();
BENCHMARK(throughput<ConditionQueue, 1>)->Name("Queue/async/condition-variable")->UseRealTime();
BENCHMARK(throughput<OurQueue, 2>)->Name("Queue/async-2-threads/ours")->UseRealTime();
BENCHMARK(throughput<ConditionQueue, 2>)->Name("Queue/async-2-threads/condition-variable")->UseRealTime();
BENCHMARK(payload<OurQueue>)->Name("Queue/async-payload/ours")->UseRealTime();
BENCHMARK(payload<ConditionQueue>)->Name("Queue/async-payload/condition-variable")->UseRealTime();
BENCHMARK(roundTrip<OurQueue>)->Name("Queue/round-trip/ours")->UseRealTime();
BENCHMARK(roundTrip<ConditionQueue>)->Name("Queue/round-trip/condition-variable")->UseRealTime();
BENCHMARK(wakeUp<OurQueue>)->Name("Queue/wake-up/ours")->UseManualTime()->Iterations(1'000);
BENCHMARK(wakeUp<ConditionQueue>)
    ->Name("Queue/wake-up/condition-variable")
    ->UseManualTime()
    ->Iterations(1'000);

const Bound asyncBound("Queue/async", "condition-variable", 1.0);
const Bound asyncTwoThreadsBound("Queue/async-2-threads", "condition-variable", 1.0);
const Bound payloadBound("Queue/async-payload", "condition-variable", 1.0);
const Bound roundTripBound("Queue/round-trip", "condition-variable", 1.0);
const Bound wakeUpBound("Queue/wake-up", "condition-variable", 1.0);

}  // namespace
