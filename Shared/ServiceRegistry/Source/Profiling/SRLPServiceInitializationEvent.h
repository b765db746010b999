#pragma once

/// An event of profiling: an instance that is shared in its scope was made.
///
///     SRLProfilingStorage::sharedInstance()->storeServiceInitializationEvent(
///         SRLPServiceInitializationEvent::initWithAPIDescription(
///             "Clock"_s, implementation->description(), start, duration, rt::Thread::currentHandle(),
///             nullptr));
///
/// An event is equal only to itself.
///
/// Threads: immutable; any thread may use it.
///
/// Not for: hosts. They use the protocol that it conforms to.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEventProtocol.h"

class RT_VISIBLE SRLPServiceInitializationEvent final
    : public rt::Implements<SRLPServiceInitializationEvent, rt::Object,
                            SRLPServiceInitializationEventProtocol> {
 public:
  /// Returns an event with these values. Each string may be null. Throws std::bad_alloc.
  static rt::Ref<SRLPServiceInitializationEvent> initWithAPIDescription(
      rt::String apiDescription, rt::String implDescription, std::uint64_t monotonicRawClockStartTime,
      std::uint64_t durationNs, const void* callingThread, rt::String parentImplDescription);

  const rt::String& apiDescription() const noexcept override { return apiDescription_; }
  const rt::String& implDescription() const noexcept override { return implDescription_; }
  std::uint64_t monotonicRawClockStartTime() const noexcept override { return monotonicRawClockStartTime_; }
  std::uint64_t durationNs() const noexcept override { return durationNs_; }
  const void* callingThread() const noexcept override { return callingThread_; }
  const rt::String& parentImplDescription() const noexcept override { return parentImplDescription_; }

  /// Returns "SRLPServiceInitializationEvent<ADDRESS, apiDescription: API, implDescription: IMPLEMENTATION,
  /// monotonicRawClockStartTime: 1, durationNs: 2, callingThread: HANDLE, parentImplDescription: (null)>".
  rt::String description() const override;

 private:
  SRLPServiceInitializationEvent(rt::String apiDescription, rt::String implDescription,
                                 std::uint64_t monotonicRawClockStartTime, std::uint64_t durationNs,
                                 const void* callingThread, rt::String parentImplDescription) noexcept
      : apiDescription_(std::move(apiDescription)),
        implDescription_(std::move(implDescription)),
        monotonicRawClockStartTime_(monotonicRawClockStartTime),
        durationNs_(durationNs),
        callingThread_(callingThread),
        parentImplDescription_(std::move(parentImplDescription)) {}

  const rt::String apiDescription_;
  const rt::String implDescription_;
  const std::uint64_t monotonicRawClockStartTime_;
  const std::uint64_t durationNs_;
  const void* const callingThread_;
  const rt::String parentImplDescription_;
};
