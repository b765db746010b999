#pragma once

/// How often an implementation made an instance of which every request makes one, and how long that took.
///
///     void print(const SRLPServiceInitializationNewInstanceEventProtocol& event) {
///       std::cout << event.implDescription().view() << ": " << event.initializationCount() << " of "
///                 << event.averageDurationNs() << " ns\n";
///     }
///
/// Not for: instances that are shared in their scope (SRLPServiceInitializationEventProtocol).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"

struct RT_VISIBLE SRLPServiceInitializationNewInstanceEventProtocol
    : rt::Protocol<SRLPServiceInitializationNewInstanceEventProtocol> {
  /// The identifier of the API for which the first instance was made; repaired where it is not UTF-8.
  virtual const rt::String& apiDescription() const = 0;
  /// The implementation, described in full.
  virtual const rt::String& implDescription() const = 0;
  /// How many instances were made; never 0.
  virtual std::uint64_t initializationCount() const = 0;
  /// How long they took on average. What is behind the point is dropped each time that one is added.
  virtual std::uint64_t averageDurationNs() const = 0;
  /// How long the longest took.
  virtual std::uint64_t maximumDurationNs() const = 0;
  /// How long the first took; 0 in a copy.
  virtual std::uint64_t firstDurationNs() const = 0;

 protected:
  ~SRLPServiceInitializationNewInstanceEventProtocol() = default;
};
