#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <string>
#include <utility>

/// What the process writes to standard error while this lives: into a pipe, or a pair of sockets, of which
/// the test has the reading end.
///
///     StandardErrorPipe standardError;
///     ... fail ...
///     EXPECT_EQ(standardError.text(), "it failed\n");
///
/// They nest.
class StandardErrorPipe {
 public:
  enum class Kind : std::uint8_t { pipe, socket };

  explicit StandardErrorPipe(Kind kind = Kind::pipe) : kept_(fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3)) {
    EXPECT_EQ(kind == Kind::pipe ? pipe2(ends_.data(), O_CLOEXEC)
                                 : socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends_.data()),
              0);
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

  /// Leaves what is written without a reader.
  void closeReader() {
    if (ends_[0] >= 0) close(ends_[0]);
    ends_[0] = -1;
  }

  /// Lets nothing that writes wait for room.
  void makeNonBlocking() { fcntl(ends_[1], F_SETFL, fcntl(ends_[1], F_GETFL) | O_NONBLOCK); }

  /// Up to `size` bytes of what was written, as soon as there are any.
  std::string take(std::size_t size) {
    std::string bytes(size, '\0');
    const ssize_t count = read(ends_[0], bytes.data(), size);
    bytes.resize(count > 0 ? static_cast<std::size_t>(count) : 0);
    return bytes;
  }

  /// Everything that was written and not taken; nothing is captured any more.
  std::string text() {
    dup2(kept_, STDERR_FILENO);
    close(std::exchange(ends_[1], -1));
    std::string all;
    for (std::string more; !(more = take(4096)).empty();) all += more;
    return all;
  }

  /// Writes until no more is taken.
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
