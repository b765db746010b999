#pragma once

/// Measures the making of services: how long each takes, and which other one needs it.
///
///     const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
///     bool instanceCreated = false;
///     const rt::Ref<rt::Object> instance = implementation->factoryBlock()(tags, &instanceCreated);
///     if (instanceCreated) {
///       SRLPCaptureInjectionEnd(partial, &clockAPI, implementation);
///     } else {
///       SRLPCaptureInjectionCancel();
///     }
///
/// Each thread has a stack of what it is making, so that each start is followed, on its thread, by one end or
/// one cancel, also where the factory throws. One too many does no harm. The stacks hold their
/// implementations; no lock is held when one is given up or described.
///
/// The stacks are there before any load hook runs, and until static objects have been destroyed at exit
/// (on macOS possibly not before the hooks run). Whoever starts or ends outside of that time, as threads do
/// that go on while the program exits, is measured without a parent.
///
/// Not for: hosts. The registry measures, where SRLPProfilingEnabled; the results are in SRLProfilingStorage.

#include <cstddef>
#include <cstdint>

#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

/// A measurement that has begun.
struct SRLPProfilingMeasurementPartial {
  /// By the clock of Runtime/Base/Private/MonotonicClock.h.
  std::uint64_t startTime = 0;
  /// The handle of the thread that began it (Runtime/Process/Thread.h).
  const void* callingThread = nullptr;
  /// What that thread was making then; null where it was making nothing.
  rt::Ref<SRLImplementation> parent;
};

/// Begins to measure what `implementation` makes, on the calling thread. Throws std::bad_alloc; nothing has
/// begun then.
SRLPProfilingMeasurementPartial SRLPCaptureInjectionStart(const rt::Ref<SRLImplementation>& implementation);

/// Ends the latest measurement on the calling thread, and stores it in SRLProfilingStorage, as begun in
/// `partial` for the API at `api`, which is not null: as an event of its own where `implementation` makes
/// one instance for each scope, in the counts for the implementation where it makes a new one at every
/// request. Another lifetime is reported, once in a process, and nothing is stored. An implementation
/// without description, which is null itself, is reported, too, stored under another text, and counts as
/// one of the first kind.
///
/// Throws what a description and the error callback throw, and std::bad_alloc; nothing is stored then, but
/// the measurement has ended.
void SRLPCaptureInjectionEnd(SRLPProfilingMeasurementPartial partial, const SRLAPIRegistrationData* api,
                             const rt::Ref<SRLImplementation>& implementation);

/// Ends the latest measurement on the calling thread, and forgets it.
void SRLPCaptureInjectionCancel() noexcept;

namespace SRLPProfilingDetail {

/// How many threads are making something that is measured; for tests.
std::size_t countOfStacks() noexcept;

}  // namespace SRLPProfilingDetail
