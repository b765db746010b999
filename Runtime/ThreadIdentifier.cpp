#include "Runtime/ThreadIdentifier.h"

#include <pthread.h>

#include <atomic>
#include <cstdint>

namespace rt::detail {

constinit thread_local ThreadIdentity currentThread;

namespace {

void refreshAfterFork() noexcept {
  if (currentThread.identifier == 0) return;
  currentThread.identifierBeforeFork = currentThread.identifier;
  currentThread.identifier = 0;  // The next call learns it.
}

/// Whether a child of a fork will ask anew.
bool hasForkHandler() noexcept {
  enum State : std::uint8_t { kNone, kRegistering, kRegistered };
  static constinit std::atomic<State> state = kNone;
  State expected = kNone;
  if (state.compare_exchange_strong(expected, kRegistering)) {
    const bool isRegistered = pthread_atfork(nullptr, nullptr, refreshAfterFork) == 0;
    state = isRegistered ? kRegistered : kNone;
    return isRegistered;
  }
  return expected == kRegistered;
}

}  // namespace

ThreadIdentifier learnThreadIdentity() noexcept {
  const ThreadIdentifier identifier = systemThreadIdentifier();
  currentThread.isMain = systemIsMainThread();
  // Kept only where it cannot go stale; the next call asks the system again otherwise.
  if (hasForkHandler()) currentThread.identifier = identifier;
  return identifier;
}

}  // namespace rt::detail
