// libc++ waits for atomics with the system calls of which <os/os_sync_wait_on_address.h> is the public form.

#include <atomic>
#include <climits>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Futex.h"

namespace {

constexpr std::uint32_t kOperation = 0xff;
constexpr std::uint32_t kCompareAndWait = 1;
constexpr std::uint32_t kCompareAndWait64 = 5;
constexpr std::uint32_t kWakeAll = 0x100;

int failWith(int linuxError) {
  errno = darwinError(linuxError);
  return -1;
}

void requireKnown(std::uint32_t operation, const char* function) {
  const std::uint32_t kind = operation & kOperation;
  if ((kind != kCompareAndWait && kind != kCompareAndWait64) || (operation & ~(kOperation | kWakeAll)) != 0) {
    refuse("%s is called with the operation 0x%x", function, operation);
  }
}

// Sleeps until the word of 4 or 8 bytes changes, or until the time is over. Returns how many threads still
// sleep there, which nobody asks for, or -1.
int wait(std::uint32_t operation, void* address, std::uint64_t expected, std::uint32_t microseconds) {
  requireKnown(operation, "__ulock_wait");
  // The kernel compares the lower half only. A change of the upper half alone wakes the sleeper too.
  if ((operation & kOperation) == kCompareAndWait64 &&
      std::atomic_ref(*static_cast<std::uint64_t*>(address)).load() != expected) {
    return 0;
  }
  constexpr std::uint32_t kSecond = 1'000'000;
  const timespec timeout{.tv_sec = microseconds / kSecond, .tv_nsec = (microseconds % kSecond) * 1000L};
  const long result =
      futexWait(address, static_cast<std::uint32_t>(expected), microseconds == 0 ? nullptr : &timeout);
  return result == 0 || errno == EAGAIN ? 0 : failWith(errno);
}

int wake(std::uint32_t operation, void* address, std::uint64_t) {
  requireKnown(operation, "__ulock_wake");
  return futexWake(address, (operation & kWakeAll) != 0 ? INT_MAX : 1) > 0 ? 0 : failWith(ENOENT);
}

}  // namespace

shims::Table shims::osSync() {
  static const Shim table[] = {
      shim("__ulock_wait", &wait),
      shim("__ulock_wake", &wake),
  };
  return table;
}
