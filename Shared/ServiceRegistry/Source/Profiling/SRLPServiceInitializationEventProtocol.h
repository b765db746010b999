#pragma once

/// The making of an instance that is shared in its scope: what, when, for how long, on which thread, and for
/// whom.
///
///     void print(const SRLPServiceInitializationEventProtocol& event) {
///       std::cout << event.implDescription().view() << ": " << event.durationNs() << " ns\n";
///     }
///
/// Immutable: any thread may ask.
///
/// Not for: instances of which every request makes one (SRLPServiceInitializationNewInstanceEventProtocol).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE SRLPServiceInitializationEventProtocol
    : rt::Protocol<SRLPServiceInitializationEventProtocol> {
  /// The API's identifier; repaired where it is not UTF-8.
  virtual const rt::String& apiDescription() const = 0;
  /// The implementation, described in full.
  virtual const rt::String& implDescription() const = 0;
  /// When the making began, by the clock of Runtime/Base/Private/MonotonicClock.h.
  virtual std::uint64_t monotonicRawClockStartTime() const = 0;
  /// How long it took, with what was made meanwhile.
  virtual std::uint64_t durationNs() const = 0;
  /// The handle of the thread on which it began. That thread may have ended, and another may have the same
  /// handle since.
  virtual const void* callingThread() const = 0;
  /// What the implementation makes that needed this one, described by its type only; null where none did.
  virtual const rt::String& parentImplDescription() const = 0;

 protected:
  ~SRLPServiceInitializationEventProtocol() = default;
};
