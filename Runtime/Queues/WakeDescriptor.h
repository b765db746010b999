#pragma once

// A file descriptor that is readable while it is set. For rt::MainQueue only.

#include <array>
#include <atomic>

namespace rt::detail {

/// What the system has for it: opens the end to read from and the end to write to, which may be the same
/// descriptor. Neither blocks, and programs that this one starts inherit neither. Returns whether there are
/// any; `errno` says why not.
bool openSystemWake(std::array<int, 2>& ends) noexcept;

/// Has the system's own main loop, where there is one, drain the main queue.
void wakeSystemMainLoop() noexcept;

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
  std::atomic<int> writeEnd_ = -1;
};

}  // namespace rt::detail
