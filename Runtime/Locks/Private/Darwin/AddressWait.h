#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>

namespace rt::detail {

// Sleeps while `word` is `expected`, until the thread is woken. If `timeout` is not null, sleeps for no
// longer than that. May return for no reason, so read the word again. Preserves `errno`.
void waitAtAddress(const std::atomic<std::uint32_t>& word, std::uint32_t expected,
                   const std::chrono::nanoseconds* timeout = nullptr) noexcept;

// Wakes one thread that sleeps at `word`, if any. Does not read the word, which may be gone. Then at worst a
// thread that sleeps at the same address now is woken for no reason.
void wakeAtAddress(const std::atomic<std::uint32_t>* word) noexcept;

// Wakes all threads that sleep at `word`.
void wakeAllAtAddress(const std::atomic<std::uint32_t>* word) noexcept;

// Forgets the threads that sleep. For the child of a fork, before anything else there sleeps or wakes.
void forgetSleepersAfterFork() noexcept;

}  // namespace rt::detail
