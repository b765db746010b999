#pragma once

/// Tells whether the making of services is measured.
///
///     if (SRLPProfilingEnabled()) partial = SRLPCaptureInjectionStart(implementation);
///
/// The answer is what SRLPProfilingSwitch returned the first time. It never changes afterwards. If profiling
/// is off, a call costs one branch that always goes the same way.
///
/// Not for: turning profiling on. The build or the program does that (SRLPProfilingSwitch.h).

#include <atomic>

namespace SRLPProfilingDetail {

// True once profiling is known to be off.
extern constinit std::atomic<bool> isOff;

// Returns whether profiling is on. Calls the switch the first time.
bool isOn();

}  // namespace SRLPProfilingDetail

/// Returns whether profiling is on. Any thread may call this.
/// Errors: throws what a program's own switch throws. The next call then calls the switch again.
inline bool SRLPProfilingEnabled() {
  // Relaxed, since the flag guards no other data.
  if (SRLPProfilingDetail::isOff.load(std::memory_order_relaxed)) [[likely]]
    return false;
  return SRLPProfilingDetail::isOn();
}
