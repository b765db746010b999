#pragma once

/// Measures how long each service takes to be made, and which other service needed it.
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
/// Each thread has a stack of the implementations whose instances it is making. One end or one cancel must
/// follow each start on the same thread, also if the factory throws. One too many of them does no harm.
///
/// Ownership: the stacks retain their implementations. No lock is held while one is released or described.
///
/// The stacks exist before any load hook runs, and until static objects are destroyed at exit. On macOS they
/// may not exist yet when the hooks run. Starts and ends are safe at other times too, for example on a thread
/// that runs on while the program exits. A measurement that starts at such a time has no parent.
///
/// Not for: hosts. The registry measures if SRLPProfilingEnabled returns true. SRLProfilingStorage holds the
/// results.

#include <cstddef>
#include <cstdint>

#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

/// A measurement that has begun.
struct SRLPProfilingMeasurementPartial {
  /// When it began, in nanoseconds by the clock of Runtime/Base/Private/MonotonicClock.h.
  std::uint64_t startTime = 0;
  /// The handle of the thread that began it (Runtime/Process/Thread.h).
  const void* callingThread = nullptr;
  /// The implementation whose instance that thread was making then. Null if there was none.
  rt::Ref<SRLImplementation> parent;
};

/// Starts to measure, on the calling thread, the making of an instance of `implementation`.
/// Errors: throws std::bad_alloc. The measurement has not started then.
SRLPProfilingMeasurementPartial SRLPCaptureInjectionStart(const rt::Ref<SRLImplementation>& implementation);

/// Ends the latest measurement on the calling thread and stores it in SRLProfilingStorage. `partial` is what
/// the start returned. `api`, not null, is the API for which the instance was made. How the measurement is
/// stored depends on the lifetime of `implementation`:
///
/// - 0, one instance per scope: as an event of its own.
/// - 1, a new instance at every request: in the statistics of the implementation.
/// - Another value: not at all. The first time in a process, this is reported.
///
/// A null `implementation` is reported, described by a placeholder, and counts as one with the lifetime 0.
///
/// Errors: throws what a description and the error callback throw, and std::bad_alloc. The measurement has
/// ended then, but nothing is stored.
void SRLPCaptureInjectionEnd(SRLPProfilingMeasurementPartial partial, const SRLAPIRegistrationData* api,
                             const rt::Ref<SRLImplementation>& implementation);

/// Ends the latest measurement on the calling thread and discards it.
void SRLPCaptureInjectionCancel() noexcept;

namespace SRLPProfilingDetail {

// Returns how many threads have a measurement under way. For tests.
std::size_t countOfStacks() noexcept;

}  // namespace SRLPProfilingDetail
