#include "Runtime/Queues/Private/QueueRegistry.h"

#include <pthread.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <vector>

#include "Runtime/Locks/Private/AddressWait.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Queues/Private/WakeDescriptor.h"
#include "Runtime/Queues/Queue.h"

namespace rt::detail {

namespace {

// Changes with each event that the thread that exits waits for.
constinit std::atomic<std::uint32_t> exitEvents = 0;

}  // namespace

constinit std::atomic<std::chrono::nanoseconds::rep> QueueRegistry::exitPatience =
    std::chrono::nanoseconds(std::chrono::seconds(10)).count();
constinit UnfairLock QueueRegistry::lock;
constinit std::atomic<bool> QueueRegistry::runsTasksAtExit_ = false;
constinit std::atomic<bool> QueueRegistry::isExiting_ = false;
constinit Queue* QueueRegistry::first_ = nullptr;

void QueueRegistry::add(Queue& queue) {
  registerForkHandler();
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

void QueueRegistry::changeExitEvents() noexcept {
  exitEvents.fetch_add(1, std::memory_order_release);
  wakeAtAddress(&exitEvents);
}

void QueueRegistry::drainAtExit() {
  static constinit Lazy<std::chrono::steady_clock::time_point> end;
  const std::chrono::steady_clock::time_point deadline = end.get([] {
    return std::chrono::steady_clock::now() +
           std::chrono::nanoseconds(exitPatience.load(std::memory_order_relaxed));
  });
  static bool hasGivenUp = false;
  if (hasGivenUp) return;
  isExiting_ = true;
  // A task that is queued from here on registers this function again. Destructors of static objects, which
  // run later, may queue such tasks.
  runsTasksAtExit_ = false;
  hasGivenUp = !runUntilIdle(deadline);
}

// Runs the queued tasks or waits for them, and returns whether none is left. While the pool has threads, it
// runs the tasks: a task that never ends must not occupy the thread that watches the clock.
bool QueueRegistry::runUntilIdle(std::chrono::steady_clock::time_point deadline) {
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
    if (all.empty()) return true;
    for (;;) {
      const std::uint32_t events = exitEvents.load(std::memory_order_acquire);
      // Also if it was not busy: a task that is waited for may itself wait for the main queue.
      MainQueue::instance().runHere();
      for (const Unfinished& each : all) {
        if (each.queue->isShortOfThreads()) each.queue->runHere();
      }
      std::erase_if(all, [](const Unfinished& each) { return each.queue->hasReached(each.goal); });
      if (all.empty()) break;
      const std::chrono::nanoseconds left = deadline - std::chrono::steady_clock::now();
      if (left.count() <= 0) {
        for (const Unfinished& each : all) {
          std::fprintf(stderr, "rt: the queue \"%.*s\" still runs a task at exit; what it holds is lost\n",
                       static_cast<int>(each.queue->label().length()), each.queue->label().view().data());
        }
        return false;
      }
      waitAtAddress(exitEvents, events, &left);
    }
  }
  return false;
}

void QueueRegistry::registerForkHandler() noexcept {
  static constinit std::atomic<bool> isRegistered = false;
  if (isRegistered.load(std::memory_order_relaxed) || isRegistered.exchange(true)) return;
  // If there is no memory for it now, the next queue tries again.
  if (pthread_atfork(nullptr, nullptr, resetAfterFork) != 0) isRegistered = false;
}

void QueueRegistry::resetAfterFork() noexcept {
  WorkerPool::resetAfterFork();
  MainQueue::wakeDescriptor_.renewAfterFork();
  const LockGuard guard(lock);
  for (Queue* queue = first_; queue != nullptr; queue = queue->next_) queue->resetAfterFork();
}

}  // namespace rt::detail
