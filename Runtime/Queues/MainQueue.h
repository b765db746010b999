#pragma once

/// The main queue, whose tasks run on the main thread, when the host has it do so.
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
/// What is queued stays queued until the main thread does one or the other, calls `sync` on the main
/// queue, or exits. The main queue is a `rt::Queue` in every other way: see Runtime/Queues/Queue.h. On macOS
/// the system's own main loop drains it too.
///
/// Not for: programs whose main thread has no time for others; these use a queue of their own.

#include <atomic>
#include <cstddef>

#include "Runtime/Queues/Private/WakeDescriptor.h"
#include "Runtime/Queues/Queue.h"

namespace rt {

class MainQueue final : public Queue {
 public:
  /// Its label.
  static constexpr String kLabel = "main"_s;

  /// Runs the queue's tasks, and waits for more, until `stop` is called. Ends the program when called on
  /// another than the main thread or from a task of the main queue. Throws std::system_error when the
  /// system has no descriptor left to wait on.
  static void run();

  /// Makes `run` return once the task that is running, if any, has ended; what else is queued stays
  /// queued. Where `run` is not running, its next call returns at once. Any thread may call it, as may a
  /// task.
  static void stop() noexcept;

  /// Runs the tasks that are queued by now, and not those that they queue in turn. Returns how many it
  /// has run: 0 also when called from a task of the main queue, as an event loop within a task would.
  /// Ends the program when called on another than the main thread.
  static std::size_t drain();

  /// A descriptor that is readable while there is something to `drain`, for poll, select or epoll. It is
  /// opened by the first call, stays open for ever, and is not to be read or closed. In the child of a
  /// fork the same number stands for the child's own queue; an epoll set has to be given it again. Any
  /// thread may call it. Throws std::system_error when the system has no descriptor left.
  static int fileDescriptor();

 private:
  friend class Queue;
  friend class detail::QueueRegistry;

  MainQueue() : Queue(kLabel, QualityOfService::kUserInteractive) {}
  static MainQueue& instance();

  bool mayRunHere() const noexcept override;
  void schedule() noexcept override;
  static void checkThread(const char* operation) noexcept;

  static constinit detail::WakeDescriptor wakeDescriptor_;
  static constinit std::atomic<bool> isStopping_;
};

}  // namespace rt
