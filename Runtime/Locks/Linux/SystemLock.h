#pragma once

// On Linux, `rt::UnfairLock` is an `OwnerLock` that is counted for forks.

#include "Runtime/Locks/OwnerLock.h"

namespace rt::detail {

class SystemLock : public OwnerLock {
 public:
  // Whether the child of a fork can take a lock that another thread held.
  static constexpr bool kIsTakenOver = true;

  [[gnu::always_inline]] void lock() noexcept { OwnerLock::lock(true); }
};

}  // namespace rt::detail
