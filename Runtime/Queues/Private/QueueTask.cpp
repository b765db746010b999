#include "Runtime/Queues/Private/QueueTask.h"

#include "Runtime/Locks/Private/AddressWait.h"

namespace rt::detail {

// As long as a few small tasks take. After that, sleeping is cheaper.
constexpr int kSpins = 20;

void SyncTask::run() {
  const TaskContext::Scope scope(context_);
  try {
    function_();
  } catch (...) {
    exception_ = std::current_exception();
  }
  wake(kDone);
}

void SyncTask::wake(State state) noexcept {
  // The waiting thread's frame may not exist any more once the state is stored.
  if (state_.exchange(state, std::memory_order_acq_rel) == kAsleep) wakeAtAddress(&state_);
}

SyncTask::Outcome SyncTask::wait() {
  std::uint32_t state = kWaiting;
  for (int spin = 0; spin < kSpins && state == kWaiting; ++spin) {
    spinPause();
    state = state_.load(std::memory_order_acquire);
  }
  if (state == kWaiting && state_.compare_exchange_strong(state, kAsleep, std::memory_order_acquire)) {
    do {
      waitAtAddress(state_, kAsleep);
      state = state_.load(std::memory_order_acquire);
    } while (state == kAsleep);
  }
  if (state == kTurn) return Outcome::kIsTurn;
  if (exception_) std::rethrow_exception(std::move(exception_));
  return Outcome::kRan;
}

}  // namespace rt::detail
