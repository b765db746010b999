#include "Runtime/QueueRegistry.h"

#include <pthread.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <thread>
#include <vector>

#include "Runtime/MainQueue.h"
#include "Runtime/Queue.h"
#include "Runtime/ThreadIdentifier.h"

namespace rt::detail {

constinit std::atomic<std::chrono::nanoseconds::rep> QueueRegistry::exitPatience =
    std::chrono::nanoseconds(std::chrono::seconds(10)).count();
constinit UnfairLock QueueRegistry::lock;
constinit std::atomic<bool> QueueRegistry::runsTasksAtExit_ = false;
constinit Queue* QueueRegistry::first_ = nullptr;

void QueueRegistry::add(Queue& queue) {
  registerForkHandlers();
  LockGuard guard(lock);
  queue.next_ = first_;
  if (first_ != nullptr) first_->previous_ = &queue;
  first_ = &queue;
}

void QueueRegistry::remove(Queue& queue) noexcept {
  LockGuard guard(lock);
  (queue.previous_ == nullptr ? first_ : queue.previous_->next_) = queue.next_;
  if (queue.next_ != nullptr) queue.next_->previous_ = queue.previous_;
}

void QueueRegistry::registerExitHandler() noexcept {
  if (!runsTasksAtExit_.exchange(true)) std::atexit(drainAtExit);
}

void QueueRegistry::drainAtExit() {
  using Clock = std::chrono::steady_clock;
  // A thread may be making the main queue at this moment, which is in the list before it is whole: this
  // waits until it is.
  MainQueue::instance();
  const Clock::time_point deadline =
      Clock::now() + std::chrono::nanoseconds(exitPatience.load(std::memory_order_relaxed));
  struct Unfinished {
    Ref<Queue> queue;
    std::uint64_t goal;
  };
  for (int round = 0; round < Queue::kExitRounds; ++round) {
    std::vector<Unfinished> all;
    {
      LockGuard guard(lock);
      for (Queue* queue = first_; queue != nullptr; queue = queue->next_) {
        if (const auto goal = queue->exitGoal()) all.push_back({Ref<Queue>::adopt(queue), *goal});
      }
    }
    if (all.empty()) return;
    for (;;) {
      std::size_t count = 0;
      for (const Unfinished& each : all) count += each.queue->runHere();
      std::erase_if(all, [](const Unfinished& each) { return each.queue->hasReached(each.goal); });
      if (all.empty()) break;
      if (count != 0) continue;
      if (Clock::now() >= deadline) {
        for (const Unfinished& each : all) {
          std::fprintf(stderr, "rt: the queue \"%.*s\" still runs a task at exit; what it holds is lost\n",
                       static_cast<int>(each.queue->label().length()), each.queue->label().view().data());
        }
        return;
      }
      // A task that is waited for may itself have come to wait for the main queue since.
      MainQueue::instance().runHere();
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
  }
}

void QueueRegistry::registerForkHandlers() noexcept {
  static constinit std::atomic<bool> isRegistered = false;
  if (isRegistered.load(std::memory_order_relaxed) || isRegistered.exchange(true)) return;
  currentThreadIdentifier();  // Its handler comes first, so that ours knows the thread.
  pthread_atfork([]() RT_NO_THREAD_SAFETY_ANALYSIS { lock.lock(); },
                 []() RT_NO_THREAD_SAFETY_ANALYSIS { lock.unlock(); }, resetAfterFork);
}

// Not analysed: the lock has been taken before the fork and is made anew.
void QueueRegistry::resetAfterFork() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  WorkerPool::resetAfterFork();
  MainQueue::wakeDescriptor_.renewAfterFork();
  for (Queue* queue = first_; queue != nullptr; queue = queue->next_) queue->resetAfterFork();
  new (&lock) UnfairLock;
}

}  // namespace rt::detail
