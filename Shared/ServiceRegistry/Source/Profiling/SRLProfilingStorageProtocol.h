#pragma once

/// Where what was measured of the making of services is kept.
///
///     const rt::Ref<SRLProfilingStorageProtocol> storage = SRLProfilingStorage::sharedInstance();
///     const rt::Ref<rt::Array> events = storage->serviceInitializationEvents();
///     for (const rt::Ref<rt::Object>& event : *events)
///       std::cout << event->description().view() << '\n';
///
/// Any thread may use it.
///
/// Not for: measuring (SRLPProfilingMeasurement.h).

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"

struct RT_VISIBLE SRLProfilingStorageProtocol : rt::Protocol<SRLProfilingStorageProtocol> {
  /// Keeps `event`; null is ignored. Throws std::bad_alloc; nothing is kept then.
  virtual void storeServiceInitializationEvent(const rt::Ref<SRLPServiceInitializationEvent>& event) = 0;

  /// Counts an instance, which took `durationNs`, for the implementation that is described so. Of the API's
  /// descriptions the first is kept, so that it is not known for which other APIs there were instances.
  /// Either string may be null. Throws std::bad_alloc; nothing is counted then.
  virtual void storeServiceInitializationNewInstanceEventWithAPIDescription(const rt::String& apiDescription,
                                                                            const rt::String& implDescription,
                                                                            std::uint64_t durationNs) = 0;

  /// The events, each an SRLPServiceInitializationEvent, sorted by SRLPSelectorSort with the receiver's start
  /// time, as a signed number, for the answer: those stored last come first, as long as no start time is 0
  /// or beyond 2^63. Throws std::bad_alloc.
  virtual rt::Ref<rt::Array> serviceInitializationEvents() const = 0;

  /// Copies of the counts, each an SRLPServiceInitializationNewInstanceEvent, in no particular order; the
  /// first duration of each is 0. Throws std::bad_alloc.
  virtual rt::Ref<rt::Array> serviceInitializationNewInstanceEvents() const = 0;

 protected:
  ~SRLProfilingStorageProtocol() = default;
};
