#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"

// Weak, so that a program can define its own.
[[gnu::weak]] bool SRLPProfilingSwitch() {
  return MOUNT_POINT_PROFILING != 0;
}
