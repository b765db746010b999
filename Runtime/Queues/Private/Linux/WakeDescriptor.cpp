#include "Runtime/Queues/Private/WakeDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

namespace rt::detail {

namespace {

int newEvent() noexcept {
  return eventfd(0, EFD_NONBLOCK | EFD_CLOEXEC);
}

}  // namespace

int WakeDescriptor::open() {
  int descriptor = readEnd_.load();
  if (descriptor >= 0) return descriptor;
  const int opened = newEvent();
  if (opened < 0)
    throw std::system_error(errno, std::generic_category(), "rt: no descriptor for the main queue");
  if (!readEnd_.compare_exchange_strong(descriptor, opened)) {  // Another thread was faster.
    close(opened);
    return descriptor;
  }
  if (isSet_.load()) makeReadable();
  return opened;
}

void WakeDescriptor::makeReadable() noexcept {
  const int descriptor = readEnd_.load();
  if (descriptor < 0) return;
  const int error = errno;
  eventfd_write(descriptor, 1);
  errno = error;
}

void WakeDescriptor::makeUnreadable() noexcept {
  const int descriptor = readEnd_.load();
  if (descriptor < 0) return;
  const int error = errno;
  eventfd_t value = 0;
  eventfd_read(descriptor, &value);
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
  const int renewed = newEvent();
  if (renewed >= 0 && dup3(renewed, descriptor, O_CLOEXEC) == descriptor) {
    close(renewed);
    return;
  }
  // Rather none, which the next `open` reports or makes good, than the parent's.
  close(descriptor);
  if (renewed >= 0) close(renewed);
  readEnd_.store(-1);
}

}  // namespace rt::detail
