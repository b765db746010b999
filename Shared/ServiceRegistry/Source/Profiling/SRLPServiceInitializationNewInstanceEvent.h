#pragma once

/// The statistics of profiling about an implementation that makes a new instance at every request.
///
///     auto event = SRLPServiceInitializationNewInstanceEvent::initWithAPIDescription("Clock"_s, text, 10);
///     event->addInitializationWithDurationNs(15);
///     event->averageDurationNs();                        // 12
///
/// An event is equal only to itself.
///
/// Threads: not thread-safe. Threads that share one must hold a lock, as SRLProfilingStorage does.
///
/// Not for: hosts. They use the protocol that it conforms to.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEventProtocol.h"

class RT_VISIBLE SRLPServiceInitializationNewInstanceEvent final
    : public rt::Implements<SRLPServiceInitializationNewInstanceEvent, rt::Object,
                            SRLPServiceInitializationNewInstanceEventProtocol> {
 public:
  /// Returns an event for one instance, which took `durationNs` to make. Either string may be null. Throws
  /// std::bad_alloc.
  static rt::Ref<SRLPServiceInitializationNewInstanceEvent> initWithAPIDescription(rt::String apiDescription,
                                                                                   rt::String implDescription,
                                                                                   std::uint64_t durationNs);

  /// Counts another instance, which took `durationNs` to make. Computes the average in double precision. It
  /// is at most 2^64 - 1.
  void addInitializationWithDurationNs(std::uint64_t durationNs) noexcept;

  const rt::String& apiDescription() const noexcept override { return apiDescription_; }
  const rt::String& implDescription() const noexcept override { return implDescription_; }
  std::uint64_t initializationCount() const noexcept override { return initializationCount_; }
  std::uint64_t averageDurationNs() const noexcept override { return averageDurationNs_; }
  std::uint64_t maximumDurationNs() const noexcept override { return maximumDurationNs_; }
  std::uint64_t firstDurationNs() const noexcept override { return firstDurationNs_; }

  /// Returns a new event with the same values, but with a `firstDurationNs` of 0. Throws std::bad_alloc.
  rt::Ref<rt::Object> copy() const override;

 private:
  SRLPServiceInitializationNewInstanceEvent(rt::String apiDescription, rt::String implDescription,
                                            std::uint64_t durationNs) noexcept
      : apiDescription_(std::move(apiDescription)),
        implDescription_(std::move(implDescription)),
        averageDurationNs_(durationNs),
        maximumDurationNs_(durationNs),
        firstDurationNs_(durationNs) {}

  const rt::String apiDescription_;
  const rt::String implDescription_;
  std::uint64_t initializationCount_ = 1;
  std::uint64_t averageDurationNs_;
  std::uint64_t maximumDurationNs_;
  const std::uint64_t firstDurationNs_;
};
