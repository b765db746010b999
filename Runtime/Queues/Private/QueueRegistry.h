#pragma once

// The list of all queues, which handles exit and fork for them. For rt::Queue only.

#include <atomic>
#include <chrono>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"

namespace rt {

class Queue;

namespace detail {

class QueueRegistry {
 public:
  /// How long the program waits at exit for running tasks, in total.
  static constinit std::atomic<std::chrono::nanoseconds::rep> exitPatience;

  static void add(Queue& queue) RT_EXCLUDES(lock);
  static void remove(Queue& queue) noexcept RT_EXCLUDES(lock);

  /// Ensures that queued tasks run before the process exits. It is called when a queue gets a task, not
  /// when a queue is made. Most static objects that tasks use exist by then, and so are destroyed after the
  /// tasks.
  static void runTasksAtExit() noexcept {
    if (!runsTasksAtExit_.load(std::memory_order_relaxed)) registerExitHandler();
  }

  /// Makes the thread that exits, if there is one, look at the queues again. It is called when a queue has
  /// run or got a task: the queue may be the main queue, or have no thread.
  static void wakeExit() noexcept {
    if (isExiting_.load()) changeExitEvents();
  }

  /// Guards the list of all queues, whose links are in the queues.
  static constinit UnfairLock lock;

 private:
  static void registerForkHandler() noexcept;
  static void registerExitHandler() noexcept;
  static void changeExitEvents() noexcept;
  static void drainAtExit();
  static bool runUntilIdle(std::chrono::steady_clock::time_point deadline);
  static void resetAfterFork() noexcept;

  static constinit std::atomic<bool> runsTasksAtExit_;
  static constinit std::atomic<bool> isExiting_;
  static constinit Queue* first_ RT_GUARDED_BY(lock);
};

}  // namespace detail
}  // namespace rt
