#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEvent.h"

#include <algorithm>
#include <limits>

namespace {

// Returns `value`, which is not negative, without its fraction.
std::uint64_t truncated(double value) noexcept {
  // In double precision, the average of the longest durations is 2^64, which does not fit into the result.
  constexpr double kEnd = 0x1p64;
  return value < kEnd ? static_cast<std::uint64_t>(value) : std::numeric_limits<std::uint64_t>::max();
}

}  // namespace

rt::Ref<SRLPServiceInitializationNewInstanceEvent>
SRLPServiceInitializationNewInstanceEvent::initWithAPIDescription(rt::String apiDescription,
                                                                  rt::String implDescription,
                                                                  std::uint64_t durationNs) {
  return rt::Ref<SRLPServiceInitializationNewInstanceEvent>::adopt(
      new SRLPServiceInitializationNewInstanceEvent(std::move(apiDescription), std::move(implDescription),
                                                    durationNs));
}

void SRLPServiceInitializationNewInstanceEvent::addInitializationWithDurationNs(
    std::uint64_t durationNs) noexcept {
  const auto countBefore = static_cast<double>(initializationCount_);
  ++initializationCount_;
  const double weight = countBefore / static_cast<double>(initializationCount_);
  const double before = static_cast<double>(averageDurationNs_) * weight;
  const double added = static_cast<double>(durationNs) * (1 - weight);
  averageDurationNs_ = truncated(before + added);
  maximumDurationNs_ = std::max(maximumDurationNs_, durationNs);
}

rt::Ref<rt::Object> SRLPServiceInitializationNewInstanceEvent::copy() const {
  // A first duration of 0 tells readers that this is a copy.
  const auto copied = initWithAPIDescription(apiDescription_, implDescription_, 0);
  copied->initializationCount_ = initializationCount_;
  copied->averageDurationNs_ = averageDurationNs_;
  copied->maximumDurationNs_ = maximumDurationNs_;
  return copied;
}
