#pragma once

// A datagram socket to the daemon that listens at a path. Internal to the system log.

#include <sys/socket.h>

#include <atomic>
#include <cstdint>

#include "Runtime/SystemLog/Linux/Patience.h"

namespace rt::detail {

/// The first send creates the socket, and the process keeps it. If the daemon restarts, one system call
/// connects the same descriptor again, while other threads may be using it.
///
/// A program may close descriptors that it did not open, as daemons do when they start. The number may then
/// belong to another file. Each send checks that first, and leaves such a file alone.
///
/// Threads: thread-safe and lock-free.
class LogSocket {
 public:
  enum class Outcome : std::uint8_t { sent, busy, tooLarge, absent };

  explicit constexpr LogSocket(const char* path) noexcept : path_(path) {}

  /// Sends `message` to the daemon, and connects to it first if necessary. Precondition: `message` has no
  /// address.
  Outcome send(const msghdr& message, const Patience& patience) noexcept;

 private:
  // A descriptor, and in the upper half the inode number, which tells whether the descriptor still is the
  // socket.
  using Handle = std::uint64_t;
  static constexpr Handle kNone = ~Handle{0};

  static int descriptorOf(Handle handle) noexcept { return static_cast<int>(handle & 0xFFFFFFFFU); }
  static Handle handleOf(int descriptor) noexcept;

  Handle open() noexcept;
  bool connect(int descriptor) const noexcept;

  const char* path_;
  std::atomic<Handle> handle_{kNone};
};

}  // namespace rt::detail
