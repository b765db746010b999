#pragma once

// Sleeping until a word changes, within this process.

#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <ctime>

namespace rt::detail {

/// Sleeps while `word` is `expected`, until it is woken or `timeout` (relative; null for none) is over.
/// May return for no reason: look at the word again. Leaves `errno` alone.
inline void futexWait(const std::atomic<std::uint32_t>& word, std::uint32_t expected,
                      const timespec* timeout = nullptr) noexcept {
  const int error = errno;
  syscall(SYS_futex, &word, FUTEX_WAIT_PRIVATE, expected, timeout, nullptr, 0);
  errno = error;
}

/// Wakes at most `count` threads that sleep at `word`. The word is not looked at and may be gone: then
/// whoever uses its place now is at worst woken for no reason.
inline void futexWake(const std::atomic<std::uint32_t>* word, int count) noexcept {
  syscall(SYS_futex, word, FUTEX_WAKE_PRIVATE, count, nullptr, nullptr, 0);
}

}  // namespace rt::detail
