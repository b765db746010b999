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
