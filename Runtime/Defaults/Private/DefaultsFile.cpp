#include "Runtime/Defaults/Private/DefaultsFile.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <system_error>

#include "Runtime/Base/Private/FileDescriptor.h"

namespace rt {

namespace {

[[noreturn]] void fail(int error, const std::string& what) {
  throw std::system_error(error, std::generic_category(), what);
}

timespec changeTime(const struct stat& status) {
#ifdef __APPLE__
  return status.st_ctimespec;
#else
  return status.st_ctim;
#endif
}

}  // namespace

DefaultsFile::Version DefaultsFile::version() const noexcept {
  Version version;
  timespec now{};
  // Read before the status, so that a later change has this time or a later one.
  clock_gettime(CLOCK_REALTIME, &now);
  version.exists_ = stat(path_.c_str(), &version.status_) == 0;
  // The clock of a file system may have steps of two seconds.
  version.isSettled_ = version.exists_ ? changeTime(version.status_).tv_sec + 2 < now.tv_sec
                                       : errno == ENOENT || errno == ENOTDIR;
  return version;
}

bool DefaultsFile::isStill(const Version& version) const noexcept {
  if (!version.isSettled_) return false;
  struct stat status{};
  if (stat(path_.c_str(), &status) != 0) return !version.exists_ && (errno == ENOENT || errno == ENOTDIR);
  const timespec time = changeTime(status);
  const timespec other = changeTime(version.status_);
  return version.exists_ && status.st_ino == version.status_.st_ino &&
         status.st_dev == version.status_.st_dev && status.st_size == version.status_.st_size &&
         time.tv_sec == other.tv_sec && time.tv_nsec == other.tv_nsec;
}

std::optional<std::string> DefaultsFile::content(std::size_t maximumSize) const {
  FileDescriptor file;
  try {
    // Without O_NONBLOCK, a named pipe would block the caller.
    file = FileDescriptor::open(path_, O_RDONLY | O_NONBLOCK);
  } catch (const std::system_error& error) {
    if (error.code().value() == ENOENT || error.code().value() == ENOTDIR) return std::nullopt;
    throw;
  }
  struct stat status{};
  if (fstat(file.get(), &status) != 0) fail(errno, "cannot read " + path_);
  if (!S_ISREG(status.st_mode)) fail(EINVAL, "no plain file: " + path_);

  // The size may change while the file is read.
  std::string content;
  std::size_t length = 0;
  for (;;) {
    content.resize(length + 4096);
    const ssize_t count = read(file.get(), content.data() + length, content.size() - length);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) fail(errno, "cannot read " + path_);
    length += static_cast<std::size_t>(count);
    if (length > maximumSize) fail(EFBIG, "cannot read " + path_);
    if (count == 0) break;
  }
  content.resize(length);
  return content;
}

}  // namespace rt
