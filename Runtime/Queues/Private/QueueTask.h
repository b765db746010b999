#pragma once

// The tasks of a queue. For rt::Queue only.

#include <atomic>
#include <concepts>
#include <cstdint>
#include <exception>
#include <type_traits>
#include <utility>

#include "Runtime/Base/Private/FunctionView.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Queues/Private/LinkedList.h"
#include "Runtime/Queues/Private/TaskContext.h"

namespace rt::detail {

/// One task of a queue.
class Task {
 public:
  Task(const Task&) = delete;
  Task& operator=(const Task&) = delete;

  /// Runs the task. It is called once. The task may not exist afterwards, even if an exception is thrown.
  virtual void run() = 0;

 protected:
  constexpr Task() noexcept = default;
  virtual ~Task() = default;

 private:
  friend class LinkedList<Task>;
  Task* next_ = nullptr;
};

using TaskList = LinkedList<Task>;

/// A task that no thread waits for. It is in a block of memory of its own, and deletes itself.
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
    const TaskContext::Scope scope(context_.get());
    static_cast<void>(std::move(function_)());
  }

 private:
  Function function_;
  const Ref<Object> context_ = TaskContext::current();
};

/// A task in the stack frame of the thread that waits for it.
class SyncTask final : public Task {
 public:
  enum class Outcome : std::uint8_t { kRan, kIsTurn };

  explicit SyncTask(FunctionView<void()> function) noexcept : function_(function) {}

  /// Calls the function, keeps what it throws, and wakes the waiting thread. For the thread that runs the
  /// queue.
  void run() override;

  /// Tells the waiting thread to run the queue up to and including this task. It is called instead of `run`.
  void giveTurn() noexcept { wake(kTurn); }

  /// Returns when the task has run or the calling thread is to run it. Throws what the function has thrown.
  /// For the thread that waits.
  Outcome wait();

 private:
  // NOLINTNEXTLINE(performance-enum-size): threads sleep at words of 32 bits.
  enum State : std::uint32_t { kWaiting, kAsleep, kTurn, kDone };
  void wake(State state) noexcept;

  const FunctionView<void()> function_;
  Object* const context_ = TaskContext::current();
  std::exception_ptr exception_;
  std::atomic<std::uint32_t> state_ = kWaiting;
};

}  // namespace rt::detail
