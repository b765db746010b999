#include "Runtime/Process/FileHandle.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <string>
#include <system_error>

#include "Runtime/Base/FileDescriptor.h"
#include "Runtime/Locks/Lazy.h"
#include "Runtime/Locks/UnfairLock.h"

namespace rt {

namespace {

iovec pieceOf(std::string_view text) noexcept {
  return {const_cast<char*>(text.data()), text.size()};
}

// The rest of a line that is being written.
class Pieces {
 public:
  Pieces(std::string_view before, std::string_view line) noexcept
      : pieces_{pieceOf(before), pieceOf(line), pieceOf("\n")} {
    if (before.size() + line.size() < joined_.size()) join();
    skip(0);
  }
  Pieces(const Pieces&) = delete;
  Pieces& operator=(const Pieces&) = delete;

  bool isEmpty() const noexcept { return first_ == pieces_.size(); }

  // Passes the rest to the system in one call. Returns the result of `write` or `writev`.
  ssize_t write(int descriptor) const noexcept {
    const iovec* const first = pieces_.data() + first_;
    const std::size_t count = pieces_.size() - first_;
    if (count == 1) return ::write(descriptor, first->iov_base, first->iov_len);
    return writev(descriptor, first, static_cast<int>(count));
  }

  void skip(std::size_t count) noexcept {
    for (; first_ < pieces_.size(); ++first_) {
      iovec& piece = pieces_[first_];
      if (count < piece.iov_len) {
        piece.iov_base = static_cast<char*>(piece.iov_base) + count;
        piece.iov_len -= count;
        return;
      }
      count -= piece.iov_len;
    }
  }

 private:
  // Joins all pieces into the last one. Measured: two pieces take the system half as long again as one.
  void join() noexcept {
    char* end = joined_.data();
    for (const iovec& piece : pieces_) {
      end = std::copy_n(static_cast<const char*>(piece.iov_base), piece.iov_len, end);
    }
    pieces_ = {pieceOf(""), pieceOf(""), pieceOf({joined_.data(), end})};
  }

  std::array<iovec, 3> pieces_;
  std::size_t first_ = 0;
  std::array<char, 1024> joined_;
};

void waitUntilWritable(int descriptor) noexcept {
  pollfd request{descriptor, POLLOUT, 0};
  poll(&request, 1, -1);
}

}  // namespace

FileHandle::~FileHandle() {
  if (closing_ == Closing::closes) close(descriptor_);
}

Ref<FileHandle> FileHandle::standardOutput() {
  static constinit Lazy<Ref<FileHandle>> handle;
  return handle.get([] { return make<FileHandle>(STDOUT_FILENO, Closing::leavesOpen); });
}

Ref<FileHandle> FileHandle::standardError() {
  static constinit Lazy<Ref<FileHandle>> handle;
  return handle.get([] { return make<FileHandle>(STDERR_FILENO, Closing::leavesOpen); });
}

Ref<FileHandle> FileHandle::openForAppending(const String& path, std::uint16_t mode) {
  if (path.isNull() || path.view().find('\0') != std::string_view::npos) {
    errno = EINVAL;
    return nullptr;
  }
  const std::string terminated(path.view());
  FileDescriptor descriptor;
  do {
    descriptor = FileDescriptor(open(terminated.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, mode));
  } while (!descriptor && errno == EINTR);
  if (!descriptor) return nullptr;
  Ref<FileHandle> handle = make<FileHandle>(descriptor.get(), Closing::closes);
  descriptor.release();
  return handle;
}

void FileHandle::writeLine(std::string_view line) {
  const LockGuard guard(lock_);
  const std::string_view before = isInLine_ ? "\n" : "";
  Pieces pieces(before, line);
  std::size_t written = 0;
  while (!pieces.isEmpty()) {
    const ssize_t count = pieces.write(descriptor_);
    if (count > 0) {
      pieces.skip(static_cast<std::size_t>(count));
      written += static_cast<std::size_t>(count);
    } else if (count < 0 && errno == EAGAIN && written > before.size()) {
      waitUntilWritable(descriptor_);
    } else if (count == 0 || errno != EINTR) {
      const int error = count == 0 ? EIO : errno;
      if (written > 0) isInLine_ = written > before.size();
      throw std::system_error(error, std::generic_category(), "cannot write a line");
    }
  }
  isInLine_ = false;
}

}  // namespace rt
