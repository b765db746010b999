#include "Runtime/ForkSafeLock.h"

#include <pthread.h>

#include <new>

#include "Runtime/ThreadIdentifier.h"

namespace rt {

namespace {

// Taken before the locks in the list.
constinit UnfairLock listLock;
constinit ForkSafeLock* first RT_GUARDED_BY(listLock) = nullptr;
}  // namespace

// Set while the program is loaded: a fork that has begun would not know of handlers that are set meanwhile,
// and the first lock that is taken might then be held by another thread.
const bool ForkSafeLock::hasForkHandlers_ = [] {
  currentThreadIdentifier();  // Its handler comes first, so that ours knows the thread.
  return pthread_atfork(lockAll, unlockAll, unlockAllInChild) == 0;
}();

void ForkSafeLock::addToList() noexcept {
  const LockGuard guard(listLock);
  if (isListed_.load(std::memory_order_relaxed)) return;
  next_ = first;
  first = this;
  isListed_.store(true, std::memory_order_release);
}

// These three are not analysed: the locks are as many as there are, and taken and let go in different places.
void ForkSafeLock::lockAll() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  listLock.lock();
  for (ForkSafeLock* each = first; each != nullptr; each = each->next_) each->lock_.lock();
}

void ForkSafeLock::unlockAll() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  for (ForkSafeLock* each = first; each != nullptr; each = each->next_) each->lock_.unlock();
  listLock.unlock();
}

// Made anew, as not every system lets a child unlock what was locked before the fork.
void ForkSafeLock::unlockAllInChild() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  for (ForkSafeLock* each = first; each != nullptr; each = each->next_) new (&each->lock_) UnfairLock;
  new (&listLock) UnfairLock;
}

}  // namespace rt
