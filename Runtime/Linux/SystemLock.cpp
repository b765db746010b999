#include "Runtime/Linux/SystemLock.h"

#include <cstdio>
#include <cstdlib>

#include "Runtime/AddressWait.h"

namespace rt::detail {

namespace {

// Each look at the lock while it is held takes its memory from the holder, so the looks become rarer; all
// of them together take about as long as a short critical section.
constexpr int kLongestPause = 16;

}  // namespace

void SystemLock::lockSlow(ThreadIdentifier self) noexcept {
  std::uint32_t state = state_.load(std::memory_order_relaxed);
  if (state != 0 && isOrWasCurrentThread(state & ~kHasWaiters)) {
    std::fprintf(stderr, "rt: the lock at %p is taken again by thread %u, which holds it\n",
                 static_cast<void*>(this), self);
    std::abort();
  }
  for (int pauses = 1; pauses <= kLongestPause; pauses *= 2) {
    if (state == 0 && take(self)) return;
    if ((state & kHasWaiters) != 0) break;  // Others have waited in vain.
    for (int i = 0; i < pauses; ++i) spinPause();
    state = state_.load(std::memory_order_relaxed);
  }
  // From here on the lock is taken with the bit set: others may still sleep, and who has taken the lock
  // must wake one of them when it lets it go.
  for (;;) {
    state = state_.load(std::memory_order_relaxed);
    if (state == 0) {
      if (state_.compare_exchange_weak(state, self | kHasWaiters, std::memory_order_acquire,
                                       std::memory_order_relaxed)) {
        return;
      }
    } else if ((state & kHasWaiters) != 0 ||
               state_.compare_exchange_weak(state, state | kHasWaiters, std::memory_order_relaxed)) {
      waitAtAddress(state_, state | kHasWaiters);
    }
  }
}

void SystemLock::wakeOne() noexcept {
  wakeAtAddress(&state_);
}

void SystemLock::checkOwner(const char* verb) const noexcept {
  const ThreadIdentifier owner = state_.load(std::memory_order_relaxed) & ~kHasWaiters;
  if (owner != 0 && isOrWasCurrentThread(owner)) return;
  const ThreadIdentifier self = currentThreadIdentifier();
  if (owner == 0) {
    std::fprintf(stderr, "rt: the lock at %p is %s by thread %u, but no thread holds it\n",
                 static_cast<const void*>(this), verb, self);
  } else {
    std::fprintf(stderr, "rt: the lock at %p is %s by thread %u, but thread %u holds it\n",
                 static_cast<const void*>(this), verb, self, owner);
  }
  std::abort();
}

}  // namespace rt::detail
