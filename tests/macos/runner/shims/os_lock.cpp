// A lock is the port of its owner, or 0. The upper bit says that a thread sleeps. Misuse ends the program,
// with a trap and no word on standard error, as on macOS.

#include <atomic>

#include "tests/macos/runner/Shims.h"
#include "tests/macos/runner/shims/Futex.h"
#include "tests/macos/runner/shims/Threads.h"

namespace {

constexpr std::uint32_t kSleepers = 0x80000000;

using Word = std::atomic_ref<std::uint32_t>;

std::uint32_t self() {
  return ownThreadPort() & ~kSleepers;
}

[[noreturn]] void trap() {
  __builtin_trap();
}

void lockSlowly(std::uint32_t* lock) {
  const Word word(*lock);
  for (;;) {
    std::uint32_t value = word.load(std::memory_order_relaxed);
    if ((value & ~kSleepers) == self()) trap();
    if (value == 0) {
      // Other threads may still sleep, so this thread has to wake one of them later.
      if (word.compare_exchange_weak(value, self() | kSleepers, std::memory_order_acquire)) return;
    } else if ((value & kSleepers) != 0 ||
               word.compare_exchange_weak(value, value | kSleepers, std::memory_order_relaxed)) {
      futexWait(lock, value | kSleepers, nullptr);
    }
  }
}

bool tryLock(std::uint32_t* lock) {
  std::uint32_t expected = 0;
  return Word(*lock).compare_exchange_strong(expected, self(), std::memory_order_acquire);
}

void lock(std::uint32_t* lock) {
  const int error = errno;
  if (!tryLock(lock)) lockSlowly(lock);
  errno = error;
}

void assertOwner(std::uint32_t* lock) {
  if ((Word(*lock).load(std::memory_order_relaxed) & ~kSleepers) != self()) trap();
}

void unlock(std::uint32_t* lock) {
  assertOwner(lock);
  if ((Word(*lock).exchange(0, std::memory_order_release) & kSleepers) != 0) futexWake(lock, 1);
}

}  // namespace

shims::Table shims::osLock() {
  static const Shim table[] = {
      shim("os_unfair_lock_lock", &lock),
      shim("os_unfair_lock_trylock", &tryLock),
      shim("os_unfair_lock_unlock", &unlock),
      shim("os_unfair_lock_assert_owner", &assertOwner),
  };
  return table;
}
