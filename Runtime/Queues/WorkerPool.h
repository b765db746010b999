#pragma once

// The threads that all queues share. For rt::Queue only.
//
// No thread runs until there is the first work; one that has had none for `idleTimeout` ends. Work that
// finds no idle thread gets a new one, up to kMaximumThreads for urgent and as many for other work: so tasks
// that wait for each other on different queues do not starve each other. On macOS the threads are the
// system's.

#include <atomic>
#include <chrono>
#include <cstdint>

#include "Runtime/Queues/LinkedList.h"
#include "Runtime/Queues/QualityOfService.h"

namespace rt::detail {

/// Something a worker can do. It belongs to whoever schedules it and must last until it has run.
class Work {
 public:
  Work(const Work&) = delete;
  Work& operator=(const Work&) = delete;

  /// Does it, on a thread of the pool.
  virtual void runOnWorker() noexcept = 0;

 protected:
  constexpr Work() noexcept = default;
  virtual ~Work() = default;

 private:
  friend class LinkedList<Work>;
  Work* next_ = nullptr;
};

using WorkList = LinkedList<Work>;

class WorkerPool {
 public:
  static constexpr int kMaximumThreads = 64;

  /// How long a thread without work stays, from its next wait on.
  static constinit std::atomic<std::chrono::nanoseconds::rep> idleTimeout;

  /// Has some thread of the pool run `work` once. It is in the pool once at a time. Where the system
  /// refuses a thread and there is none, the work waits for the next call of this or of `tryAgain`.
  static void schedule(Work& work, QualityOfService qualityOfService) noexcept;

  /// Asks the system for a thread once more, where work of the kind waits for one.
  static void tryAgain(QualityOfService qualityOfService) noexcept;

  /// Whether work of the kind waits and no further thread can be had for it; out of date at once.
  static bool isShort(QualityOfService qualityOfService) noexcept;

  /// In the child of a fork: forgets all work and all threads but the caller.
  static void resetAfterFork() noexcept;
};

}  // namespace rt::detail
