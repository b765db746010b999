#pragma once

// The threads that all queues share. For rt::Queue only.
//
// The first work starts the first thread. A thread that has had no work for `idleTimeout` ends. Work that
// finds no idle thread gets a new one, up to kMaximumThreads for utility work and as many for all other
// work. So tasks that wait for each other on different queues do not starve each other.
//
// macOS has threads for all queues of a process. They are not used, since they end the child of a fork that
// uses them.

#include <atomic>
#include <cstdint>

#include "Runtime/Queues/Private/LinkedList.h"
#include "Runtime/Queues/QualityOfService.h"

namespace rt::detail {

/// Something that a thread of the pool can do. The pool does not own it. It must exist until it has run.
class Work {
 public:
  Work(const Work&) = delete;
  Work& operator=(const Work&) = delete;

  /// Does the work. It is called on a thread of the pool.
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

  /// How many nanoseconds a thread without work stays. A change counts from a thread's next wait on.
  static constinit std::atomic<std::int64_t> idleTimeout;

  /// Makes a thread of the pool run `work` once. Precondition: `work` is not in the pool already. If there
  /// is no thread and the system refuses one, the work waits for the next call of this function or of
  /// `tryAgain`.
  static void schedule(Work& work, QualityOfService qualityOfService) noexcept;

  /// Asks the system for a thread once more if work of this quality of service waits for one.
  static void tryAgain(QualityOfService qualityOfService) noexcept;

  /// Returns whether work of this quality of service waits and no further thread can be had for it. The
  /// answer may be out of date at once.
  static bool isShort(QualityOfService qualityOfService) noexcept;

  /// Forgets all work and all threads but the calling one. For the child of a fork.
  static void resetAfterFork() noexcept;
};

}  // namespace rt::detail
