#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"

#include "Runtime/Text/Format.h"

using namespace rt::literals;

rt::Ref<SRLPServiceInitializationEvent> SRLPServiceInitializationEvent::initWithAPIDescription(
    rt::String apiDescription, rt::String implDescription, std::uint64_t monotonicRawClockStartTime,
    std::uint64_t durationNs, const void* callingThread, rt::String parentImplDescription) {
  return rt::Ref<SRLPServiceInitializationEvent>::adopt(new SRLPServiceInitializationEvent(
      std::move(apiDescription), std::move(implDescription), monotonicRawClockStartTime, durationNs,
      callingThread, std::move(parentImplDescription)));
}

rt::String SRLPServiceInitializationEvent::description() const {
  return rt::format(
      "%@<%p, apiDescription: %@, implDescription: %@, monotonicRawClockStartTime: %llu, durationNs: %llu, "
      "callingThread: %p, parentImplDescription: %@>"_s,
      rt::String::overStatic(classInfo().name), static_cast<const void*>(this), apiDescription_,
      implDescription_, static_cast<unsigned long long>(monotonicRawClockStartTime_),
      static_cast<unsigned long long>(durationNs_), callingThread_, parentImplDescription_);
}
