#include "Runtime/Queues/Queue.h"

#include <cstdio>
#include <cstdlib>
#include <exception>

#include "Runtime/Queues/MainQueue.h"
#include "Runtime/Queues/Private/QueueRegistry.h"

namespace rt {

namespace {

constinit std::atomic<Queue::UncaughtExceptionHandler> uncaughtExceptionHandler = nullptr;

void terminateForUncaughtException(const Queue& queue) noexcept {
  const auto report = [&](const char* what) {
    std::fprintf(stderr, "rt: an exception has left a task of the queue \"%.*s\": %s\n",
                 static_cast<int>(queue.label().length()), queue.label().view().data(), what);
    std::terminate();  // While the exception is being handled, so that a terminate handler sees it.
  };
  try {
    throw;
  } catch (const std::exception& exception) {
    report(exception.what());
  } catch (...) {
    report("something that is no std::exception");
  }
}

}  // namespace

// Makes a queue the calling thread's current one. The thread has set `isRunning_`, and has the queue to
// itself until the scope ends.
class Queue::RunningScope {
 public:
  RunningScope(Queue& queue, detail::TaskList batch) noexcept
      : queue_(queue), batch_(batch), outer_(std::exchange(innermost_, this)) {}
  ~RunningScope() {
    innermost_ = outer_;
    queue_.finish(*this);
  }
  RunningScope(const RunningScope&) = delete;
  RunningScope& operator=(const RunningScope&) = delete;

  static RunningScope* innermost() noexcept { return innermost_; }
  RunningScope* outer() const noexcept { return outer_; }
  Queue& queue() const noexcept { return queue_; }

  // The tasks to run next. The child of a fork forgets them.
  detail::TaskList& batch() noexcept { return batch_; }

  // How many tasks have run that the queue has not counted yet.
  std::uint64_t& count() noexcept { return count_; }

 private:
  static constinit thread_local RunningScope* innermost_ [[gnu::tls_model("initial-exec")]];

  Queue& queue_;
  detail::TaskList batch_;
  RunningScope* const outer_;
  std::uint64_t count_ = 0;
};

constinit thread_local Queue::RunningScope* Queue::RunningScope::innermost_ = nullptr;

Queue::Queue(String label, QualityOfService qualityOfService)
    : label_(label ? std::move(label) : ""_s), qualityOfService_(qualityOfService) {
  detail::QueueRegistry::add(*this);
}

Queue::~Queue() {
  detail::QueueRegistry::remove(*this);
}

Ref<Queue> Queue::main() {
  return &MainQueue::instance();
}

void Queue::enqueue(detail::Task& task) noexcept {
  detail::QueueRegistry::runTasksAtExit();
  // Read before the lock is released, since the task may release the last reference to the queue.
  const QualityOfService qualityOfService = qualityOfService_;
  lock_.lock();
  const bool isStranded = isScheduled_ && !isRunning_ && isShortOfThreads();
  const bool wantsSchedule = append(task);
  lock_.unlock();
  if (wantsSchedule) {
    schedule();
  } else if (isStranded) {
    detail::WorkerPool::tryAgain(qualityOfService);
  }
}

bool Queue::append(detail::Task& task) noexcept {
  tasks_.append(task);
  ++queuedCount_;
  detail::QueueRegistry::wakeExit();
  if (isRunning_ || isScheduled_) return false;
  isScheduled_ = true;
  retain();
  return true;
}

detail::TaskList Queue::start() noexcept {
  isRunning_ = true;
  lastWaiter_ = nullptr;
  return tasks_.takeAll();
}

void Queue::schedule() noexcept {
  // From here on, its tasks may run and release the last reference to it.
  detail::WorkerPool::schedule(*this, qualityOfService_);
  detail::QueueRegistry::wakeExit();  // There may be no thread for it.
}

void Queue::perform(FunctionView<void()> function) {
  if (isCurrent()) {
    std::fprintf(stderr,
                 "rt: sync on the queue \"%.*s\" from one of its own tasks, which would wait for itself\n",
                 static_cast<int>(label_.length()), label_.view().data());
    std::abort();
  }
  const bool mayRun = mayRunHere();
  lock_.lock();
  if (mayRun && !isRunning_) {
    if (!isScheduled_) retain();
    RunningScope scope(*this, start());
    lock_.unlock();
    runBatch(scope);
    function();
    return;
  }
  detail::SyncTask task(function);
  const bool wantsSchedule = append(task);
  if (mayRun) lastWaiter_ = &task;
  lock_.unlock();
  if (wantsSchedule) schedule();
  if (task.wait() == detail::SyncTask::Outcome::kRan) return;
  lock_.lock();
  RunningScope scope(*this, tasks_.takeBefore(task));
  lock_.unlock();
  runBatch(scope);
  ++scope.count();
  function();
}

std::size_t Queue::runScheduled(const std::atomic<bool>* stop) noexcept {
  lock_.lock();
  if (!std::exchange(isScheduled_, false) || isRunning_) {
    lock_.unlock();
    return 0;
  }
  RunningScope scope(*this, start());
  lock_.unlock();
  return runBatch(scope, stop);
}

// Runs the queued tasks, unless another thread runs the queue. The queue stays scheduled, so it still
// retains itself.
void Queue::runHere() noexcept {
  const bool mayRun = mayRunHere();
  lock_.lock();
  if (!mayRun || isRunning_ || tasks_.isEmpty()) {
    lock_.unlock();
    return;
  }
  RunningScope scope(*this, start());
  lock_.unlock();
  runBatch(scope);
}

void Queue::runOnWorker() noexcept {
  lock_.lock();
  isScheduled_ = false;
  if (isRunning_) {
    lock_.unlock();
    return;
  }
  RunningScope scope(*this, start());
  lock_.unlock();
  do {
    runBatch(scope);
  } while (takeMore(scope));
}

// NOLINTNEXTLINE(readability-make-member-function-const): it runs what the queue was given
std::size_t Queue::runBatch(RunningScope& scope, const std::atomic<bool>* stop) noexcept {
  std::size_t count = 0;
  while (detail::Task* task = scope.batch().takeFirst()) {
    // Counted before it runs. In the child of a fork the task is the parent's, and no longer counted.
    ++scope.count();
    ++count;
    try {
      task->run();
    } catch (...) {
      const UncaughtExceptionHandler handler = uncaughtExceptionHandler.load(std::memory_order_acquire);
      (handler != nullptr ? handler : terminateForUncaughtException)(*this);
    }
    if (stop != nullptr && stop->load(std::memory_order_relaxed)) break;
  }
  return count;
}

bool Queue::takeMore(RunningScope& scope) noexcept {
  LockGuard guard(lock_);
  if (tasks_.isEmpty()) return false;
  // If threads are short, other queues have their turn, unless a thread waits for this one.
  if (lastWaiter_ == nullptr && isShortOfThreads()) return false;
  doneCount_ += std::exchange(scope.count(), 0);
  scope.batch() = start();
  detail::QueueRegistry::wakeExit();
  return true;
}

void Queue::finish(RunningScope& scope) noexcept {
  lock_.lock();
  doneCount_ += scope.count();
  detail::QueueRegistry::wakeExit();
  tasks_.prepend(scope.batch());
  if (tasks_.isEmpty()) {
    isRunning_ = false;
    const bool isIdle = !isScheduled_;
    lock_.unlock();
    if (isIdle) release();
    return;
  }
  // A thread that waits runs the queue instead of this one. It needs no worker, and all workers may be
  // waiting.
  if (detail::SyncTask* waiter = std::exchange(lastWaiter_, nullptr)) {
    lock_.unlock();
    waiter->giveTurn();
    return;
  }
  isRunning_ = false;
  const bool wantsSchedule = !std::exchange(isScheduled_, true);
  lock_.unlock();
  if (wantsSchedule) schedule();
}

bool Queue::isCurrent() const noexcept {
  for (RunningScope* scope = RunningScope::innermost(); scope != nullptr; scope = scope->outer()) {
    if (&scope->queue() == this) return true;
  }
  return false;
}

void Queue::assertIsCurrent() const noexcept {
  if (isCurrent()) return;
  std::fprintf(stderr, "rt: outside of the tasks of the queue \"%.*s\"\n", static_cast<int>(label_.length()),
               label_.view().data());
  std::abort();
}

String Queue::currentLabel() noexcept {
  const RunningScope* scope = RunningScope::innermost();
  return scope != nullptr ? scope->queue().label() : ""_s;
}

Queue::UncaughtExceptionHandler Queue::setUncaughtExceptionHandler(
    UncaughtExceptionHandler handler) noexcept {
  return uncaughtExceptionHandler.exchange(handler, std::memory_order_acq_rel);
}

std::optional<std::uint64_t> Queue::exitGoal() noexcept {
  if (isCurrent()) return std::nullopt;
  LockGuard guard(lock_);
  // In this order: a queue that is being constructed or destroyed now is in the list, but has no tasks. So
  // its virtual function is not called.
  if (doneCount_ == queuedCount_ || !mayRunHere()) return std::nullopt;
  retain();  // Possible because a busy queue retains itself at least until this lock is released.
  return queuedCount_;
}

bool Queue::hasReached(std::uint64_t goal) const noexcept {
  LockGuard guard(lock_);
  return doneCount_ >= goal;
}

bool Queue::isShortOfThreads() const noexcept {
  return detail::WorkerPool::isShort(qualityOfService_);
}

// Not analysed: there is no other thread. The tasks are the parent's, and are forgotten without being
// destroyed. A busy queue stays retained by itself if the thread that would have released it does not exist
// here.
void Queue::resetAfterFork() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  isRunning_ = isCurrent();
  isScheduled_ = false;
  tasks_ = {};
  lastWaiter_ = nullptr;
  queuedCount_ = 0;
  doneCount_ = 0;
  for (RunningScope* scope = RunningScope::innermost(); scope != nullptr; scope = scope->outer()) {
    if (&scope->queue() != this) continue;
    scope->batch() = {};
    scope->count() = 0;
  }
}

}  // namespace rt
