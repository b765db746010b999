#include "Runtime/Queues/Private/WakeDescriptor.h"

#include <dispatch/dispatch.h>
#include <fcntl.h>
#include <unistd.h>

#include "Runtime/Queues/MainQueue.h"

namespace rt::detail {

bool openSystemWake(std::array<int, 2>& ends) noexcept {
  if (pipe(ends.data()) != 0) return false;
  for (const int end : ends) {
    fcntl(end, F_SETFL, O_NONBLOCK);
    fcntl(end, F_SETFD, FD_CLOEXEC);
  }
  return true;
}

void wakeSystemMainLoop() noexcept {
  dispatch_async_f(dispatch_get_main_queue(), nullptr, [](void*) { MainQueue::drain(); });
}

}  // namespace rt::detail
