#pragma once

#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <climits>
#include <cstdint>
#include <ctime>

namespace rt::detail {

// Sleeps while `word` is `expected`, until the thread is woken. If `timeout` is not null, sleeps for no
// longer than that. May return for no reason, so read the word again. Preserves `errno`.
inline void waitAtAddress(const std::atomic<std::uint32_t>& word, std::uint32_t expected,
                          const std::chrono::nanoseconds* timeout = nullptr) noexcept {
  const int error = errno;
  if (timeout == nullptr) {
    syscall(SYS_futex, &word, FUTEX_WAIT_PRIVATE, expected, nullptr, nullptr, 0);
  } else {
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(*timeout);
    const timespec relative{.tv_sec = seconds.count(), .tv_nsec = (*timeout - seconds).count()};
    syscall(SYS_futex, &word, FUTEX_WAIT_PRIVATE, expected, &relative, nullptr, 0);
  }
  errno = error;
}

// Wakes one thread that sleeps at `word`, if any. Does not read the word, which may be gone. Then at worst a
// thread that sleeps at the same address now is woken for no reason.
inline void wakeAtAddress(const std::atomic<std::uint32_t>* word) noexcept {
  syscall(SYS_futex, word, FUTEX_WAKE_PRIVATE, 1, nullptr, nullptr, 0);
}

// Wakes all threads that sleep at `word`.
inline void wakeAllAtAddress(const std::atomic<std::uint32_t>* word) noexcept {
  syscall(SYS_futex, word, FUTEX_WAKE_PRIVATE, INT_MAX, nullptr, nullptr, 0);
}

// Forgets the threads that sleep. For the child of a fork, before anything else there sleeps or wakes. The
// kernel has done it.
inline void forgetSleepersAfterFork() noexcept {}

}  // namespace rt::detail
