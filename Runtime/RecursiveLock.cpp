#include "Runtime/RecursiveLock.h"

namespace rt {

bool RecursiveLock::isHeldByCaller() const noexcept {
  const ThreadIdentifier owner = owner_.load(std::memory_order_relaxed);
  return owner != 0 && isOrWasCurrentThread(owner);
}

// Not analysed: whether the inner lock is taken or only counted is known at run time.
void RecursiveLock::lock() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (!isHeldByCaller()) {
    lock_.lock();
    owner_.store(currentThreadIdentifier(), std::memory_order_relaxed);
  }
  ++depth_;
}

bool RecursiveLock::tryLock() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (!isHeldByCaller()) {
    if (!lock_.tryLock()) return false;
    owner_.store(currentThreadIdentifier(), std::memory_order_relaxed);
  }
  ++depth_;
  return true;
}

void RecursiveLock::unlock() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (isHeldByCaller()) {
    if (--depth_ != 0) return;
    owner_.store(0, std::memory_order_relaxed);
  }
  lock_.unlock();  // Ends the program when the caller does not hold it.
}

void RecursiveLock::assertOwner() const noexcept {
  lock_.assertOwner();
}

}  // namespace rt
