#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <string>
#include <utility>

/// Captures what the process writes to standard error during this object's lifetime. It redirects standard
/// error to a pipe or a pair of sockets and reads the other end.
///
///     StandardErrorPipe standardError;
///     ... fail ...
///     EXPECT_EQ(standardError.text(), "it failed\n");
///
/// Objects of this class may be nested.
class StandardErrorPipe {
 public:
  enum class Kind : std::uint8_t { pipe, socket };

  explicit StandardErrorPipe(Kind kind = Kind::pipe) : kept_(fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3)) {
    EXPECT_EQ(kind == Kind::pipe ? pipe(ends_.data()) : socketpair(AF_UNIX, SOCK_STREAM, 0, ends_.data()), 0);
    for (const int end : ends_) fcntl(end, F_SETFD, FD_CLOEXEC);
    dup2(ends_[1], STDERR_FILENO);
  }
  StandardErrorPipe(const StandardErrorPipe&) = delete;
  StandardErrorPipe& operator=(const StandardErrorPipe&) = delete;
  ~StandardErrorPipe() {
    dup2(kept_, STDERR_FILENO);
    close(kept_);
    closeReader();
    if (ends_[1] >= 0) close(ends_[1]);
  }

  /// Closes the reading end, so that later writes fail.
  void closeReader() {
    if (ends_[0] >= 0) close(ends_[0]);
    ends_[0] = -1;
  }

  /// Makes writes fail instead of blocking when there is no room.
  void makeNonBlocking() { fcntl(ends_[1], F_SETFL, fcntl(ends_[1], F_GETFL) | O_NONBLOCK); }

  /// Waits until bytes have been written, then reads and returns up to `size` of them.
  std::string take(std::size_t size) {
    std::string bytes(size, '\0');
    const ssize_t count = read(ends_[0], bytes.data(), size);
    bytes.resize(count > 0 ? static_cast<std::size_t>(count) : 0);
    return bytes;
  }

  /// Ends the capture. Returns everything that was written and not yet taken.
  std::string text() {
    dup2(kept_, STDERR_FILENO);
    close(std::exchange(ends_[1], -1));
    std::string all;
    for (std::string more; !(more = take(4096)).empty();) all += more;
    return all;
  }

  /// Fills the pipe: writes until there is no room.
  void fill() {
    const int flags = fcntl(ends_[1], F_GETFL);
    makeNonBlocking();
    while (write(ends_[1], "xxxxxxxx", 8) > 0) {
    }
    fcntl(ends_[1], F_SETFL, flags);
  }

 private:
  int kept_;
  std::array<int, 2> ends_{-1, -1};
};
