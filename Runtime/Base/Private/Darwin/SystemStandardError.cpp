#include "Runtime/Base/Private/SystemStandardError.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace rt::detail {

// The system sends SIGPIPE to the process, so it would not help to block the signal in the calling thread. A
// flag of the stream keeps the system from sending it. Other writers to the same stream get no signal either
// while this one writes.
ssize_t writeStandardErrorOnce(std::string_view text) noexcept {
  const int flag = fcntl(STDERR_FILENO, F_GETNOSIGPIPE);
  if (flag == 0) fcntl(STDERR_FILENO, F_SETNOSIGPIPE, 1);
  const ssize_t count = write(STDERR_FILENO, text.data(), text.size());
  const int error = errno;
  if (flag == 0) fcntl(STDERR_FILENO, F_SETNOSIGPIPE, 0);
  errno = error;
  return count;
}

}  // namespace rt::detail
