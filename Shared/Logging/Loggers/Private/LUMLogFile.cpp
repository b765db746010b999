#include "Shared/Logging/Loggers/Private/LUMLogFile.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <new>
#include <stdexcept>
#include <system_error>
#include <utility>

#include "Runtime/Base/Private/FileDescriptor.h"

namespace {

// Writes until all is written or the system refuses. Returns how many bytes were written.
std::size_t writeAll(int descriptor, std::string_view text) noexcept {
  std::size_t written = 0;
  while (written < text.size()) {
    const ssize_t count = ::write(descriptor, text.data() + written, text.size() - written);
    if (count > 0) {
      written += static_cast<std::size_t>(count);
    } else if (count == 0) {
      errno = EIO;
      break;
    } else if (errno != EINTR) {
      break;
    }
  }
  return written;
}

// The absolute path, so that it stays right if the program changes its folder.
std::string absolutePath(const std::string& path) {
  if (path.empty()) throw std::invalid_argument("the path of a log file is empty");
  if (path.find('\0') != std::string::npos) {
    throw std::invalid_argument("the path of a log file has a NUL in it");
  }
  return std::filesystem::absolute(path).string();
}

// Makes `kept` refer to the file of `fresh`, which is closed. Both stay closed in programs that are executed.
bool replace(int kept, int fresh) noexcept {
#if defined(__linux__)
  const bool isReplaced = dup3(fresh, kept, O_CLOEXEC) >= 0;
#else
  const bool isReplaced = dup2(fresh, kept) >= 0 && fcntl(kept, F_SETFD, FD_CLOEXEC) == 0;
#endif
  close(fresh);
  return isReplaced;
}

}  // namespace

LUMLogFile::LUMLogFile(const std::string& path, mode_t mode, std::uint32_t keptFileCount)
    : path_(absolutePath(path)), mode_(mode), keptFileCount_(keptFileCount) {
  descriptor_ = open();
  if (descriptor_ < 0) {
    throw std::system_error(errno, std::generic_category(), "cannot open the log file " + path_);
  }
  refresh();
  isCut_ = endsWithinLine();
}

LUMLogFile::~LUMLogFile() {
  close(descriptor_);
}

int LUMLogFile::open() const noexcept {
  int descriptor = -1;
  do {
    descriptor = ::open(path_.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC | O_NOCTTY, mode_);
  } while (descriptor < 0 && errno == EINTR);
  return descriptor;
}

void LUMLogFile::refresh() noexcept {
  struct stat status{};
  isNameless_ = false;
  if (fstat(descriptor_, &status) != 0) return;
  isRegular_ = S_ISREG(status.st_mode);
  device_ = status.st_dev;
  inode_ = status.st_ino;
  size_ = isRegular_ ? static_cast<std::uint64_t>(status.st_size) : 0;
  changeTime_ = status.st_mtime;
  isCut_ = false;
}

// Another run of the program may have left half a line behind, when the disk was full. While another process
// appends, its line may look like half a one for a moment, so this is asked only when the program begins.
bool LUMLogFile::endsWithinLine() const noexcept {
  if (size_ == 0) return false;
  const rt::FileDescriptor reader(::open(path_.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  struct stat status{};
  char last = '\n';
  return reader.get() >= 0 && fstat(reader.get(), &status) == 0 && status.st_dev == device_ &&
         status.st_ino == inode_ && pread(reader.get(), &last, 1, static_cast<off_t>(size_ - 1)) == 1 &&
         last != '\n';
}

bool LUMLogFile::isAtPath() const noexcept {
  struct stat status{};
  return stat(path_.c_str(), &status) == 0 && status.st_dev == device_ && status.st_ino == inode_;
}

std::size_t LUMLogFile::write(std::string_view text) noexcept {
  if (isNameless_) {
    error_ = ENOENT;
    return 0;
  }
  if (isCut_) {
    if (writeAll(descriptor_, "\n") == 0) {
      error_ = errno;
      return 0;
    }
    isCut_ = false;
    ++size_;
  }
  const std::size_t written = writeAll(descriptor_, text);
  if (written < text.size()) {
    error_ = errno;
    isCut_ = written > 0 && text[written - 1] != '\n';
  }
  size_ += written;
  return written;
}

void LUMLogFile::writeInSignalHandler(std::string_view text) const noexcept {
  writeAll(descriptor_, text);
}

bool LUMLogFile::follow() noexcept {
  if (!isRegular_ || isAtPath()) return false;
  const int descriptor = open();
  if (descriptor >= 0 && replace(descriptor_, descriptor)) {
    refresh();
    return true;
  }
  struct stat status{};
  isNameless_ = fstat(descriptor_, &status) == 0 && status.st_nlink == 0;
  return false;
}

std::string LUMLogFile::keptPath(std::uint32_t number) const {
  return number == 0 ? path_ : path_ + "." + std::to_string(number);
}

void LUMLogFile::renameFiles() const {
  if (keptFileCount_ == 0) unlink(path_.c_str());
  for (std::uint32_t number = keptFileCount_; number > 0; --number) {
    rename(keptPath(number - 1).c_str(), keptPath(number).c_str());
  }
}

void LUMLogFile::rotate() noexcept {
  if (!isRegular_) return;
  try {
    if (isAtPath()) renameFiles();
  } catch (const std::bad_alloc&) {
    // The file stays, and so do the kept ones that were not renamed yet.
    return;
  }
  follow();
}
