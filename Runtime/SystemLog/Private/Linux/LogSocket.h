#pragma once

// A datagram socket to the daemon that listens at a path. Inside of the system log.

#include <sys/socket.h>

#include <atomic>
#include <cstdint>

#include "Runtime/SystemLog/Private/Linux/Patience.h"

namespace rt::detail {

/// The socket is made by the first send and kept until the process ends, whatever becomes of the daemon:
/// connecting it anew is one call that exchanges nothing which another thread may be using. So nothing is
/// locked, and threads may send at once.
///
/// A program may close descriptors that it did not open, as daemons do when they start, and use the number
/// for something else. That is seen before each send, and what is there is left alone.
class LogSocket {
 public:
  enum class Outcome : std::uint8_t { sent, busy, tooLarge, absent };

  explicit constexpr LogSocket(const char* path) noexcept : path_(path) {}

  /// Sends `message`, which names no address, to the daemon, connecting to it where need be.
  Outcome send(const msghdr& message, const Patience& patience) noexcept;

 private:
  /// A descriptor and, above it, the inode number by which to know whether it is still the socket.
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
