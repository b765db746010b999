#pragma once

// What a queue holds. For rt::Queue only.

#include <atomic>
#include <concepts>
#include <cstdint>
#include <exception>
#include <type_traits>
#include <utility>

namespace rt::detail {

/// One task of a queue.
class Task {
 public:
  Task(const Task&) = delete;
  Task& operator=(const Task&) = delete;

  /// Does it, once; the task may be gone afterwards, also when an exception passes.
  virtual void run() = 0;

 protected:
  constexpr Task() noexcept = default;
  virtual ~Task() = default;

 private:
  friend class TaskList;
  Task* next_ = nullptr;
};

/// Tasks in the order in which they run.
class TaskList {
 public:
  bool isEmpty() const noexcept { return first_ == nullptr; }

  void append(Task& task) noexcept {
    (first_ == nullptr ? first_ : last_->next_) = &task;
    last_ = &task;
  }

  /// Puts all of `others` before what is here.
  void prepend(TaskList others) noexcept {
    if (others.isEmpty()) return;
    others.last_->next_ = first_;
    if (first_ == nullptr) last_ = others.last_;
    first_ = others.first_;
  }

  /// The first, which is no longer in the list, or null.
  Task* takeFirst() noexcept {
    Task* task = first_;
    if (task != nullptr) first_ = task->next_;
    return task;
  }

  /// All; none is left.
  TaskList takeAll() noexcept { return std::exchange(*this, TaskList()); }

  /// All before `task`, which is in the list. Neither they nor `task` are left.
  TaskList takeBefore(const Task& task) noexcept {
    TaskList before;
    for (;;) {
      Task* first = takeFirst();
      if (first == &task) return before;
      first->next_ = nullptr;
      before.append(*first);
    }
  }

 private:
  Task* first_ = nullptr;
  Task* last_ = nullptr;
};

/// A task that nobody waits for, in a block of memory of its own.
template <class Function>
class AsyncTask final : public Task {
 public:
  template <class Argument>
    requires(!std::same_as<std::remove_cvref_t<Argument>, AsyncTask>)
  explicit AsyncTask(Argument&& function) : function_(std::forward<Argument>(function)) {}

  void run() override {
    // Deletes the task when the function has returned or thrown.
    const struct Owner {
      AsyncTask* task;
      ~Owner() { delete task; }
    } owner{this};
    static_cast<void>(std::move(function_)());
  }

 private:
  Function function_;
};

/// Something to call that outlives the view.
class FunctionView {
 public:
  template <class Function>
    requires(!std::same_as<std::remove_cvref_t<Function>, FunctionView>)
  explicit FunctionView(Function&& function) noexcept
      : function_(&function),
        call_([](void* context) { (*static_cast<std::remove_reference_t<Function>*>(context))(); }) {}

  void operator()() const { call_(function_); }

 private:
  void* function_;
  void (*call_)(void*);
};

/// A task in the stack frame of the thread that waits for it.
class SyncTask final : public Task {
 public:
  enum class Outcome : std::uint8_t { kRan, kIsTurn };

  explicit SyncTask(FunctionView function) noexcept : function_(function) {}

  /// By whoever runs the queue: calls the function, keeps what it throws, and wakes who waits.
  void run() override;

  /// Instead: tells who waits to run the queue up to this task, and the task.
  void giveTurn() noexcept { wake(kTurn); }

  /// By the thread that waits: returns when the task has run or it is its turn. Throws what the function
  /// has thrown.
  Outcome wait();

 private:
  // NOLINTNEXTLINE(performance-enum-size): threads sleep at words of 32 bits.
  enum State : std::uint32_t { kWaiting, kAsleep, kTurn, kDone };
  void wake(State state) noexcept;

  const FunctionView function_;
  std::exception_ptr exception_;
  std::atomic<std::uint32_t> state_ = kWaiting;
};

}  // namespace rt::detail
