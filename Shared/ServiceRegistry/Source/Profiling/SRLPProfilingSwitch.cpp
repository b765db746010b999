#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"

// Weak, so that a program may define it, too.
[[gnu::weak]] bool SRLPProfilingSwitch() {
  return MOUNT_POINT_PROFILING != 0;
}
