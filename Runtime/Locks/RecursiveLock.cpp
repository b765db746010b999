#include "Runtime/Locks/RecursiveLock.h"

namespace rt {

// Each new holder sets the depth to 1. A holder that a fork has left behind leaves its own depth in the
// child.

// Not analysed, since it is known only at run time whether the inner lock is taken or counted.
void RecursiveLock::lock() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (lock_.isHeldByCaller()) {
    ++depth_;
  } else {
    lock_.lock();
    depth_ = 1;
  }
}

bool RecursiveLock::tryLock() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (lock_.isHeldByCaller()) {
    ++depth_;
    return true;
  }
  if (!lock_.tryLock()) return false;
  depth_ = 1;
  return true;
}

void RecursiveLock::unlock() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (lock_.isHeldByCaller() && --depth_ != 0) return;
  lock_.unlock();  // Ends the program if the caller does not hold it.
}

void RecursiveLock::assertOwner() const noexcept {
  lock_.assertOwner();
}

}  // namespace rt
