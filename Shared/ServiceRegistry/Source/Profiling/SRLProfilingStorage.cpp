#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"

#include <utility>

#include "Runtime/Locks/Private/Lazy.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPSelectorSort.h"

namespace {

template <class T>
rt::Ref<rt::Array> arrayOf(const std::vector<rt::Ref<T>>& list) {
  return rt::make<rt::Array>(std::vector<rt::Ref<rt::Object>>(list.begin(), list.end()));
}

}  // namespace

const rt::Ref<SRLProfilingStorage>& SRLProfilingStorage::sharedInstance() {
  static constinit rt::Lazy<rt::Ref<SRLProfilingStorage>> instance;
  return instance.get(init);
}

rt::Ref<SRLProfilingStorage> SRLProfilingStorage::init() {
  return rt::Ref<SRLProfilingStorage>::adopt(new SRLProfilingStorage());
}

void SRLProfilingStorage::storeServiceInitializationEvent(
    const rt::Ref<SRLPServiceInitializationEvent>& event) {
  if (!event) return;
  const rt::LockGuard guard(eventsLock_);
  events_.push_back(event);
}

void SRLProfilingStorage::storeServiceInitializationNewInstanceEventWithAPIDescription(
    const rt::String& apiDescription, const rt::String& implDescription, std::uint64_t durationNs) {
  const rt::LockGuard guard(implDescriptionToNewInstanceEventLock_);
  const auto found = implDescriptionToNewInstanceEvent_.find(implDescription);
  if (found != implDescriptionToNewInstanceEvent_.end()) {
    found->second->addInitializationWithDurationNs(durationNs);
  } else {
    implDescriptionToNewInstanceEvent_.emplace(
        implDescription, SRLPServiceInitializationNewInstanceEvent::initWithAPIDescription(
                             apiDescription, implDescription, durationNs));
  }
}

rt::Ref<rt::Array> SRLProfilingStorage::serviceInitializationEvents() const {
  std::vector<rt::Ref<SRLPServiceInitializationEvent>> events;
  {
    const rt::LockGuard guard(eventsLock_);
    events = events_;
  }
  // The answer is the receiver's start time and not a comparison, since readers rely on the resulting order.
  using Event = rt::Ref<SRLPServiceInitializationEvent>;
  return arrayOf(SRLPSelectorSort(std::move(events), [](const Event& receiver, const Event& /*argument*/) {
    return static_cast<std::int64_t>(receiver->monotonicRawClockStartTime());
  }));
}

rt::Ref<rt::Array> SRLProfilingStorage::serviceInitializationNewInstanceEvents() const {
  std::vector<rt::Ref<SRLPServiceInitializationNewInstanceEvent>> events;
  {
    const rt::LockGuard guard(implDescriptionToNewInstanceEventLock_);
    events.reserve(implDescriptionToNewInstanceEvent_.size());
    for (const auto& [implDescription, event] : implDescriptionToNewInstanceEvent_)
      events.push_back(rt::copy(event));
  }
  return arrayOf(events);
}
