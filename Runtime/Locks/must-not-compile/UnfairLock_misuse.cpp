// Misuse of a lock that the analysis sees within one function. Other misuse ends the program at run time.

#include "Runtime/Locks/UnfairLock.h"

namespace {

rt::UnfairLock lock;

}  // namespace

void takeAndLetGo() {
  lock.lock();
#ifdef TAKEN_AGAIN
  lock.lock();
#endif
#ifndef NEVER_LET_GO
  lock.unlock();
#endif
#ifdef LET_GO_TWICE
  lock.unlock();
#endif
}
