#include "Shared/Logging/LUMLogLimit.h"

#include "Runtime/Base/Private/MonotonicClock.h"

bool LUMLogLimit::allows() noexcept {
  if (!isDue()) {
    refused_.fetch_add(1, std::memory_order_relaxed);
    return false;
  }
  skipped_.store(refused_.exchange(0, std::memory_order_relaxed), std::memory_order_relaxed);
  return true;
}

bool LUMLogLimit::isDue() noexcept {
  switch (kind_) {
    case Kind::once:
      // Read first, so that the threads that come later do not write.
      return state_.load(std::memory_order_relaxed) == 0 &&
             state_.exchange(1, std::memory_order_relaxed) == 0;
    case Kind::everyNth:
      return state_.fetch_add(1, std::memory_order_relaxed) % amount_ == 0;
    case Kind::onePer: {
      const std::uint64_t now = rt::MonotonicClock::nanoseconds();
      std::uint64_t due = state_.load(std::memory_order_relaxed);
      // Of threads that come at the same time, one is allowed.
      return now >= due && state_.compare_exchange_strong(due, now + amount_, std::memory_order_relaxed);
    }
  }
  return true;
}
