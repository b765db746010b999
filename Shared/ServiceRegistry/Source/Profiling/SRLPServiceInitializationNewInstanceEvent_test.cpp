// The statistics about an implementation that makes a new instance at every request.

#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEvent.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <initializer_list>
#include <limits>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

using namespace rt::literals;

namespace {

using rt::Ref;
using Event = SRLPServiceInitializationNewInstanceEvent;

constexpr std::uint64_t kGreatest = std::numeric_limits<std::uint64_t>::max();

void expect(const SRLPServiceInitializationNewInstanceEventProtocol& event, std::uint64_t count,
            std::uint64_t average, std::uint64_t maximum, std::uint64_t first) {
  EXPECT_EQ(event.initializationCount(), count);
  EXPECT_EQ(event.averageDurationNs(), average);
  EXPECT_EQ(event.maximumDurationNs(), maximum);
  EXPECT_EQ(event.firstDurationNs(), first);
}

Ref<Event> eventOf(std::uint64_t first, std::initializer_list<std::uint64_t> others = {}) {
  const Ref<Event> event = Event::initWithAPIDescription("Clock"_s, "SystemClock<...>"_s, first);
  for (const std::uint64_t duration : others) event->addInitializationWithDurationNs(duration);
  return event;
}

TEST(SRLPServiceInitializationNewInstanceEvent, StartsWithOneInstance) {
  const Ref<Event> event = eventOf(10);
  EXPECT_EQ(event->apiDescription(), "Clock");
  EXPECT_EQ(event->implDescription(), "SystemClock<...>");
  expect(*event, 1, 10, 10, 10);
  expect(*eventOf(0), 1, 0, 0, 0);
  expect(*eventOf(kGreatest), 1, kGreatest, kGreatest, kGreatest);
}

TEST(SRLPServiceInitializationNewInstanceEvent, ComputesCountAverageAndMaximum) {
  expect(*eventOf(10, {20}), 2, 15, 20, 10);
  expect(*eventOf(10, {20, 30}), 3, 20, 30, 10);
  expect(*eventOf(30, {20, 10}), 3, 20, 30, 30);
  expect(*eventOf(10, {10, 10, 10}), 4, 10, 10, 10);
  expect(*eventOf(0, {0}), 2, 0, 0, 0);
}

TEST(SRLPServiceInitializationNewInstanceEvent, DropsTheFractionOfTheAverageEachTime) {
  expect(*eventOf(10, {15}), 2, 12, 15, 10);      // of 12.5
  expect(*eventOf(10, {15, 14}), 3, 12, 15, 10);  // of 38 / 3, not of 39 / 3
  expect(*eventOf(0, {1}), 2, 0, 1, 0);           // of 0.5
  expect(*eventOf(0, {1, 2}), 3, 0, 2, 0);        // of 2 / 3, not of 3 / 3
}

TEST(SRLPServiceInitializationNewInstanceEvent, ComputesTheAverageInDoublePrecision) {
  constexpr std::uint64_t kLimit = std::uint64_t{1} << 53;  // beyond which not every integer is a double
  expect(*eventOf(kLimit, {kLimit}), 2, kLimit, kLimit, kLimit);
  // As doubles, these are rounded to an even last bit: 2^53 and 2^53 + 4.
  expect(*eventOf(kLimit + 1, {kLimit + 3}), 2, kLimit + 2, kLimit + 3, kLimit + 1);
  expect(*eventOf(kLimit + 1, {kLimit + 1}), 2, kLimit, kLimit + 1, kLimit + 1);
}

TEST(SRLPServiceInitializationNewInstanceEvent, IsDefinedForTheLargestDurations) {
  // As doubles, these are 2^64, which is out of range.
  expect(*eventOf(kGreatest, {kGreatest}), 2, kGreatest, kGreatest, kGreatest);
  expect(*eventOf(kGreatest, {kGreatest, kGreatest}), 3, kGreatest, kGreatest, kGreatest);
  // The largest double below 2^64 stays as it is.
  constexpr std::uint64_t kBelow = kGreatest - 2047;
  expect(*eventOf(kBelow, {kBelow}), 2, kBelow, kBelow, kBelow);
  expect(*eventOf(0, {kGreatest}), 2, std::uint64_t{1} << 63, kGreatest, 0);
  expect(*eventOf(kGreatest, {0}), 2, std::uint64_t{1} << 63, kGreatest, kGreatest);
}

TEST(SRLPServiceInitializationNewInstanceEvent, IsCopiedWithoutItsFirstDuration) {
  const Ref<Event> event = eventOf(10, {20, 30});
  const Ref<Event> copy = rt::copy(event);
  ASSERT_NE(copy, nullptr);
  EXPECT_NE(copy, event);
  EXPECT_EQ(copy->apiDescription(), "Clock");
  EXPECT_EQ(copy->implDescription(), "SystemClock<...>");
  expect(*copy, 3, 20, 30, 0);
  // Both change independently.
  event->addInitializationWithDurationNs(40);
  expect(*event, 4, 25, 40, 10);
  expect(*copy, 3, 20, 30, 0);
  copy->addInitializationWithDurationNs(20);
  expect(*copy, 4, 20, 30, 0);
  expect(*event, 4, 25, 40, 10);
}

TEST(SRLPServiceInitializationNewInstanceEvent, ConformsToItsProtocolAndEqualsOnlyItself) {
  const Ref<Event> event = eventOf(10);
  EXPECT_TRUE(event->conformsTo(rt::protocolInfo<SRLPServiceInitializationNewInstanceEventProtocol>()));
  EXPECT_TRUE(rt::isEqual(event, event));
  EXPECT_FALSE(rt::isEqual(event, eventOf(10)));
}

}  // namespace
