#include "Runtime/FileDescriptor.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <stdexcept>
#include <system_error>

namespace rt {

FileDescriptor::~FileDescriptor() {
  // Not again after EINTR: the descriptor is gone and may be another thread's by then.
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

void FileDescriptor::write(int descriptor, std::string_view first, std::string_view second,
                           std::size_t* written) {
  std::size_t count = 0;
  const std::size_t total = first.size() + second.size();
  if (written != nullptr) *written = 0;
  while (count < total) {
    const auto part = [](std::string_view text) {
      return iovec{const_cast<char*>(text.data()), text.size()};
    };
    const std::size_t ofFirst = std::min(count, first.size());
    const std::array<iovec, 2> parts{part(first.substr(ofFirst)), part(second.substr(count - ofFirst))};
    const ssize_t result = ::writev(descriptor, parts.data(), parts.size());
    if (result > 0) {
      count += static_cast<std::size_t>(result);
      if (written != nullptr) *written = count;
      continue;
    }
    // A device that takes nothing and complains of nothing would be asked for ever.
    const int error = result == 0 ? EIO : errno;
    if (error == EINTR) continue;
    if (error == EAGAIN) {
      pollfd ready{descriptor, POLLOUT, 0};
      ::poll(&ready, 1, -1);
      continue;
    }
    throw std::system_error(error, std::generic_category(), "cannot write");
  }
}

}  // namespace rt
