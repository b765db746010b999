#include "Runtime/Queues/Private/WorkerPriority.h"

#include <sys/resource.h>
#include <unistd.h>

namespace rt::detail {

// Counted from the main thread, since the thread that created this one may be nicer than the process.
bool takeWorkerPriority(bool isForUtility) noexcept {
  constexpr int kNicenessOfUtility = 5;
  const int ofProcess = getpriority(PRIO_PROCESS, static_cast<id_t>(getpid()));
  return setpriority(PRIO_PROCESS, 0, ofProcess + (isForUtility ? kNicenessOfUtility : 0)) == 0;
}

}  // namespace rt::detail
