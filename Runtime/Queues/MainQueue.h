#pragma once

/// The main queue. Its tasks run on the main thread, when the host calls `run` or `drain` there.
///
///     int main() {
///       startService([](Result result) { rt::Queue::main()->async([=] { show(result); }); });
///       rt::MainQueue::run();              // until a task, or another thread, calls stop()
///     }
///
/// A host with an event loop of its own polls instead:
///
///     pollfd ready[] = {{.fd = rt::MainQueue::fileDescriptor(), .events = POLLIN, .revents = 0}};
///     while (poll(ready, std::size(ready), -1) > 0) {
///       if (ready[0].revents != 0) rt::MainQueue::drain();
///       ...
///     }
///
/// Tasks stay queued until the main thread calls `run` or `drain`, calls `sync` on the main queue, or
/// exits. In every other way the main queue is like any `rt::Queue` (Runtime/Queues/Queue.h). On macOS the
/// system's own main loop (`CFRunLoopRun`, `NSApplicationMain`) drains it too, but not in the child of a
/// fork. A host that calls `dispatch_main` there has no main thread any more, so nothing runs its tasks.
///
/// Not for: programs whose main thread has no time to run tasks. They use a queue of their own.

#include <atomic>
#include <cstddef>

#include "Runtime/Queues/Queue.h"

namespace rt::detail {
class WakeDescriptor;
}

namespace rt {

class MainQueue final : public Queue {
 public:
  /// The label of the main queue.
  static constexpr String kLabel = "main"_s;

  /// Runs the queue's tasks and waits for more, until `stop` is called. Ends the program if another thread
  /// than the main thread calls it, or a task of the main queue. Throws std::system_error if the system has
  /// no descriptor left to wait on.
  static void run();

  /// Makes `run` return when the running task, if any, has ended. All other tasks stay queued. If `run` is
  /// not running, its next call returns at once. Threads: any thread and any task may call it.
  static void stop() noexcept;

  /// Runs the tasks that are queued now, without those that they queue in turn. Returns how many it has run.
  /// A call from a task of the main queue, such as an event loop inside a task, runs none and returns 0. Ends
  /// the program if another thread than the main thread calls it.
  static std::size_t drain();

  /// Returns a descriptor for poll, select or epoll, which is readable while there are tasks to `drain`.
  /// The first call opens it. It stays open for ever, and must be neither read nor closed. In the child of
  /// a fork the same number stands for the child's own queue; add it to an epoll set again there. Threads:
  /// any thread may call it. Throws std::system_error if the system has no descriptor left.
  static int fileDescriptor();

 private:
  friend class Queue;
  friend class detail::QueueRegistry;

  MainQueue() : Queue(kLabel, QualityOfService::kUserInteractive) {}
  static MainQueue& instance();

  bool mayRunHere() const noexcept override;
  void schedule() noexcept override;
  static void checkThread(const char* operation) noexcept;

  static detail::WakeDescriptor wakeDescriptor_;
  static constinit std::atomic<bool> isStopping_;
};

}  // namespace rt
