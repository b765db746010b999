#pragma once

// A file descriptor that is readable while it is set. For rt::MainQueue only.

#include <array>
#include <atomic>

namespace rt::detail {

/// Opens the end to read from and the end to write to. They may be the same descriptor. Neither end blocks,
/// and neither is inherited by programs that this one starts. Returns false, with `errno` set, if the
/// system refuses.
bool openSystemWake(std::array<int, 2>& ends) noexcept;

/// Makes the system's own main loop, if there is one, drain the main queue.
void wakeSystemMainLoop() noexcept;

/// Makes `wakeSystemMainLoop` do nothing from now on if that loop does not work in the child of a fork. For
/// the child.
void forgetSystemMainLoopAfterFork() noexcept;

class WakeDescriptor {
 public:
  constexpr WakeDescriptor() noexcept = default;
  WakeDescriptor(const WakeDescriptor&) = delete;
  WakeDescriptor& operator=(const WakeDescriptor&) = delete;

  /// Returns the descriptor. The first call opens it. Throws std::system_error.
  int open();

  /// Makes the descriptor readable, now or when it is opened. The thread that returns from the next `reset`
  /// sees all that was written before.
  void set() noexcept {
    if (!isSet_.exchange(true)) makeReadable();
  }

  /// Makes the descriptor unreadable again. May leave it readable if another thread calls `set` at the same
  /// time.
  void reset() noexcept {
    // In this order: a `set` in between makes nothing readable, but the next line undoes it as well.
    makeUnreadable();
    isSet_.exchange(false);
  }

  /// Sleeps until the descriptor is readable. Precondition: it is open.
  void wait() noexcept;

  /// Opens a new descriptor under the same number, which is not set. For the child of a fork, which must
  /// not share the parent's.
  void renewAfterFork() noexcept;

 private:
  void makeReadable() noexcept;
  void makeUnreadable() noexcept;

  std::atomic<bool> isSet_ = false;
  std::atomic<int> readEnd_ = -1;
  std::atomic<int> writeEnd_ = -1;
};

}  // namespace rt::detail
