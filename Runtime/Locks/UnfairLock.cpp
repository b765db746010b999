#include "Runtime/Locks/UnfairLock.h"

namespace rt {

void UnfairLock::waitForFork() noexcept {
  lock_.unlock();
  detail::ForkGate::leave();
  detail::ForkGate::wait();
  detail::ForkGate::enter();
}

void UnfairLock::lockAfterFork() noexcept {
  do {
    waitForFork();
    lock_.lock();
  } while (detail::ForkGate::isShut());
}

bool UnfairLock::tryLockAfterFork() noexcept {
  do {
    waitForFork();
    if (!lock_.tryLock()) {
      detail::ForkGate::leave();
      return false;
    }
  } while (detail::ForkGate::isShut());
  return true;
}

}  // namespace rt
