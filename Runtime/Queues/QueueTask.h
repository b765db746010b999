#pragma once

// What a queue holds. For rt::Queue only.

#include <atomic>
#include <concepts>
#include <cstdint>
#include <exception>
#include <memory>
#include <type_traits>
#include <utility>

#include "Runtime/Base/FunctionView.h"
#include "Runtime/Queues/LinkedList.h"

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
  friend class LinkedList<Task>;
  Task* next_ = nullptr;
};

using TaskList = LinkedList<Task>;

/// A task that nobody waits for, in a block of memory of its own.
template <class Function>
class AsyncTask final : public Task {
 public:
  template <class Argument>
    requires(!std::same_as<std::remove_cvref_t<Argument>, AsyncTask>)
  explicit AsyncTask(Argument&& function) : function_(std::forward<Argument>(function)) {}

  void run() override {
    const std::unique_ptr<AsyncTask> self(this);
    static_cast<void>(std::move(function_)());
  }

 private:
  Function function_;
};

/// A task in the stack frame of the thread that waits for it.
class SyncTask final : public Task {
 public:
  enum class Outcome : std::uint8_t { kRan, kIsTurn };

  explicit SyncTask(FunctionView<void()> function) noexcept : function_(function) {}

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

  const FunctionView<void()> function_;
  std::exception_ptr exception_;
  std::atomic<std::uint32_t> state_ = kWaiting;
};

}  // namespace rt::detail
