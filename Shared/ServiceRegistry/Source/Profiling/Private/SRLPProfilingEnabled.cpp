#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingEnabled.h"

#include "Runtime/Locks/Private/Lazy.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"

constinit std::atomic<bool> SRLPProfilingDetail::isOff{false};

bool SRLPProfilingDetail::isOn() {
  static constinit rt::Lazy<bool> answer;
  return answer.get([] {
    const bool isSwitchedOn = SRLPProfilingSwitch();
    isOff.store(!isSwitchedOn, std::memory_order_relaxed);
    return isSwitchedOn;
  });
}
