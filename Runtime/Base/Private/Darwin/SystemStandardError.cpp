#include "Runtime/Base/Private/SystemStandardError.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace rt::detail {

// The system sends SIGPIPE to the process, so it would not help to block the signal in the calling thread. A
// flag of the stream keeps the system from sending it. Other writers to the same stream get no signal either
// while this one writes.
ssize_t writeOnce(int descriptor, std::string_view text) noexcept {
  const int flag = fcntl(descriptor, F_GETNOSIGPIPE);
  if (flag == 0) fcntl(descriptor, F_SETNOSIGPIPE, 1);
  const ssize_t count = write(descriptor, text.data(), text.size());
  const int error = errno;
  if (flag == 0) fcntl(descriptor, F_SETNOSIGPIPE, 0);
  errno = error;
  return count;
}

}  // namespace rt::detail
