#include "Runtime/Base/FileDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>
#include <system_error>

namespace rt {

FileDescriptor::~FileDescriptor() {
  // `close` is not repeated after EINTR. The descriptor is closed by then, and another thread may have its
  // number.
  if (descriptor_ >= 0) ::close(descriptor_);
}

FileDescriptor FileDescriptor::open(const std::string& path, int flags, mode_t mode) {
  if (path.find('\0') != std::string::npos) throw std::invalid_argument("a path has a NUL in it");
  int descriptor = -1;
  do {
    descriptor = ::open(path.c_str(), flags | O_CLOEXEC, mode);
  } while (descriptor < 0 && errno == EINTR);
  if (descriptor < 0) throw std::system_error(errno, std::generic_category(), "cannot open " + path);
  return FileDescriptor(descriptor);
}

void FileDescriptor::write(std::string_view bytes) const {
  while (!bytes.empty()) {
    const ssize_t count = ::write(descriptor_, bytes.data(), bytes.size());
    if (count > 0) {
      bytes.remove_prefix(static_cast<std::size_t>(count));
      continue;
    }
    // A write of 0 bytes counts as an error. Otherwise a device that takes nothing would be asked for ever.
    const int error = count == 0 ? EIO : errno;
    if (error == EAGAIN) {
      pollfd ready{descriptor_, POLLOUT, 0};
      ::poll(&ready, 1, -1);
    } else if (error != EINTR) {
      throw std::system_error(error, std::generic_category(), "cannot write");
    }
  }
}

}  // namespace rt
