#pragma once

// What `rt::UnfairLock` is on Linux.

#include "Runtime/Locks/Private/OwnerLock.h"

namespace rt::detail {

class SystemLock : public OwnerLock {
 public:
  /// Whether one that another thread held can be had in the child of a fork.
  static constexpr bool kIsTakenOver = true;

  [[gnu::always_inline]] void lock() noexcept { OwnerLock::lock(true); }
};

}  // namespace rt::detail
