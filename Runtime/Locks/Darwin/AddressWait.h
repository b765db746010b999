#pragma once

#include <os/clock.h>
#include <os/os_sync_wait_on_address.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <cstdint>

namespace rt::detail {

// Sleeps while `word` is `expected`, until the thread is woken. If `timeout` is not null, sleeps for no
// longer than that. May return for no reason, so read the word again. Preserves `errno`.
inline void waitAtAddress(const std::atomic<std::uint32_t>& word, std::uint32_t expected,
                          const std::chrono::nanoseconds* timeout = nullptr) noexcept {
  const int error = errno;
  void* address = const_cast<std::atomic<std::uint32_t>*>(&word);
  if (timeout == nullptr) {
    os_sync_wait_on_address(address, expected, sizeof(word), OS_SYNC_WAIT_ON_ADDRESS_NONE);
  } else if (timeout->count() > 0) {
    os_sync_wait_on_address_with_timeout(address, expected, sizeof(word), OS_SYNC_WAIT_ON_ADDRESS_NONE,
                                         OS_CLOCK_MACH_ABSOLUTE_TIME,
                                         static_cast<std::uint64_t>(timeout->count()));
  }
  errno = error;
}

// Wakes one thread that sleeps at `word`, if any. Does not read the word, which may be gone. Then at worst a
// thread that sleeps at the same address now is woken for no reason.
inline void wakeAtAddress(const std::atomic<std::uint32_t>* word) noexcept {
  const int error = errno;
  os_sync_wake_by_address_any(const_cast<std::atomic<std::uint32_t>*>(word), sizeof(*word),
                              OS_SYNC_WAKE_BY_ADDRESS_NONE);
  errno = error;
}

// Wakes all threads that sleep at `word`.
inline void wakeAllAtAddress(const std::atomic<std::uint32_t>* word) noexcept {
  const int error = errno;
  os_sync_wake_by_address_all(const_cast<std::atomic<std::uint32_t>*>(word), sizeof(*word),
                              OS_SYNC_WAKE_BY_ADDRESS_NONE);
  errno = error;
}

}  // namespace rt::detail
