#pragma once

// Writes the lines of buffered log files in time, and at exit. Internal to LUMLogFileBuffer.
//
// One task for the whole process sleeps until lines have waited for long enough. A queue has no timers, so
// the task occupies one of the threads that all queues share, once there is a buffered log file.

#include <atomic>
#include <cstdint>
#include <vector>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/Queue.h"

class LUMLogFileBuffer;

class LUMLogFlusher {
 public:
  /// Returns the flusher of the process. Never destroyed.
  static LUMLogFlusher& shared();

  LUMLogFlusher();
  LUMLogFlusher(const LUMLogFlusher&) = delete;
  LUMLogFlusher& operator=(const LUMLogFlusher&) = delete;

  /// Retains `buffer` and writes its lines in time. Throws std::bad_alloc.
  void add(const rt::Ref<LUMLogFileBuffer>& buffer) RT_EXCLUDES(lock_);
  /// Releases `buffer`.
  void remove(const LUMLogFileBuffer* buffer) noexcept RT_EXCLUDES(lock_);

  /// Starts the task, unless it runs in this process. Without memory it does not start, and lines wait until
  /// the next call, a full buffer or the exit.
  void run() noexcept RT_EXCLUDES(lock_);

  /// Wakes the task if it sleeps for longer than until `deadline`, on the monotonic clock.
  static void wakeBefore(std::uint64_t deadline) noexcept;

  /// Returns whether the process exits. Lines must then not wait any more.
  static bool isExiting() noexcept { return isExiting_.load(std::memory_order_relaxed); }

  /// Returns a number that is another one in the child of a fork, once counting has begun.
  static std::uint32_t forkCount() noexcept { return forkCount_.load(std::memory_order_relaxed); }
  static std::uint32_t beginToCountForks();

 private:
  void flushInTime() noexcept RT_EXCLUDES(lock_);
  static void flushAtExit();
  rt::Ref<LUMLogFileBuffer> mostUrgent(std::uint64_t& deadline) const noexcept RT_REQUIRES(lock_);

  static constinit std::atomic<std::uint32_t> forkCount_;
  static constinit std::atomic<bool> isExiting_;
  // Changes to wake the task.
  static constinit std::atomic<std::uint32_t> events_;
  // When the task wakes by itself.
  static constinit std::atomic<std::uint64_t> wakeTime_;

  const rt::Ref<rt::Queue> queue_;
  rt::UnfairLock lock_;
  std::vector<rt::Ref<LUMLogFileBuffer>> buffers_ RT_GUARDED_BY(lock_);
  bool isRunning_ RT_GUARDED_BY(lock_) = false;
  std::uint32_t runningForkCount_ RT_GUARDED_BY(lock_) = 0;
};
