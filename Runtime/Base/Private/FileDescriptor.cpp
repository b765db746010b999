#include "Runtime/Base/Private/FileDescriptor.h"

#include <fcntl.h>
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

FileDescriptor FileDescriptor::open(const std::string& path, int flags) {
  if (path.find('\0') != std::string::npos) throw std::invalid_argument("a path has a NUL in it");
  int descriptor = -1;
  do {
    descriptor = ::open(path.c_str(), flags | O_CLOEXEC);
  } while (descriptor < 0 && errno == EINTR);
  if (descriptor < 0) throw std::system_error(errno, std::generic_category(), "cannot open " + path);
  return FileDescriptor(descriptor);
}

}  // namespace rt
