#pragma once

// A file descriptor that is readable while it is set. For rt::MainQueue only.

#include <atomic>

namespace rt::detail {

class WakeDescriptor {
 public:
  constexpr WakeDescriptor() noexcept = default;
  WakeDescriptor(const WakeDescriptor&) = delete;
  WakeDescriptor& operator=(const WakeDescriptor&) = delete;

  /// The descriptor, which the first call opens. Throws std::system_error.
  int open();

  /// Makes the descriptor readable, now or when it is opened. What was done before is seen by who comes
  /// out of the next `reset`.
  void set() noexcept {
    if (!isSet_.exchange(true)) makeReadable();
  }

  /// Makes it unreadable again. May leave it readable, where a `set` is at work at the same time.
  void reset() noexcept {
    // In this order: a `set` that comes in between makes nothing readable, but it is undone as well.
    makeUnreadable();
    isSet_.exchange(false);
  }

  /// Sleeps until the descriptor, which is open, is readable.
  void wait() noexcept;

  /// In the child of a fork: the same number, but no longer shared with the parent; not set.
  void renewAfterFork() noexcept;

 private:
  void makeReadable() noexcept;
  void makeUnreadable() noexcept;

  std::atomic<bool> isSet_ = false;
  std::atomic<int> readEnd_ = -1;
  std::atomic<int> writeEnd_ = -1;  // Where the system needs two.
};

}  // namespace rt::detail
