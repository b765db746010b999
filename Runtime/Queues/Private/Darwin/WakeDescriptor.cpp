#include "Runtime/Queues/Private/WakeDescriptor.h"

#include <dispatch/dispatch.h>
#include <fcntl.h>
#include <pthread.h>
#include <unistd.h>

#include <atomic>

#include "Runtime/Queues/MainQueue.h"

namespace rt::detail {

namespace {

// Whether the system's main loop has something to run and has not run it yet. A host may never run that loop,
// so no more than one is handed to it at a time.
constinit std::atomic<bool> isHandedOver = false;

// Called by the system's main loop. `dispatch_main` runs that loop on other threads and ends the main thread.
void drainMainQueue(void* /*context*/) {
  isHandedOver.store(false, std::memory_order_seq_cst);
  if (pthread_main_np() == 1) MainQueue::drain();
}

}  // namespace

bool openSystemWake(std::array<int, 2>& ends) noexcept {
  if (pipe(ends.data()) != 0) return false;
  for (const int end : ends) {
    fcntl(end, F_SETFL, O_NONBLOCK);
    fcntl(end, F_SETFD, FD_CLOEXEC);
  }
  return true;
}

void wakeSystemMainLoop() noexcept {
  if (!isHandedOver.exchange(true)) dispatch_async_f(dispatch_get_main_queue(), nullptr, drainMainQueue);
}

// The system's main loop does not work in the child of a fork. So nothing is handed to it there any more.
void forgetSystemMainLoopAfterFork() noexcept {
  isHandedOver.store(true, std::memory_order_relaxed);
}

}  // namespace rt::detail
