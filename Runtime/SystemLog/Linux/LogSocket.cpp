#include "Runtime/SystemLog/Linux/LogSocket.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace rt::detail {

namespace {

// Returns a new socket whose sends wait for `Patience::kWait` at most. Negative if the system refuses a
// socket.
int makeSocket() noexcept {
  int descriptor = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (descriptor >= 0 && descriptor <= STDERR_FILENO) {
    // The program has closed a standard stream. What it writes to that descriptor must not reach the daemon.
    const int higher = fcntl(descriptor, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
    close(descriptor);
    descriptor = higher;
  }
  if (descriptor < 0) return descriptor;
  const timeval wait{0, std::chrono::microseconds(Patience::kWait).count()};
  setsockopt(descriptor, SOL_SOCKET, SO_SNDTIMEO, &wait, sizeof wait);
  return descriptor;
}

}  // namespace

// Returns the handle of `descriptor`, or `kNone` if it is not a socket.
LogSocket::Handle LogSocket::handleOf(int descriptor) noexcept {
  struct stat status{};
  if (fstat(descriptor, &status) != 0 || !S_ISSOCK(status.st_mode)) return kNone;
  return Handle{status.st_ino} << 32U | static_cast<unsigned>(descriptor);
}

// Returns the socket, and creates it if necessary. Returns `kNone` if the system refuses a socket.
LogSocket::Handle LogSocket::open() noexcept {
  Handle known = handle_.load(std::memory_order_acquire);
  if (known != kNone) return known;
  const int made = makeSocket();
  if (made < 0) return kNone;
  const Handle handle = handleOf(made);
  if (handle != kNone && handle_.compare_exchange_strong(known, handle, std::memory_order_acq_rel))
    return handle;
  close(made);
  return known;
}

bool LogSocket::connect(int descriptor) const noexcept {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::strncpy(address.sun_path, path_, sizeof address.sun_path - 1);
  // Other threads may be sending at the same time, which the kernel allows. The thread sanitizer treats the
  // function `connect` as the creation of a descriptor that nobody uses yet. It does not see a raw system
  // call.
  long result = -1;
  do {
    result = syscall(SYS_connect, descriptor, &address, sizeof address);
  } while (result != 0 && errno == EINTR);
  return result == 0;
}

LogSocket::Outcome LogSocket::send(const msghdr& message, const Patience& patience) noexcept {
  // A restarted daemon costs one more attempt, and so does a descriptor that the program has closed. The
  // limit holds for daemons that keep restarting.
  constexpr int kAttempts = 4;
  for (int attempt = 0; attempt < kAttempts;) {
    Handle handle = open();
    if (handle == kNone) return Outcome::absent;
    // The program may have closed our socket. Its number may now belong to a socket that is connected
    // elsewhere.
    if (handleOf(descriptorOf(handle)) != handle) {
      handle_.compare_exchange_strong(handle, kNone);
      ++attempt;
      continue;
    }
    const int flags = MSG_NOSIGNAL | (patience.isOver() ? MSG_DONTWAIT : 0);
    if (sendmsg(descriptorOf(handle), &message, flags) >= 0) return Outcome::sent;
    switch (errno) {
      case EINTR:
        break;
      case EAGAIN:
      case ENOBUFS:
      case ENOMEM:
        return Outcome::busy;
      case EMSGSIZE:
        return Outcome::tooLarge;
      default:
        ++attempt;
        if (!connect(descriptorOf(handle))) return Outcome::absent;
        break;
    }
  }
  return Outcome::absent;
}

}  // namespace rt::detail
