#pragma once

/// A serial queue: tasks run one after another, in the order in which they came, on threads that all
/// queues share.
///
///     rt::Ref<rt::Queue> queue = rt::make<rt::Queue>("Journal"_s, rt::QualityOfService::kUtility);
///     queue->async([=] { journal->append(line); });                      // later, elsewhere
///     std::size_t size = queue->sync([&] { return journal->size(); });   // now: returns or rethrows
///     queue->barrierSync();                                              // all before has run
///
/// What one task writes, the next one reads, whatever threads they run on: state that is touched only by
/// a queue's tasks needs no lock. A task may use the queue it runs on, also drop the last reference to
/// it; a queue lives until its tasks have run.
///
/// Exceptions. One that leaves a `sync` task is thrown to the caller of `sync`. One that leaves an `async`
/// task has nobody to go to: see `setUncaughtExceptionHandler`.
///
/// Exit. When the process exits by returning from `main` or by `exit`, the tasks that have been queued by
/// then run first, and so do those that they queue, up to kExitRounds times over, and those that
/// destructors of static objects queue. The program waits for tasks, but at most ten seconds altogether,
/// and names the queues that it leaves. Not run are what is queued behind a task that itself calls `exit`
/// and, where another than the main thread calls it, the main queue's. `_exit`, `quick_exit` and `abort`
/// run nothing. A static object that is initialized after the program's first `async` is destroyed before
/// these tasks run. A task must not refer to one: capture a copy or a `Ref`, or call `barrierSync` in the
/// object's destructor.
///
/// Fork. Queued tasks are the parent's: in the child all queues are empty and start with a fresh set of
/// threads. Where a task forks, the queue it runs on goes on in the child when the task returns; but a
/// `sync` task that another thread waits for must not return there, since that thread is gone.
///
/// Without threads. Where the system refuses the first thread, tasks wait until there is more to do: any
/// `async` asks again, `sync` runs them on its own thread, and so does the thread that exits.
///
/// Not for: work that waits for something outside for long, of which no more than 64 at once run for each
/// of urgent and other work; timers; priorities among the tasks of one queue.

#include <atomic>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <type_traits>
#include <utility>

#include "Runtime/Base/FunctionView.h"
#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Queues/QualityOfService.h"
#include "Runtime/Queues/QueueTask.h"
#include "Runtime/Queues/WorkerPool.h"

namespace rt::detail {
class QueueRegistry;
}

namespace rt {

class RT_VISIBLE RT_CAPABILITY("queue") Queue : public Implements<Queue, Object>, private detail::Work {
 public:
  /// How often what tasks queue at exit is run in turn.
  static constexpr int kExitRounds = 16;

  /// An empty queue. `label` is for people and need not be unique; null counts as empty.
  explicit Queue(String label, QualityOfService qualityOfService = QualityOfService::kDefault);
  ~Queue() override;

  /// The main queue, whose tasks run on the main thread: see Runtime/Queues/MainQueue.h. Never null, and the
  /// same at every call.
  static Ref<Queue> main();

  /// Never null.
  const String& label() const noexcept { return label_; }
  QualityOfService qualityOfService() const noexcept { return qualityOfService_; }

  /// Has `task`, which is called without arguments and whose result is dropped, run after all tasks that
  /// are queued, and returns without waiting for it. The task is moved or copied into the one block of
  /// memory that this allocates, and destroyed on the thread that has run it. Any thread may call it.
  /// Throws std::bad_alloc and what copying the task throws; then nothing is queued.
  template <class Task>
    requires std::invocable<std::decay_t<Task>>
  void async(Task&& task) {
    enqueue(*new detail::AsyncTask<std::decay_t<Task>>(std::forward<Task>(task)));
  }

  /// Has `task` run after all tasks that are queued, waits for it, and returns what it returns or throws
  /// what it throws. Allocates nothing. Where no other thread is at it, the caller runs the tasks that
  /// are queued and then its own; the main queue's tasks run on the main thread only, so any other thread
  /// waits until that runs them.
  ///
  /// Ends the program when the caller is a task of this queue, which would wait for itself. The same
  /// holds for a task of this queue that waits for another queue's task, where that runs on its thread.
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

  /// `sync`, under the name it has where queues run several tasks at once: on this one, every task has
  /// all others either before or after it.
  template <std::invocable Task>
  std::invoke_result_t<Task> barrierSync(Task&& task) RT_EXCLUDES(this) {
    return sync(std::forward<Task>(task));
  }

  /// Returns when all tasks that are queued have run.
  void barrierSync() RT_EXCLUDES(this) {
    sync([] {});
  }

  /// Whether the caller is a task of this queue, or is called by one.
  bool isCurrent() const noexcept;

  /// Ends the program when the caller is no task of this queue. With fields that are
  /// `RT_GUARDED_BY(*queue_)`, clang knows from here on that they may be touched.
  void assertIsCurrent() const noexcept RT_ASSERT_CAPABILITY(this);

  /// The label of the queue whose task the caller is; "" where it is none, never null. So it is "" on the
  /// main thread outside the main queue's tasks: what the host does there on its own is no queue's work.
  /// Allocates nothing.
  static String currentLabel() noexcept;

  /// Called on the thread of a task that an exception has left, where it is std::current_exception(); when
  /// it returns, the queue goes on with the next task. It must not throw.
  using UncaughtExceptionHandler = void (*)(const Queue& queue);

  /// Sets what happens when an exception leaves an `async` task, on any queue; returns what was set. Null,
  /// as at the start, stands for one line on standard error with the queue's label and what the exception
  /// says, and then std::terminate. Any thread may call it.
  static UncaughtExceptionHandler setUncaughtExceptionHandler(UncaughtExceptionHandler handler) noexcept;

 protected:
  /// Whether the calling thread may run the queue's tasks.
  virtual bool mayRunHere() const noexcept { return true; }

  /// Has `runScheduled` called once, soon. Called without a lock; the queue lives until then.
  virtual void schedule() noexcept;

  /// Runs what is queued, unless some thread is at it: all that was queued when it looked, but no more
  /// once `*stop`, where that is not null, is true. Returns how many tasks it has run.
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

  // For the registry.
  void runHere() noexcept RT_EXCLUDES(lock_);
  std::optional<std::uint64_t> exitGoal() noexcept RT_EXCLUDES(lock_);
  bool hasReached(std::uint64_t goal) const noexcept RT_EXCLUDES(lock_);
  bool isShortOfThreads() const noexcept;
  void resetAfterFork() noexcept;

  const String label_;
  const QualityOfService qualityOfService_;

  // A queue that has tasks is running, and whoever runs it looks for more when it is done, or scheduled,
  // or both, where a thread that waits has been quicker than the pool. While it is any of these, it has a
  // reference to itself.
  mutable UnfairLock lock_;
  bool isRunning_ RT_GUARDED_BY(lock_) = false;
  bool isScheduled_ RT_GUARDED_BY(lock_) = false;
  detail::TaskList tasks_ RT_GUARDED_BY(lock_);
  // Of the tasks that other threads wait for, the last.
  detail::SyncTask* lastWaiter_ RT_GUARDED_BY(lock_) = nullptr;
  std::uint64_t queuedCount_ RT_GUARDED_BY(lock_) = 0;
  std::uint64_t doneCount_ RT_GUARDED_BY(lock_) = 0;

  // The registry's, under its lock.
  Queue* previous_ = nullptr;
  Queue* next_ = nullptr;
};

}  // namespace rt
