#include "Runtime/Locks/OwnerLock.h"

#include <cstdio>
#include <cstdlib>

#include "Runtime/Locks/AddressWait.h"
#include "Runtime/Locks/ForkGate.h"

namespace rt::detail {

namespace {

// Each look at a held lock takes its cache line from the holder, so the looks become rarer. All of them
// together take about as long as a short critical section.
constexpr int kLongestPause = 16;

}  // namespace

void OwnerLock::lockSlow(ThreadToken self, bool isCounted) noexcept {
  std::uint32_t state = state_.load(std::memory_order_relaxed);
  if ((state & ~kHasWaiters) == self) {
    std::fprintf(stderr, "rt: the lock at %p is taken again by thread %u, which holds it\n",
                 static_cast<void*>(this), currentThreadIdentifier());
    std::abort();
  }
  for (int pauses = 1; pauses <= kLongestPause; pauses *= 2) {
    if (state == 0 && take(self)) return;
    if ((state & kHasWaiters) != 0) break;  // Others have spun in vain.
    for (int i = 0; i < pauses; ++i) spinPause();
    state = state_.load(std::memory_order_relaxed);
  }
  // A fork need not wait for a thread that sleeps and holds no lock.
  const bool isUncountedAsleep = isCounted && ForkGate::heldLocks() == 1;
  // From here on the lock is taken with the bit kHasWaiters set. Other threads may still sleep, and the new
  // holder must wake one of them when it releases the lock.
  for (;;) {
    state = state_.load(std::memory_order_relaxed);
    if (state == 0 || isAbandoned(state)) {
      if (state_.compare_exchange_weak(state, self | kHasWaiters, std::memory_order_acq_rel,
                                       std::memory_order_relaxed)) {
        return;
      }
    } else if ((state & kHasWaiters) != 0 ||
               state_.compare_exchange_weak(state, state | kHasWaiters, std::memory_order_relaxed)) {
      if (isUncountedAsleep) ForkGate::leave();
      waitAtAddress(state_, state | kHasWaiters);
      if (isUncountedAsleep) ForkGate::enter();
    }
  }
}

bool OwnerLock::takeOver(ThreadToken self) noexcept {
  std::uint32_t state = state_.load(std::memory_order_relaxed);
  return isAbandoned(state) &&
         state_.compare_exchange_strong(state, self | (state & kHasWaiters), std::memory_order_acq_rel,
                                        std::memory_order_relaxed);
}

void OwnerLock::wakeOne() noexcept {
  wakeAtAddress(&state_);
}

void OwnerLock::failOwner(const char* verb) const noexcept {
  const ThreadToken owner = state_.load(std::memory_order_relaxed) & ~kHasWaiters;
  const ThreadIdentifier self = currentThreadIdentifier();
  if (owner == 0) {
    std::fprintf(stderr, "rt: the lock at %p is %s by thread %u, but no thread holds it\n",
                 static_cast<const void*>(this), verb, self);
  } else {
    std::fprintf(stderr, "rt: the lock at %p is %s by thread %u, but thread %u holds it\n",
                 static_cast<const void*>(this), verb, self, ForkGate::numberOf(owner));
  }
  std::abort();
}

}  // namespace rt::detail
