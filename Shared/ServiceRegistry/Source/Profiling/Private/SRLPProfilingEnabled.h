#pragma once

/// Whether the making of services is measured.
///
///     if (SRLPProfilingEnabled()) partial = SRLPCaptureInjectionStart(implementation);
///
/// What SRLPProfilingSwitch answered the first time; never changes afterwards. Where profiling is off, asking
/// costs one branch that always goes the same way.
///
/// Not for: turning profiling on, which a build does (SRLPProfilingSwitch.h).

#include <atomic>

namespace SRLPProfilingDetail {

/// Whether it is known that profiling is off.
extern constinit std::atomic<bool> isOff;

/// Asks the switch, the first time.
bool isOn();

}  // namespace SRLPProfilingDetail

/// Whether profiling is on. Any thread may ask. Throws what a program's own switch throws; the next call
/// asks it again then.
inline bool SRLPProfilingEnabled() {
  // Nothing else is read on the strength of it.
  if (SRLPProfilingDetail::isOff.load(std::memory_order_relaxed)) [[likely]]
    return false;
  return SRLPProfilingDetail::isOn();
}
