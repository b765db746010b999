#pragma once

/// Stores the results of profiling.
///
///     const rt::Ref<SRLProfilingStorageProtocol> storage = SRLProfilingStorage::sharedInstance();
///     const rt::Ref<rt::Array> events = storage->serviceInitializationEvents();
///     for (const rt::Ref<rt::Object>& event : *events)
///       std::cout << event->description().view() << '\n';
///
/// Threads: any thread may use it.
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
  /// Stores `event`. Ignores null. Throws std::bad_alloc. Nothing is stored then.
  virtual void storeServiceInitializationEvent(const rt::Ref<SRLPServiceInitializationEvent>& event) = 0;

  /// Counts an instance, which took `durationNs` to make, in the statistics of the implementation with this
  /// description. These keep the API's description from the first call only. Either string may be null.
  /// Throws std::bad_alloc. Nothing is counted then.
  virtual void storeServiceInitializationNewInstanceEventWithAPIDescription(const rt::String& apiDescription,
                                                                            const rt::String& implDescription,
                                                                            std::uint64_t durationNs) = 0;

  /// Returns the events, each an SRLPServiceInitializationEvent. SRLPSelectorSort has sorted them, with the
  /// receiver's start time as the answer, read as a signed number. So the events are in reverse order of
  /// storing, unless a start time is 0, or 2^63 or more. Throws std::bad_alloc.
  virtual rt::Ref<rt::Array> serviceInitializationEvents() const = 0;

  /// Returns copies of the statistics, each an SRLPServiceInitializationNewInstanceEvent, in no particular
  /// order. The first duration of a copy is 0. Throws std::bad_alloc.
  virtual rt::Ref<rt::Array> serviceInitializationNewInstanceEvents() const = 0;

 protected:
  ~SRLProfilingStorageProtocol() = default;
};
