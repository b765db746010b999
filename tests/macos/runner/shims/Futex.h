#pragma once

#include <linux/futex.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstdint>
#include <ctime>

/// Sleeps while `word` is `expected`, for no longer than `timeout` if that is not null. Returns what the
/// system call returns, with Linux's `errno`.
inline long futexWait(void* word, std::uint32_t expected, const timespec* timeout) {
  return syscall(SYS_futex, word, FUTEX_WAIT_PRIVATE, expected, timeout, nullptr, 0);
}

/// Wakes up to `count` threads that sleep at `word`. Returns how many.
inline long futexWake(void* word, int count) {
  return syscall(SYS_futex, word, FUTEX_WAKE_PRIVATE, count, nullptr, nullptr, 0);
}
