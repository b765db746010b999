#pragma once

/// A serial queue. Its tasks run one after another, in the order in which they were queued, on threads that
/// all queues share.
///
///     rt::Ref<rt::Queue> queue = rt::make<rt::Queue>("Journal"_s, rt::QualityOfService::kUtility);
///     queue->async([=] { journal->append(line); });                      // later, on another thread
///     std::size_t size = queue->sync([&] { return journal->size(); });   // waits: returns or rethrows
///     queue->barrierSync();                                              // earlier tasks have run
///
/// Threads: a task sees all that earlier tasks of the queue have written, whichever threads ran them. State
/// that only a queue's tasks touch needs no lock. Any thread may use a queue.
///
/// Ownership: a queue retains itself until its tasks have run. A task may use the queue that it runs on,
/// and may release the last reference to it.
///
/// Errors: an exception that leaves a `sync` task is thrown to the caller of `sync`. An exception that
/// leaves an `async` task goes to the handler of `setUncaughtExceptionHandler`.
///
/// Exit. When `main` returns or `exit` is called, all queued tasks run before the process ends. So do tasks
/// that these tasks queue, for kExitRounds rounds, and tasks that destructors of static objects queue. The
/// program waits for tasks for ten seconds in total, and then names the queues that it leaves. Tasks that
/// are queued behind a task that itself calls `exit` do not run. The main queue's tasks do not run if
/// another thread than the main thread exits. `_exit`, `quick_exit` and `abort` run no tasks. A static
/// object that is initialized after the program's first `async` is destroyed before these tasks run. A task
/// must not refer to such an object: capture a copy or a `Ref`, or call `barrierSync` in the object's
/// destructor.
///
/// Fork. Queued tasks belong to the parent. In the child, all queues are empty and use new threads. If a
/// task forks, its queue goes on in the child when the task returns. A `sync` task that another thread
/// waits for must not return in the child, where that thread does not exist.
///
/// Without threads. If the system refuses the first thread, tasks stay queued. Each `async` asks for a
/// thread again. `sync` runs the queued tasks on its own thread, and so does the thread that exits.
///
/// Not for: work that blocks for long, since at most 64 threads run utility work and 64 all other work;
/// timers; priorities among the tasks of one queue.

#include <atomic>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <type_traits>
#include <utility>

#include "Runtime/Base/Private/FunctionView.h"
#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Queues/Private/QueueTask.h"
#include "Runtime/Queues/Private/WorkerPool.h"
#include "Runtime/Queues/QualityOfService.h"

namespace rt::detail {
class QueueRegistry;
}

namespace rt {

class RT_VISIBLE RT_CAPABILITY("queue") Queue : public Implements<Queue, Object>, private detail::Work {
 public:
  /// How many rounds of tasks run at exit, each queued by the tasks of the round before.
  static constexpr int kExitRounds = 16;

  /// Makes an empty queue. `label` is for people and need not be unique. A null label counts as empty.
  explicit Queue(String label, QualityOfService qualityOfService = QualityOfService::kDefault);
  ~Queue() override;

  /// Returns the main queue, whose tasks run on the main thread (Runtime/Queues/MainQueue.h). Never null,
  /// and the same at every call.
  static Ref<Queue> main();

  /// Returns the label. Never null.
  const String& label() const noexcept { return label_; }
  QualityOfService qualityOfService() const noexcept { return qualityOfService_; }

  /// Queues `task` behind all queued tasks and returns without waiting for it. The task is called without
  /// arguments, and its result is dropped. The task is moved or copied into the one block of memory that
  /// this allocates. It is destroyed on the thread that has run it. Throws std::bad_alloc and what copying
  /// the task throws. Nothing is queued then.
  template <class Task>
    requires std::invocable<std::decay_t<Task>>
  void async(Task&& task) {
    enqueue(*new detail::AsyncTask<std::decay_t<Task>>(std::forward<Task>(task)));
  }

  /// Runs `task` after all queued tasks, waits for it, and returns what it returns or throws what it throws.
  /// Allocates nothing. If no other thread runs the queue, the calling thread runs the queued tasks and then
  /// `task`. The main queue's tasks run on the main thread only, so any other thread waits for that thread.
  ///
  /// Ends the program if a task of this queue is running on the calling thread, directly or further up the
  /// call stack. The call would wait for itself.
  template <std::invocable Task>
  std::invoke_result_t<Task> sync(Task&& task) RT_EXCLUDES(this) {
    using Result = std::invoke_result_t<Task>;
    if constexpr (std::is_void_v<Result>) {
      perform([&] { std::forward<Task>(task)(); });
    } else if constexpr (std::is_reference_v<Result>) {
      std::remove_reference_t<Result>* result = nullptr;
      perform([&] {
        Result&& reference = std::forward<Task>(task)();
        result = &reference;
      });
      return static_cast<Result>(*result);
    } else {
      std::optional<Result> result;
      perform([&] { result.emplace(std::forward<Task>(task)()); });
      return *std::move(result);  // NOLINT(bugprone-unchecked-optional-access): the task has run
    }
  }

  /// Does the same as `sync`. Concurrent queues have this name for running a task alone. On a serial queue
  /// every task runs alone.
  template <std::invocable Task>
  std::invoke_result_t<Task> barrierSync(Task&& task) RT_EXCLUDES(this) {
    return sync(std::forward<Task>(task));
  }

  /// Returns when all tasks that are queued have run.
  void barrierSync() RT_EXCLUDES(this) {
    sync([] {});
  }

  /// Returns whether a task of this queue is running on the calling thread.
  bool isCurrent() const noexcept;

  /// Ends the program unless a task of this queue is running on the calling thread. Tells clang that fields
  /// marked `RT_GUARDED_BY(*queue_)` may be touched from here on.
  void assertIsCurrent() const noexcept RT_ASSERT_CAPABILITY(this);

  /// Returns the label of the queue whose task is running on the calling thread, or "" if there is no such
  /// task. Never null. So it is "" on the main thread outside of the main queue's tasks. Allocates nothing.
  static String currentLabel() noexcept;

  /// Handles an exception that has left a task. It is called on the task's thread, and the exception is
  /// std::current_exception(). When it returns, the queue goes on with the next task. It must not throw.
  using UncaughtExceptionHandler = void (*)(const Queue& queue);

  /// Sets the handler of exceptions that leave `async` tasks of any queue, and returns the previous one. The
  /// default is null: the program writes one line to standard error, with the queue's label and what the
  /// exception says, and calls std::terminate. Threads: any thread may call it.
  static UncaughtExceptionHandler setUncaughtExceptionHandler(UncaughtExceptionHandler handler) noexcept;

 protected:
  /// Returns whether the calling thread may run the queue's tasks.
  virtual bool mayRunHere() const noexcept { return true; }

  /// Arranges that `runScheduled` is called once, soon. It is called without a lock. The queue retains
  /// itself until then.
  virtual void schedule() noexcept;

  /// Runs all tasks that are queued now, unless another thread runs the queue. Stops after the current task
  /// once `*stop` is true, if `stop` is not null. Returns how many tasks it has run.
  std::size_t runScheduled(const std::atomic<bool>* stop) noexcept;

 private:
  friend class detail::QueueRegistry;
  class RunningScope;

  void runOnWorker() noexcept override;
  void enqueue(detail::Task& task) noexcept RT_EXCLUDES(lock_);
  bool append(detail::Task& task) noexcept RT_REQUIRES(lock_);
  void perform(FunctionView<void()> function) RT_EXCLUDES(lock_);
  detail::TaskList start() noexcept RT_REQUIRES(lock_);
  std::size_t runBatch(RunningScope& scope, const std::atomic<bool>* stop = nullptr) noexcept;
  bool takeMore(RunningScope& scope) noexcept RT_EXCLUDES(lock_);
  void finish(RunningScope& scope) noexcept RT_EXCLUDES(lock_);

  // For the registry of queues.
  void runHere() noexcept RT_EXCLUDES(lock_);
  std::optional<std::uint64_t> exitGoal() noexcept RT_EXCLUDES(lock_);
  bool hasReached(std::uint64_t goal) const noexcept RT_EXCLUDES(lock_);
  bool isShortOfThreads() const noexcept;
  void resetAfterFork() noexcept;

  const String label_;
  const QualityOfService qualityOfService_;

  // A queue that has tasks is running, scheduled, or both. The thread that runs it looks for more tasks
  // when it is done. A queue is both if a thread that waits in `sync` has been quicker than the pool. While
  // a queue is running or scheduled, it retains itself.
  mutable UnfairLock lock_;
  bool isRunning_ RT_GUARDED_BY(lock_) = false;
  bool isScheduled_ RT_GUARDED_BY(lock_) = false;
  detail::TaskList tasks_ RT_GUARDED_BY(lock_);
  // The last of the tasks that other threads wait for.
  detail::SyncTask* lastWaiter_ RT_GUARDED_BY(lock_) = nullptr;
  std::uint64_t queuedCount_ RT_GUARDED_BY(lock_) = 0;
  std::uint64_t doneCount_ RT_GUARDED_BY(lock_) = 0;

  // Used by the registry of queues, under its lock.
  Queue* previous_ = nullptr;
  Queue* next_ = nullptr;
};

}  // namespace rt
