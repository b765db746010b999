#include "Runtime/Queues/Private/WakeDescriptor.h"

#include <sys/eventfd.h>

namespace rt::detail {

bool openSystemWake(std::array<int, 2>& ends) noexcept {
  ends.fill(eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC));
  return ends[0] >= 0;
}

void wakeSystemMainLoop() noexcept {}

void forgetSystemMainLoopAfterFork() noexcept {}

}  // namespace rt::detail
