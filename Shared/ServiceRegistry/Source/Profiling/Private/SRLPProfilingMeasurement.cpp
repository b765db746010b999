#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingMeasurement.h"

#include <atomic>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Base/Private/MonotonicClock.h"
#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Process/Thread.h"
#include "Shared/ServiceRegistry/Source/Private/SRLAPIIdentifier.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"

using namespace rt::literals;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingMeasurement";

// Never destroyed, unlike the stacks: threads that run on at exit may still use these two.
constinit rt::UnfairLock lock;
constinit bool areStacksThere RT_GUARDED_BY(lock) = false;

// The implementations whose instances each thread is making, the latest last. A thread that makes none has no
// stack.
struct Stacks {
  Stacks() noexcept {
    const rt::LockGuard guard(lock);
    areStacksThere = true;
  }
  Stacks(const Stacks&) = delete;
  Stacks& operator=(const Stacks&) = delete;
  // Releases the lock before `byThread` releases the implementations.
  ~Stacks() {
    const rt::LockGuard guard(lock);
    areStacksThere = false;
  }

  std::unordered_map<const void*, std::vector<rt::Ref<SRLImplementation>>> byThread;
};

// Constructed before load hooks run, which do so at priority 102.
[[gnu::init_priority(101)]] Stacks stacks RT_GUARDED_BY(lock);

// Returns what was on top of the thread's stack before. Null if there was nothing.
rt::Ref<SRLImplementation> push(const void* thread, const rt::Ref<SRLImplementation>& implementation) {
  const rt::LockGuard guard(lock);
  if (!areStacksThere) return nullptr;
  std::vector<rt::Ref<SRLImplementation>>& stack = stacks.byThread[thread];
  rt::Ref<SRLImplementation> parent = stack.empty() ? nullptr : stack.back();
  stack.push_back(implementation);
  return parent;
}

// Returns what was on top of the calling thread's stack, so that the caller releases it without the lock.
rt::Ref<SRLImplementation> pop() noexcept {
  const rt::LockGuard guard(lock);
  if (!areStacksThere) return nullptr;
  const auto found = stacks.byThread.find(rt::Thread::currentHandle());
  if (found == stacks.byThread.end()) return nullptr;
  std::vector<rt::Ref<SRLImplementation>>& stack = found->second;
  rt::Ref<SRLImplementation> top;
  // The stack is empty if `push` had no memory for its first element.
  if (!stack.empty()) {
    top = std::move(stack.back());
    stack.pop_back();
  }
  // Otherwise the map would grow with every new thread.
  if (stack.empty()) stacks.byThread.erase(found);
  return top;
}

struct PopAtEnd {
  PopAtEnd() = default;
  PopAtEnd(const PopAtEnd&) = delete;
  PopAtEnd& operator=(const PopAtEnd&) = delete;
  ~PopAtEnd() { pop(); }
};

rt::String descriptionOf(const rt::Ref<SRLImplementation>& implementation) {
  rt::String description = implementation ? implementation->description() : nullptr;
  if (description) return description;
  PECReport({kFile, "SRLPCaptureInjectionEnd"}, "SRL profiling: nil implDescription"_s);
  return "SRL profiling error placeholder key"_s;
}

// Describes the parent by its instance type alone, unlike the measured implementation.
rt::String descriptionOfParent(const rt::Ref<SRLImplementation>& parent) {
  return parent && parent->instanceType() ? parent->instanceType()->asObject()->description() : nullptr;
}

void reportUnknownLifetime() {
  static constinit std::atomic<bool> isReported{false};
  if (isReported.exchange(true, std::memory_order_relaxed)) return;
  PECReport({kFile, "SRLPCaptureInjectionEnd"},
            "Unknown lifetime of implementation in SRLProfilingMeasurement."_s);
}

}  // namespace

SRLPProfilingMeasurementPartial SRLPCaptureInjectionStart(const rt::Ref<SRLImplementation>& implementation) {
  SRLPProfilingMeasurementPartial partial{rt::MonotonicClock::nanoseconds(), rt::Thread::currentHandle(),
                                          nullptr};
  partial.parent = push(partial.callingThread, implementation);
  return partial;
}

// NOLINTNEXTLINE(performance-unnecessary-value-param): takes over the measurement that it ends
void SRLPCaptureInjectionEnd(SRLPProfilingMeasurementPartial partial, const SRLAPIRegistrationData* api,
                             const rt::Ref<SRLImplementation>& implementation) {
  const std::uint64_t duration = rt::MonotonicClock::nanoseconds() - partial.startTime;
  rt::String apiDescription;
  rt::String implDescription;
  {
    const PopAtEnd popAtEnd;
    apiDescription = SRLAPIIdentifier(api);
    implDescription = descriptionOf(implementation);
  }
  SRLProfilingStorage& storage = *SRLProfilingStorage::sharedInstance();
  switch (implementation ? implementation->lifetime() : 0) {
    case 0:
      storage.storeServiceInitializationEvent(SRLPServiceInitializationEvent::initWithAPIDescription(
          std::move(apiDescription), std::move(implDescription), partial.startTime, duration,
          partial.callingThread, descriptionOfParent(partial.parent)));
      break;
    case 1:
      storage.storeServiceInitializationNewInstanceEventWithAPIDescription(apiDescription, implDescription,
                                                                           duration);
      break;
    default:
      reportUnknownLifetime();
  }
}

void SRLPCaptureInjectionCancel() noexcept {
  pop();
}

std::size_t SRLPProfilingDetail::countOfStacks() noexcept {
  const rt::LockGuard guard(lock);
  return areStacksThere ? stacks.byThread.size() : 0;
}
