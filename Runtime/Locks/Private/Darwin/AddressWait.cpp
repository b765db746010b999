// The system's own functions that sleep at an address exist since macOS 14.4 only. So the sleeping threads
// are in a table, by the address that they sleep at. A thread enters itself and reads the word under the
// table's mutex. A thread that wakes others has changed the word before it takes that mutex. So either the
// first thread sees the new value, or the second one finds it in the table.

#include "Runtime/Locks/Private/AddressWait.h"

#include <pthread.h>

#include <array>
#include <bit>
#include <cerrno>
#include <cstddef>
#include <new>

namespace rt::detail {

namespace {

// A thread that sleeps. It is in that thread's stack frame.
struct Sleeper {
  const void* address;
  Sleeper* next = nullptr;
  bool isWoken = false;
  pthread_cond_t wake = PTHREAD_COND_INITIALIZER;
};

// The threads that sleep at some of all addresses, in the order in which they went to sleep.
struct Sleepers {
  // Removes and wakes the first thread that sleeps at `address`. Returns whether there was one.
  bool wakeFirst(const void* address) noexcept {
    for (Sleeper** place = &first; *place != nullptr; place = &(*place)->next) {
      Sleeper& sleeper = **place;
      if (sleeper.address != address) continue;
      *place = sleeper.next;
      sleeper.isWoken = true;
      pthread_cond_signal(&sleeper.wake);
      return true;
    }
    return false;
  }

  void append(Sleeper& sleeper) noexcept {
    Sleeper** place = &first;
    while (*place != nullptr) place = &(*place)->next;
    *place = &sleeper;
  }

  void remove(const Sleeper& sleeper) noexcept {
    Sleeper** place = &first;
    while (*place != &sleeper) place = &(*place)->next;
    *place = sleeper.next;
  }

  pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
  Sleeper* first = nullptr;
};

constexpr std::size_t kTableBits = 6;
constinit std::array<Sleepers, 1U << kTableBits> table;

// Holds the mutex of the threads that sleep at `address`. Keeps `errno`.
class Locked {
 public:
  explicit Locked(const void* address) noexcept
      // The multiplier spreads addresses that differ in any of their bits over the upper bits of the product.
      : sleepers_(table[std::bit_cast<std::uintptr_t>(address) * 0x9E3779B97F4A7C15U >> (64U - kTableBits)]) {
    pthread_mutex_lock(&sleepers_.mutex);
  }
  Locked(const Locked&) = delete;
  Locked& operator=(const Locked&) = delete;
  ~Locked() {
    pthread_mutex_unlock(&sleepers_.mutex);
    errno = error_;
  }

  Sleepers* operator->() const noexcept { return &sleepers_; }

 private:
  int error_ = errno;
  Sleepers& sleepers_;
};

}  // namespace

void waitAtAddress(const std::atomic<std::uint32_t>& word, std::uint32_t expected,
                   const std::chrono::nanoseconds* timeout) noexcept {
  const Locked sleepers(&word);
  if (word.load(std::memory_order_relaxed) != expected) return;
  Sleeper self{.address = &word};
  sleepers->append(self);
  if (timeout == nullptr) {
    pthread_cond_wait(&self.wake, &sleepers->mutex);
  } else if (timeout->count() > 0) {
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(*timeout);
    const timespec relative{.tv_sec = seconds.count(), .tv_nsec = (*timeout - seconds).count()};
    pthread_cond_timedwait_relative_np(&self.wake, &sleepers->mutex, &relative);
  }
  if (!self.isWoken) sleepers->remove(self);
  pthread_cond_destroy(&self.wake);
}

void wakeAtAddress(const std::atomic<std::uint32_t>* word) noexcept {
  Locked(word)->wakeFirst(word);
}

void wakeAllAtAddress(const std::atomic<std::uint32_t>* word) noexcept {
  const Locked sleepers(word);
  while (sleepers->wakeFirst(word)) {
  }
}

void forgetSleepersAfterFork() noexcept {
  for (Sleepers& each : table) new (&each) Sleepers;
}

}  // namespace rt::detail
