// Reports are made under the registry's lock, and the error handler's lock is held while a callback runs. A
// callback that waited for the registry, or for an instance whose factory is about to report, could deadlock.
// Both end the program instead.
//
// A thread counts the locks that it holds, for forks. So a test can show that none is held while factories,
// destructors and the delegate run. Tags are hashed and compared under the registry's lock.

#include "Shared/ServiceRegistry/Source/SRLUnfairLock.h"

#include <cstdio>
#include <cstdlib>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"

void SRLUnfairLock::lockHeld() noexcept RT_NO_THREAD_SAFETY_ANALYSIS {
  if (PECErrorHandler::isCallingBack()) {
    std::fprintf(
        stderr,
        "SRLRegistry: an error callback asks a registry whose lock at %p is held; callbacks must not\n",
        static_cast<const void*>(this));
    std::abort();
  }
  unfair_lock_.lock();
}
