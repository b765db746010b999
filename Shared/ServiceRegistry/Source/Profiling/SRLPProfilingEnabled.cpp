#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingEnabled.h"

#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"

constinit std::atomic<bool> SRLPProfilingDetail::isOff{false};

bool SRLPProfilingDetail::isOn() {
  static const bool answer = [] {
    const bool isSwitchedOn = SRLPProfilingSwitch();
    isOff.store(!isSwitchedOn, std::memory_order_relaxed);
    return isSwitchedOn;
  }();
  return answer;
}
