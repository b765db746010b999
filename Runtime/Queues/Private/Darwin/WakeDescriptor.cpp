#include "Runtime/Queues/Private/WakeDescriptor.h"

#include <dispatch/dispatch.h>
#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <system_error>

#include "Runtime/Queues/MainQueue.h"

namespace rt::detail {

namespace {

bool newPipe(std::array<int, 2>& ends) noexcept {
  if (pipe(ends.data()) != 0) return false;
  for (const int end : ends) {
    fcntl(end, F_SETFL, O_NONBLOCK);
    fcntl(end, F_SETFD, FD_CLOEXEC);
  }
  return true;
}

}  // namespace

int WakeDescriptor::open() {
  int descriptor = readEnd_.load();
  if (descriptor >= 0) return descriptor;
  std::array<int, 2> ends{};
  if (!newPipe(ends))
    throw std::system_error(errno, std::generic_category(), "rt: no descriptor for the main queue");
  if (!readEnd_.compare_exchange_strong(descriptor, ends[0])) {
    close(ends[0]);
    close(ends[1]);
    return descriptor;
  }
  writeEnd_.store(ends[1]);
  if (isSet_.load()) makeReadable();
  return ends[0];
}

void WakeDescriptor::makeReadable() noexcept {
  dispatch_async_f(dispatch_get_main_queue(), nullptr, [](void*) { MainQueue::drain(); });
  const int descriptor = writeEnd_.load();
  if (descriptor < 0) return;
  const int error = errno;
  write(descriptor, "", 1);
  errno = error;
}

void WakeDescriptor::makeUnreadable() noexcept {
  const int descriptor = readEnd_.load();
  if (descriptor < 0) return;
  const int error = errno;
  std::array<char, 64> bytes{};
  while (read(descriptor, bytes.data(), bytes.size()) > 0) {
  }
  errno = error;
}

void WakeDescriptor::wait() noexcept {
  pollfd event{.fd = readEnd_.load(), .events = POLLIN, .revents = 0};
  poll(&event, 1, -1);
}

void WakeDescriptor::renewAfterFork() noexcept {
  isSet_.store(false);
  const int descriptor = readEnd_.load();
  if (descriptor < 0) return;
  close(writeEnd_.exchange(-1));
  std::array<int, 2> ends{};
  if (newPipe(ends) && dup2(ends[0], descriptor) == descriptor) {
    fcntl(descriptor, F_SETFD, FD_CLOEXEC);
    close(ends[0]);
    writeEnd_.store(ends[1]);
    return;
  }
  // Rather none, which the next `open` reports or makes good, than the parent's.
  close(descriptor);
  readEnd_.store(-1);
}

}  // namespace rt::detail
