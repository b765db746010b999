// The thread that logs must not wake a sleeping thread, which costs more than everything else together. So
// the task that writes does not end when the queue is empty. It looks again after a pause, and ends only when
// several pauses have brought nothing. A message finds the task awake or pausing, and does nothing more.
//
// No wake is lost. The task first says that it is idle, and then reads the queue's tail once more. A thread
// first changes the tail, and then reads whether the task is idle. All four are sequentially consistent.

#include "Shared/Logging/Loggers/LUMBoundedLogger.h"

#include <sched.h>

#include <algorithm>
#include <bit>
#include <chrono>
#include <cstdlib>
#include <new>
#include <stdexcept>
#include <string>
#include <utility>

#include "Runtime/Base/Private/MonotonicClock.h"
#include "Runtime/Locks/Private/AddressWait.h"
#include "Runtime/Queues/Private/TaskContext.h"
#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMLogInterest.h"
#include "Shared/Logging/LUMLogMetadata.h"

namespace {

using namespace rt::literals;

// How many messages are written before the task looks for threads that wait, and leaves a target's queue to
// others.
constexpr int kBatch = 64;

// The task pauses this often before it ends, each time twice as long, up to the longest pause.
constexpr int kPauses = 8;
constexpr std::chrono::nanoseconds kFirstPause = std::chrono::microseconds(100);
constexpr std::chrono::nanoseconds kLongestPause = std::chrono::milliseconds(1);

// A thread that waits for room looks again after this time, and asks for a thread for the task.
constexpr std::uint64_t kRoomPatience = 100'000'000;

// How long threads that wait stay asleep while the queue is more than half full, in nanoseconds.
constexpr std::uint64_t kWakePeriod = 1'000'000;

// How often a thread that drops the oldest message tries to get the room before another thread does.
constexpr int kTries = 1000;

// How many milliseconds a signal handler waits for a thread that takes or appends a message.
constexpr int kCrashPatience = 100;

constinit std::atomic<bool> isExiting = false;

// Ends the pauses when the program exits, so that it need not wait for them.
void endPausesAtExit() {
  static constinit std::atomic<bool> isRegistered = false;
  if (!isRegistered.load(std::memory_order_relaxed) && !isRegistered.exchange(true))
    std::atexit([] { isExiting = true; });
}

// The logger whose target the calling thread writes to.
constinit thread_local const LUMBoundedLogger* writing [[gnu::tls_model("initial-exec")]] = nullptr;

}  // namespace

class LUMBoundedLogger::WriterScope {
 public:
  explicit WriterScope(const LUMBoundedLogger& logger) noexcept : outer_(std::exchange(writing, &logger)) {}
  WriterScope(const WriterScope&) = delete;
  WriterScope& operator=(const WriterScope&) = delete;
  ~WriterScope() { writing = outer_; }

 private:
  const LUMBoundedLogger* const outer_;
};

rt::Ref<LUMBoundedLogger> LUMBoundedLogger::initWithLogger(const rt::Ref<LUMLogger>& target,
                                                           LUMBoundedLoggerOptions options) {
  if (!target) throw std::invalid_argument("a LUMBoundedLogger needs a logger to write to, which is null");
  if (options.capacity == 0 || options.capacity > kMaximumCapacity) {
    throw std::invalid_argument("the capacity of a LUMBoundedLogger is " + std::to_string(options.capacity) +
                                ", but must be from 1 to " + std::to_string(kMaximumCapacity));
  }
  return rt::Ref<LUMBoundedLogger>::adopt(new LUMBoundedLogger(target, options));
}

LUMBoundedLogger::LUMBoundedLogger(const rt::Ref<LUMLogger>& target, LUMBoundedLoggerOptions options)
    : Implements(nullptr),
      target_(target),
      asyncTarget_(rt::cast<LUMAsyncLogger>(target->asObject())),
      output_(rt::cast<LUMLogOutput>(target->asObject())),
      whenFull_(options.whenFull),
      halfMask_(std::max<std::uint64_t>(std::bit_ceil(options.capacity) / 2, 1) - 1),
      taskQueue_(rt::make<rt::Queue>("LUMBoundedLogger"_s, rt::QualityOfService::kDefault)),
      queue_(std::bit_ceil(options.capacity)) {
  join();
}

LUMBoundedLogger::~LUMBoundedLogger() {
  leave();
  // Nothing waits, unless there was no memory for a task.
  if (hasWork()) writeAll();
}

LUMLogLevel LUMBoundedLogger::lowestLevel(const rt::String* component) const noexcept {
  const auto* const interest = rt::cast<LUMLogInterest>(target_->asObject());
  return interest != nullptr ? interest->lowestLevel(component) : 0;
}

// Logging.

void LUMBoundedLogger::logWithMessage(const rt::Ref<LUMLogMessage>& message) {
  if (!message) return;
  if (asyncTarget_ != nullptr && isWrittenAtOnce(message)) return;
  message->retain();
  if (!push(*message) && !pushOnceThereIsRoom(*message)) drop(*message);
  if (state_.load(std::memory_order_seq_cst) == kIdle) [[unlikely]]
    wake();
}

bool LUMBoundedLogger::push(LUMLogMessage& message) noexcept {
  const std::uint64_t dropped =
      unreported_.load(std::memory_order_relaxed) != 0 ? unreported_.exchange(0) : 0;
  const std::uint64_t position = queue_.push(message, dropped);
  if (position == LUMLogMessageQueue::kFull) {
    unreported_.fetch_add(dropped);
    return false;
  }
  // Seldom, so that a burst wakes a task that pauses before the queue is full.
  if ((position & halfMask_) == halfMask_) endPause();
  return true;
}

[[gnu::noinline]] bool LUMBoundedLogger::pushOnceThereIsRoom(LUMLogMessage& message) {
  endPause();
  switch (whenFull_) {
    case LUMLogWhenFull::kBlock:
      return !wouldWaitForItself() && waitForRoom(message);
    case LUMLogWhenFull::kDropOldest:
      for (int i = 0; i < kTries; ++i) {
        LUMLogMessageQueue::Taken oldest;
        // The gap between positions tells the task that this one was dropped.
        if (queue_.take(oldest)) {
          unreported_.fetch_add(oldest.droppedBefore);
          droppedCount_.fetch_add(1);
          oldest.message->release();
        } else {
          sched_yield();
        }
        if (push(message)) return true;
      }
      return false;
    case LUMLogWhenFull::kDropNewest:
      break;
  }
  return false;
}

// Returns whether the messages cannot be written before the calling thread goes on.
bool LUMBoundedLogger::wouldWaitForItself() const noexcept {
  if (writing != nullptr) return true;
  if (asyncTarget_ == nullptr) return false;
  try {
    const rt::Ref<rt::Queue> queue = asyncTarget_->operationQueue();
    return queue && queue->isCurrent();
  } catch (...) {
    return false;
  }
}

bool LUMBoundedLogger::waitForRoom(LUMLogMessage& message) {
  waiters_.fetch_add(1);
  bool isPushed = false;
  while (!isPushed) {
    const std::uint32_t progress = progress_.load();
    isPushed = push(message);
    if (isPushed) break;
    if (queue_.tail() - queue_.head() < queue_.capacity()) {
      sched_yield();  // Another thread is making the room.
      continue;
    }
    if (state_.load() == kIdle) wake();
    endPause();
    if (sleep(progress, kRoomPatience)) continue;
    try {
      taskQueue_->async([] {});        // The system may have refused a thread. Asks for one again.
    } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): tries again after the next wait
    }
  }
  waiters_.fetch_sub(1);
  return true;
}

void LUMBoundedLogger::drop(LUMLogMessage& message) noexcept {
  droppedCount_.fetch_add(1);
  unreported_.fetch_add(1);
  message.release();
}

bool LUMBoundedLogger::isWrittenAtOnce(const rt::Ref<LUMLogMessage>& message) {
  if (asyncTarget_->dispatchModeForMessage(*message) != LUMLogDispatchModeSynchronous) return false;
  const rt::Ref<rt::Queue> queue = asyncTarget_->operationQueue();
  if (!queue || queue->isCurrent()) return false;
  queue->sync([&] {
    const WriterScope scope(*this);
    target_->logWithMessage(message);
  });
  return true;
}

// Waking and waiting.

void LUMBoundedLogger::wake() {
  std::uint32_t idle = kIdle;
  if (!state_.compare_exchange_strong(idle, kAwake)) return;
  // The task writes messages of all threads. What the target logs must not have the metadata of this one.
  const rt::TaskContext::Scope none(nullptr);
  try {
    taskQueue_->async([self = rt::Ref<LUMBoundedLogger>(this)] { self->run(true); });
    endPausesAtExit();
  } catch (const std::bad_alloc&) {
    // There is no memory for a task, so this thread writes. If it is writing already, the messages wait for
    // the next one.
    if (writing != nullptr) {
      state_ = kIdle;
    } else {
      taskQueue_->sync([this] { run(false); });
    }
  }
}

void LUMBoundedLogger::endPause() noexcept {
  std::uint32_t pausing = kPausing;
  if (state_.load() == kPausing && state_.compare_exchange_strong(pausing, kAwake))
    rt::detail::wakeAtAddress(&state_);
}

// Returns false if nothing has been written for so long.
bool LUMBoundedLogger::sleep(std::uint32_t progress, std::uint64_t nanoseconds) noexcept {
  const std::chrono::nanoseconds time(static_cast<std::chrono::nanoseconds::rep>(nanoseconds));
  rt::detail::waitAtAddress(progress_, progress, &time);
  return progress_.load() != progress;
}

// A thread that waits for room does not get it at once: it would wait again after a few messages. The queue
// gets half empty first, unless the target is slow.
void LUMBoundedLogger::wakeWaiters(bool isMore) noexcept {
  if (waiters_.load() == 0) return;
  const std::uint64_t now = rt::MonotonicClock::nanoseconds();
  if (isMore && queue_.tail() - queue_.head() > queue_.capacity() / 2 && now - lastWake_ < kWakePeriod)
    return;
  lastWake_ = now;
  progress_.fetch_add(1);
  rt::detail::wakeAllAtAddress(&progress_);
}

bool LUMBoundedLogger::flush(std::uint32_t milliseconds) {
  if (writing == this) return false;
  constexpr std::uint64_t kMillisecond = 1'000'000;
  const std::uint64_t end = rt::MonotonicClock::nanoseconds() + milliseconds * kMillisecond;
  const std::uint64_t dropped = droppedCount_.load();
  const std::uint64_t goal = queue_.tail();
  const auto isDone = [&] { return finished_.load() >= goal && reportedCount_.load() >= dropped; };
  waiters_.fetch_add(1);
  std::uint64_t now = 0;
  for (;;) {
    const std::uint32_t progress = progress_.load();
    now = rt::MonotonicClock::nanoseconds();
    if (isDone() || now >= end) break;
    if (state_.load() == kIdle && hasWork()) wake();
    endPause();
    if (!isDone()) sleep(progress, end - now);
  }
  waiters_.fetch_sub(1);
  if (!isDone()) return false;
  if (output_ == nullptr) return true;
  return output_->flush(static_cast<std::uint32_t>(now < end ? (end - now) / kMillisecond : 0));
}

// The task.

bool LUMBoundedLogger::hasWork() const noexcept {
  return queue_.tail() != queue_.head() || unreported_.load() != 0;
}

void LUMBoundedLogger::run(bool mayPause) noexcept {
  for (;;) {
    writeAll();
    if (mayPause && pauseForMessages()) continue;
    state_.store(kIdle, std::memory_order_seq_cst);
    if (!hasWork()) return;
    std::uint32_t idle = kIdle;
    if (!state_.compare_exchange_strong(idle, kAwake)) return;
  }
}

// Returns whether there is something to write.
bool LUMBoundedLogger::pauseForMessages() noexcept {
  std::chrono::nanoseconds pause = kFirstPause;
  for (int i = 0; i < kPauses && !isExiting.load(std::memory_order_relaxed); ++i) {
    state_.store(kPausing);
    if (!hasWork()) rt::detail::waitAtAddress(state_, kPausing, &pause);
    state_.store(kAwake);
    if (hasWork()) return true;
    pause = std::min(2 * pause, kLongestPause);
  }
  return false;
}

void LUMBoundedLogger::writeAll() noexcept {
  for (bool isMore = true; isMore;) {
    rt::Ref<rt::Queue> queue;
    bool isRefused = false;
    if (asyncTarget_ != nullptr) {
      try {
        queue = asyncTarget_->operationQueue();
      } catch (...) {  // NOLINT(bugprone-empty-catch): counts as having no queue
      }
      isRefused = !queue;
    }
    if (queue && !queue->isCurrent()) {
      queue->sync([&] { isMore = writeBatch(false); });
    } else {
      isMore = writeBatch(isRefused);
    }
    wakeWaiters(isMore);
  }
}

// Returns whether there may be more.
bool LUMBoundedLogger::writeBatch(bool isRefused) noexcept {
  const WriterScope scope(*this);
  for (int i = 0; i < kBatch; ++i) {
    if (!writeNext(isRefused)) return false;
  }
  return true;
}

bool LUMBoundedLogger::writeNext(bool isRefused) noexcept {
  // Announced before it is taken: after a crash the handler waits until it is written.
  claim_.next.store(queue_.head() + 1, std::memory_order_seq_cst);
  if (isCrashing()) {
    claim_.next.store(0);
    waitForWriter();
    return true;
  }
  LUMLogMessageQueue::Taken taken;
  if (!queue_.take(taken, &claim_)) {
    claim_.next.store(0);
    const std::uint64_t head = queue_.head();
    if (queue_.tail() != head) {
      sched_yield();  // The thread that logs the next message is not done.
      return false;
    }
    reportDropped(head - std::exchange(expected_, head) + unreported_.exchange(0), isRefused);
    finished_.store(std::max(finished_.load(), head));
    return false;
  }
  reportDropped(taken.position - std::exchange(expected_, taken.position + 1) + taken.droppedBefore,
                isRefused);
  {
    const rt::Ref<LUMLogMessage> message = rt::Ref<LUMLogMessage>::adopt(taken.message);
    write(message, isRefused);
    claim_.message.store(nullptr, std::memory_order_seq_cst);
    claim_.next.store(0, std::memory_order_seq_cst);
    // A handler that has grown tired of waiting may be writing this message.
    if (isCrashing()) [[unlikely]]
      waitForWriter();
  }
  finished_.store(std::max(finished_.load(std::memory_order_relaxed), taken.position + 1),
                  std::memory_order_release);
  return true;
}

void LUMBoundedLogger::write(const rt::Ref<LUMLogMessage>& message, bool isRefused) noexcept {
  if (!isRefused) {
    try {
      target_->logWithMessage(message);
      return;
    } catch (...) {  // NOLINT(bugprone-empty-catch): counted below
    }
  }
  failedCount_.fetch_add(1);
}

rt::Ref<LUMLogMessage> LUMBoundedLogger::reportOf(std::uint64_t count) const {
  const rt::String text =
      rt::format("%llu %s dropped: the queue of %@ was full", static_cast<unsigned long long>(count),
                 count == 1 ? "message was" : "messages were", target_->asObject()->classInfo().name);
  return LUMLogMessage::initWithLevel(LUMLogLevelError, text, text, nullptr, nullptr, 0, nullptr, nullptr,
                                      nullptr, nullptr,
                                      LUMLogMetadata::metadataWithComponent("LUMBoundedLogger"_s));
}

void LUMBoundedLogger::reportDropped(std::uint64_t count, bool isRefused) noexcept {
  if (count == 0) return;
  try {
    if (!isRefused) target_->logWithMessage(reportOf(count));
  } catch (...) {  // NOLINT(bugprone-empty-catch): the count can still be read
  }
  reportedCount_.fetch_add(count);
}

// After a crash, and after a fork.

void LUMBoundedLogger::writeInSignalHandler(LUMLogMessage& message, Losses& losses) noexcept {
  if (output_ != nullptr) {
    output_->logInSignalHandler(message);
  } else {
    ++losses.waiting;
  }
}

void LUMBoundedLogger::writeAfterCrash(Losses& losses) noexcept {
  // The task stops before its next message. It cannot finish this one if it is the task that has crashed.
  if (writing != this) {
    for (int look = 0; look < kCrashPatience && claim_.next.load() != 0; ++look) pause();
  }
  if (claim_.next.load() != 0) {
    LUMLogMessage* message = claim_.message.load();
    // With kDropOldest, the message may belong to a thread that drops it.
    if (message == nullptr && whenFull_ != LUMLogWhenFull::kDropOldest) message = queue_.messageOf(claim_);
    if (message != nullptr) writeInSignalHandler(*message, losses);
    claim_.next.store(0);
    claim_.message.store(nullptr);
  }
  int looks = kCrashPatience;
  // Other threads may log faster than this one writes.
  const std::uint64_t end = queue_.tail();
  while (queue_.head() < end) {
    LUMLogMessageQueue::Taken taken;
    if (queue_.take(taken)) {
      losses.dropped += taken.position - std::exchange(expected_, taken.position + 1) + taken.droppedBefore;
      writeInSignalHandler(*taken.message, losses);
    } else if (looks-- > 0) {
      pause();
    } else {
      queue_.skip();  // Its thread has not returned from logging.
    }
  }
  losses.dropped += unreported_.exchange(0);
}

void LUMBoundedLogger::logInSignalHandler(const LUMLogMessage& message) noexcept {
  Losses losses;
  writeAfterCrash(losses);
  if (output_ != nullptr) output_->logInSignalHandler(message);
}

void LUMBoundedLogger::forgetAfterFork() noexcept {
  queue_.forget();
  expected_ = queue_.head();
  finished_ = expected_;
  unreported_ = 0;
  droppedCount_ = 0;
  failedCount_ = 0;
  reportedCount_ = 0;
  waiters_ = 0;
  const bool isTaskHere = taskQueue_->isCurrent();
  state_ = isTaskHere ? kAwake : kIdle;
  if (isTaskHere) return;
  claim_.message = nullptr;
  claim_.next = 0;
}
