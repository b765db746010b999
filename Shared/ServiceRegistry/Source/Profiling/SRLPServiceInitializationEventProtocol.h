#pragma once

/// An event of profiling: an instance that is shared in its scope was made. It says what was made, when, how
/// long that took, on which thread, and what needed it.
///
///     void print(const SRLPServiceInitializationEventProtocol& event) {
///       std::cout << event.implDescription().view() << ": " << event.durationNs() << " ns\n";
///     }
///
/// Threads: immutable; any thread may use it.
///
/// Not for: implementations that make a new instance at every request
/// (SRLPServiceInitializationNewInstanceEventProtocol).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE SRLPServiceInitializationEventProtocol
    : rt::Protocol<SRLPServiceInitializationEventProtocol> {
  /// The API's identifier. Invalid UTF-8 in it is repaired.
  virtual const rt::String& apiDescription() const = 0;
  /// The implementation's `description`.
  virtual const rt::String& implDescription() const = 0;
  /// When the making began, in nanoseconds of CLOCK_MONOTONIC_RAW.
  virtual std::uint64_t monotonicRawClockStartTime() const = 0;
  /// How long the making took, including other instances that were made for it.
  virtual std::uint64_t durationNs() const = 0;
  /// The handle of the thread on which the making began. After that thread ends, another one may get the same
  /// handle.
  virtual const void* callingThread() const = 0;
  /// The instance type of the implementation that needed this instance. Null if none did, or if it has no
  /// instance type.
  virtual const rt::String& parentImplDescription() const = 0;

 protected:
  ~SRLPServiceInitializationEventProtocol() = default;
};
