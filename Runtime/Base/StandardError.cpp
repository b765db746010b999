#include "Runtime/Base/StandardError.h"

#include <poll.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <csignal>

namespace rt::StandardError {

namespace {

using Clock = std::chrono::steady_clock;

// Keeps a SIGPIPE that the calling thread raises from being delivered. Leaves any other SIGPIPE pending.
class BrokenPipeIgnored {
 public:
  BrokenPipeIgnored() noexcept {
    sigemptyset(&brokenPipe_);
    sigaddset(&brokenPipe_, SIGPIPE);
    wasPending_ = isPending();
    pthread_sigmask(SIG_BLOCK, &brokenPipe_, &previous_);
  }
  BrokenPipeIgnored(const BrokenPipeIgnored&) = delete;
  BrokenPipeIgnored& operator=(const BrokenPipeIgnored&) = delete;
  ~BrokenPipeIgnored() {
    if (!wasPending_ && isPending()) {
      int ignored = 0;
      sigwait(&brokenPipe_, &ignored);
    }
    pthread_sigmask(SIG_SETMASK, &previous_, nullptr);
  }

 private:
  static bool isPending() noexcept {
    sigset_t pending;
    sigpending(&pending);
    return sigismember(&pending, SIGPIPE) == 1;
  }

  sigset_t brokenPipe_;
  sigset_t previous_;
  bool wasPending_;
};

// Waits until there is room, or until `end`. Returns whether there is room. Also returns true if there will
// never be room. The next write then fails and gives the reason.
bool awaitRoom(Clock::time_point end) noexcept {
  for (;;) {
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(end - Clock::now());
    pollfd stream{STDERR_FILENO, POLLOUT, 0};
    const int ready = poll(&stream, 1, static_cast<int>(std::max<long long>(left.count(), 0)));
    if (ready < 0 && errno == EINTR) continue;
    return ready > 0;
  }
}

// Writes without waiting where the system can do that, since another writer may have taken the room
// meanwhile.
ssize_t writeWithoutWaiting(std::string_view text) noexcept {
#ifdef __linux__
  const iovec piece{const_cast<char*>(text.data()), text.size()};
  const ssize_t count = pwritev2(STDERR_FILENO, &piece, 1, -1, RWF_NOWAIT);
  if (count >= 0 || errno != EOPNOTSUPP) return count;
#endif
  return ::write(STDERR_FILENO, text.data(), text.size());
}

}  // namespace

bool write(std::string_view text, std::chrono::milliseconds longestWait) noexcept {
  const BrokenPipeIgnored guard;
  const Clock::time_point end = Clock::now() + longestWait;
  // A file takes the whole text at once. Any other stream that reports room has room for PIPE_BUF bytes.
  struct stat status{};
  const bool isFile = fstat(STDERR_FILENO, &status) == 0 && S_ISREG(status.st_mode);
  while (!text.empty()) {
    ssize_t count = 0;
    if (isFile) {
      count = ::write(STDERR_FILENO, text.data(), text.size());
    } else {
      if (!awaitRoom(end)) return false;
      count = writeWithoutWaiting(text.substr(0, PIPE_BUF));
    }
    if (count > 0) {
      text.remove_prefix(static_cast<std::size_t>(count));
    } else if (count == 0 || (errno != EINTR && (errno != EAGAIN || Clock::now() >= end))) {
      return false;
    }
  }
  return true;
}

}  // namespace rt::StandardError
