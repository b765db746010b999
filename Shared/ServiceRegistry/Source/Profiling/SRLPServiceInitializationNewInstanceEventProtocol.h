#pragma once

/// The statistics of profiling about an implementation that makes a new instance at every request: how many
/// it made, and how long that took.
///
///     void print(const SRLPServiceInitializationNewInstanceEventProtocol& event) {
///       std::cout << event.implDescription().view() << ": " << event.initializationCount() << " of "
///                 << event.averageDurationNs() << " ns\n";
///     }
///
/// Not for: instances that are shared in a scope (SRLPServiceInitializationEventProtocol).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE SRLPServiceInitializationNewInstanceEventProtocol
    : rt::Protocol<SRLPServiceInitializationNewInstanceEventProtocol> {
  /// The identifier of the API for which the first instance was made. Invalid UTF-8 in it is repaired.
  virtual const rt::String& apiDescription() const = 0;
  /// The implementation's `description`.
  virtual const rt::String& implDescription() const = 0;
  /// The number of instances that were made. Never 0.
  virtual std::uint64_t initializationCount() const = 0;
  /// How long an instance took on average. The fraction is dropped each time that an instance is added.
  virtual std::uint64_t averageDurationNs() const = 0;
  /// How long the slowest instance took.
  virtual std::uint64_t maximumDurationNs() const = 0;
  /// How long the first instance took. 0 in a copy.
  virtual std::uint64_t firstDurationNs() const = 0;

 protected:
  ~SRLPServiceInitializationNewInstanceEventProtocol() = default;
};
