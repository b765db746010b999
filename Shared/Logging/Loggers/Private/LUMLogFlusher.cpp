#include "Shared/Logging/Loggers/Private/LUMLogFlusher.h"

#include <pthread.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <new>
#include <utility>

#include "Runtime/Base/Private/MonotonicClock.h"
#include "Runtime/Locks/Private/AddressWait.h"
#include "Runtime/Locks/Private/Lazy.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Queues/Private/TaskContext.h"
#include "Shared/Logging/Loggers/Private/LUMLogFileBuffer.h"

namespace {

using namespace rt::literals;

constexpr std::uint32_t kExitPatienceInMilliseconds = 1000;

}  // namespace

constinit std::atomic<std::uint32_t> LUMLogFlusher::forkCount_ = 0;
constinit std::atomic<bool> LUMLogFlusher::isExiting_ = false;
constinit std::atomic<std::uint32_t> LUMLogFlusher::events_ = 0;
constinit std::atomic<std::uint64_t> LUMLogFlusher::wakeTime_ = LUMLogFileBuffer::kNever;

LUMLogFlusher& LUMLogFlusher::shared() {
  static constinit rt::Lazy<LUMLogFlusher> flusher;
  return flusher.get([] { return LUMLogFlusher(); });
}

std::uint32_t LUMLogFlusher::beginToCountForks() {
  static constinit rt::Lazy<bool> isRegistered;
  isRegistered.get([] {
    const auto count = [] { forkCount_.fetch_add(1, std::memory_order_relaxed); };
    return pthread_atfork(nullptr, nullptr, count) == 0;
  });
  return forkCount();
}

LUMLogFlusher::LUMLogFlusher()
    : queue_(rt::make<rt::Queue>("LUMLogFlusher"_s, rt::QualityOfService::kUtility)) {
  // The first task of a program arranges that tasks run at exit. What is registered after that runs before
  // it, so that the task does not keep the program from ending.
  queue_->async([] {});
  std::atexit(flushAtExit);
}

void LUMLogFlusher::add(const rt::Ref<LUMLogFileBuffer>& buffer) {
  {
    const rt::LockGuard guard(lock_);
    buffers_.push_back(buffer);
  }
  run();
}

void LUMLogFlusher::remove(const LUMLogFileBuffer* buffer) noexcept {
  rt::Ref<LUMLogFileBuffer> released;
  const rt::LockGuard guard(lock_);
  const auto place = std::ranges::find(buffers_, buffer, [](const auto& each) { return each.get(); });
  if (place == buffers_.end()) return;
  released = std::exchange(*place, std::move(buffers_.back()));
  buffers_.pop_back();
}

void LUMLogFlusher::run() noexcept {
  {
    const rt::LockGuard guard(lock_);
    if (isExiting() || (isRunning_ && runningForkCount_ == forkCount())) return;
    isRunning_ = true;
    runningForkCount_ = forkCount();
  }
  // The task is nobody's: it must not keep the metadata of the thread that happens to start it.
  const rt::TaskContext::Scope none(nullptr);
  try {
    queue_->async([this] { flushInTime(); });
  } catch (const std::bad_alloc&) {
    const rt::LockGuard guard(lock_);
    isRunning_ = false;
  }
}

void LUMLogFlusher::wakeBefore(std::uint64_t deadline) noexcept {
  // The deadline has been stored. The task stores its own time before it reads the deadlines.
  if (deadline >= wakeTime_.load(std::memory_order_seq_cst)) return;
  events_.fetch_add(1, std::memory_order_release);
  rt::detail::wakeAllAtAddress(&events_);
}

// Returns the buffer with the earliest deadline, and that deadline: the buffer may get a later one meanwhile.
rt::Ref<LUMLogFileBuffer> LUMLogFlusher::mostUrgent(std::uint64_t& deadline) const noexcept {
  rt::Ref<LUMLogFileBuffer> buffer;
  for (const rt::Ref<LUMLogFileBuffer>& each : buffers_) {
    const std::uint64_t other = each->deadline();
    if (buffer != nullptr && other >= deadline) continue;
    buffer = each;
    deadline = other;
  }
  return buffer;
}

void LUMLogFlusher::flushInTime() noexcept {
  for (;;) {
    const std::uint32_t event = events_.load(std::memory_order_acquire);
    wakeTime_.store(LUMLogFileBuffer::kNever, std::memory_order_seq_cst);
    rt::Ref<LUMLogFileBuffer> buffer;
    std::uint64_t deadline = LUMLogFileBuffer::kNever;
    {
      const rt::LockGuard guard(lock_);
      buffer = mostUrgent(deadline);
      if (buffer == nullptr || isExiting()) {
        isRunning_ = false;
        return;
      }
    }
    const std::uint64_t now = rt::MonotonicClock::nanoseconds();
    if (deadline <= now) {
      buffer->flush(~std::uint32_t{0});
      continue;
    }
    // A buffer that is not used any more must not wait for this task.
    buffer = nullptr;
    wakeTime_.store(deadline, std::memory_order_seq_cst);
    if (deadline == LUMLogFileBuffer::kNever) {
      rt::detail::waitAtAddress(events_, event);
    } else {
      const std::chrono::nanoseconds rest(deadline - now);
      rt::detail::waitAtAddress(events_, event, &rest);
    }
  }
}

void LUMLogFlusher::flushAtExit() {
  isExiting_ = true;
  events_.fetch_add(1, std::memory_order_release);
  rt::detail::wakeAllAtAddress(&events_);
  LUMLogFlusher& flusher = shared();
  std::vector<rt::Ref<LUMLogFileBuffer>> buffers;
  {
    const rt::LockGuard guard(flusher.lock_);
    buffers.swap(flusher.buffers_);
  }
  for (const rt::Ref<LUMLogFileBuffer>& buffer : buffers) buffer->flush(kExitPatienceInMilliseconds);
}
