#include "Runtime/Queues/Private/WakeDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <system_error>

namespace rt::detail {

namespace {

// What is written at a time. An event counter takes nothing smaller.
using Count = std::uint64_t;

void closeEnds(const std::array<int, 2>& ends) noexcept {
  close(ends[0]);
  if (ends[1] != ends[0]) close(ends[1]);
}

}  // namespace

int WakeDescriptor::open() {
  int descriptor = readEnd_.load();
  if (descriptor >= 0) return descriptor;
  std::array<int, 2> ends{};
  if (!openSystemWake(ends))
    throw std::system_error(errno, std::generic_category(), "rt: no descriptor for the main queue");
  if (!readEnd_.compare_exchange_strong(descriptor, ends[0])) {  // Another thread was faster.
    closeEnds(ends);
    return descriptor;
  }
  writeEnd_.store(ends[1]);
  if (isSet_.load()) makeReadable();
  return ends[0];
}

void WakeDescriptor::makeReadable() noexcept {
  wakeSystemMainLoop();
  const int descriptor = writeEnd_.load();
  if (descriptor < 0) return;
  const int error = errno;
  const Count one = 1;
  while (write(descriptor, &one, sizeof one) < 0 && errno == EINTR) {
  }
  errno = error;
}

void WakeDescriptor::makeUnreadable() noexcept {
  const int descriptor = readEnd_.load();
  if (descriptor < 0) return;
  const int error = errno;
  std::array<Count, 8> counts{};
  while (read(descriptor, counts.data(), sizeof counts) == static_cast<ssize_t>(sizeof counts)) {
  }
  errno = error;
}

void WakeDescriptor::wait() noexcept {
  pollfd event{.fd = readEnd_.load(), .events = POLLIN, .revents = 0};
  poll(&event, 1, -1);
}

void WakeDescriptor::renewAfterFork() noexcept {
  forgetSystemMainLoopAfterFork();
  isSet_.store(false);
  const int descriptor = readEnd_.load();
  if (descriptor < 0) return;
  const int parents = writeEnd_.exchange(-1);
  if (parents >= 0 && parents != descriptor) close(parents);
  std::array<int, 2> ends{};
  const bool isOpen = openSystemWake(ends);
  if (isOpen && dup2(ends[0], descriptor) == descriptor) {
    fcntl(descriptor, F_SETFD, FD_CLOEXEC);
    close(ends[0]);
    writeEnd_.store(ends[1] == ends[0] ? descriptor : ends[1]);
    return;
  }
  // No descriptor is better than the parent's. The next `open` opens one, or reports that it cannot.
  close(descriptor);
  if (isOpen) closeEnds(ends);
  readEnd_.store(-1);
}

}  // namespace rt::detail
