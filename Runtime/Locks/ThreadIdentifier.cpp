#include "Runtime/Locks/ThreadIdentifier.h"

#include "Runtime/Locks/ForkGate.h"

namespace rt {

namespace detail {

constinit thread_local ThreadState currentThread;

ThreadToken learnThreadToken() noexcept {
  ThreadState& self = currentThread;
  const ThreadIdentifier identifier = systemThreadIdentifier();
  self.isMain = systemIsMainThread();
  self.token = ForkGate::tokenOf(systemThreadNumber());
  // Kept only if the fork handlers can renew it in a child. Otherwise the next call asks the system again.
  if (ForkGate::registerHandlers()) self.identifier = identifier;
  return self.token;
}

ThreadIdentifier learnThreadIdentifier() noexcept {
  currentThreadToken();
  const ThreadIdentifier known = currentThread.identifier;
  return known != 0 ? known : systemThreadIdentifier();
}

}  // namespace detail

bool isThreadGone(ThreadToken token) noexcept {
  return detail::ForkGate::isGone(token);
}

}  // namespace rt
