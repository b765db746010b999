#include "Runtime/Base/Private/StandardError.h"

#include <sys/select.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>

#include "Runtime/Base/Private/SystemStandardError.h"

namespace rt::StandardError {

namespace {

using Clock = std::chrono::steady_clock;

// Waits until there is room, or until `end`. Returns whether there is room. Also returns true if there will
// never be room. The next write then fails and gives the reason.
bool awaitRoom(int descriptor, Clock::time_point end) noexcept {
  for (;;) {
    const auto left = std::max(std::chrono::ceil<std::chrono::microseconds>(end - Clock::now()),
                               std::chrono::microseconds(0));
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(left);
    // The system's type for microseconds may have 32 bits.
    using Microseconds = std::chrono::duration<decltype(timeval::tv_usec), std::micro>;
    timeval timeout{.tv_sec = seconds.count(),
                    .tv_usec = std::chrono::duration_cast<Microseconds>(left - seconds).count()};
    fd_set stream;
    FD_ZERO(&stream);
    FD_SET(descriptor, &stream);
    // macOS does not poll terminals and other devices.
    const int ready = select(descriptor + 1, nullptr, &stream, nullptr, &timeout);
    if (ready < 0 && errno == EINTR) continue;
    if (ready == 0) errno = EAGAIN;
    return ready > 0;
  }
}

}  // namespace

std::size_t writeTo(int descriptor, std::string_view text, std::chrono::milliseconds longestWait) noexcept {
  const Clock::time_point end = Clock::now() + longestWait;
  // A file takes the whole text at once. Any other stream that reports room has room for PIPE_BUF bytes.
  struct stat status{};
  const bool isFile = fstat(descriptor, &status) == 0 && S_ISREG(status.st_mode);
  std::size_t written = 0;
  while (written < text.size()) {
    const std::string_view rest = text.substr(written);
    ssize_t count = 0;
    if (isFile) {
      count = ::write(descriptor, rest.data(), rest.size());
    } else {
      if (!awaitRoom(descriptor, end)) break;
      count = detail::writeOnce(descriptor, rest.substr(0, PIPE_BUF));
    }
    if (count > 0) {
      written += static_cast<std::size_t>(count);
    } else if (count == 0 || (errno != EINTR && (errno != EAGAIN || Clock::now() >= end))) {
      break;
    }
  }
  return written;
}

bool write(std::string_view text, std::chrono::milliseconds longestWait) noexcept {
  return writeTo(STDERR_FILENO, text, longestWait) == text.size();
}

}  // namespace rt::StandardError
