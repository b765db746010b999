#pragma once

// All queues there are, for what concerns them all: exit and fork. For rt::Queue only.

#include <atomic>
#include <chrono>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"

namespace rt {

class Queue;

namespace detail {

class QueueRegistry {
 public:
  /// How long the program waits at exit for tasks that run, altogether.
  static constinit std::atomic<std::chrono::nanoseconds::rep> exitPatience;

  static void add(Queue& queue) RT_EXCLUDES(lock);
  static void remove(Queue& queue) noexcept RT_EXCLUDES(lock);

  /// Sees to it that what is queued runs before the process exits. Called when a queue gets a task, not
  /// when it is made: what tasks use has mostly been made by then, and is destroyed after they have run.
  static void runTasksAtExit() noexcept {
    if (!runsTasksAtExit_.load(std::memory_order_relaxed)) registerExitHandler();
  }

  /// Has the thread that exits, if there is one, look at the queues again. Called when one has got on, or
  /// has got a task: it may be the main queue, or there may be no thread for it.
  static void wakeExit() noexcept {
    if (isExiting_.load()) changeExitEvents();
  }

  /// Guards the list of all queues, which is in the queues.
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
