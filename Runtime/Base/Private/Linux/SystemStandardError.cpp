#include "Runtime/Base/Private/SystemStandardError.h"

#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

namespace rt::detail {

namespace {

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
    const int error = errno;
    if (!wasPending_ && isPending()) {
      int ignored = 0;
      sigwait(&brokenPipe_, &ignored);
    }
    pthread_sigmask(SIG_SETMASK, &previous_, nullptr);
    errno = error;
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

}  // namespace

ssize_t writeOnce(int descriptor, std::string_view text) noexcept {
  const BrokenPipeIgnored guard;
  // Another writer may have taken the room meanwhile.
  const iovec piece{const_cast<char*>(text.data()), text.size()};
  const ssize_t count = pwritev2(descriptor, &piece, 1, -1, RWF_NOWAIT);
  if (count >= 0 || errno != EOPNOTSUPP) return count;
  return write(descriptor, text.data(), text.size());
}

}  // namespace rt::detail
