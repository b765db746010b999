// The event for an instance that is shared in its scope.

#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <limits>
#include <string>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

using namespace rt::literals;

namespace {

using rt::Ref;

constexpr std::uint64_t kGreatest = std::numeric_limits<std::uint64_t>::max();

std::string hexadecimal(const void* pointer) {
  char text[32];
  std::snprintf(text, sizeof text, "%p", pointer);
  return text;
}

TEST(SRLPServiceInitializationEvent, ReturnsWhatItWasMadeWith) {
  const int thread = 0;
  const Ref<SRLPServiceInitializationEvent> event = SRLPServiceInitializationEvent::initWithAPIDescription(
      "Clock"_s, "SystemClock<...>"_s, 1, kGreatest, &thread, "Alarm"_s);
  const SRLPServiceInitializationEventProtocol& asked = *event;
  EXPECT_EQ(asked.apiDescription(), "Clock");
  EXPECT_EQ(asked.implDescription(), "SystemClock<...>");
  EXPECT_EQ(asked.monotonicRawClockStartTime(), 1U);
  EXPECT_EQ(asked.durationNs(), kGreatest);
  EXPECT_EQ(asked.callingThread(), &thread);
  EXPECT_EQ(asked.parentImplDescription(), "Alarm");
}

TEST(SRLPServiceInitializationEvent, DescribesItselfWithAllItsValues) {
  const int thread = 0;
  const Ref<SRLPServiceInitializationEvent> event = SRLPServiceInitializationEvent::initWithAPIDescription(
      "Clock"_s, "SystemClock<...>"_s, kGreatest, 20, &thread, "Alarm"_s);
  EXPECT_EQ(event->description(),
            "SRLPServiceInitializationEvent<" + hexadecimal(event.get()) +
                ", apiDescription: Clock, implDescription: SystemClock<...>, monotonicRawClockStartTime: "
                "18446744073709551615, durationNs: 20, callingThread: " +
                hexadecimal(&thread) + ", parentImplDescription: Alarm>");
}

TEST(SRLPServiceInitializationEvent, AcceptsNullStrings) {
  const Ref<SRLPServiceInitializationEvent> event =
      SRLPServiceInitializationEvent::initWithAPIDescription(nullptr, nullptr, 0, 0, nullptr, nullptr);
  EXPECT_TRUE(event->apiDescription().isNull());
  EXPECT_TRUE(event->implDescription().isNull());
  EXPECT_TRUE(event->parentImplDescription().isNull());
  EXPECT_EQ(event->description(),
            "SRLPServiceInitializationEvent<" + hexadecimal(event.get()) +
                ", apiDescription: (null), implDescription: (null), monotonicRawClockStartTime: 0, "
                "durationNs: 0, callingThread: " +
                hexadecimal(nullptr) + ", parentImplDescription: (null)>");
}

TEST(SRLPServiceInitializationEvent, ConformsToItsProtocolAndEqualsOnlyItself) {
  const auto make = [] {
    return SRLPServiceInitializationEvent::initWithAPIDescription("Clock"_s, "SystemClock"_s, 1, 2, nullptr,
                                                                  nullptr);
  };
  const Ref<SRLPServiceInitializationEvent> event = make();
  EXPECT_TRUE(event->conformsTo(rt::protocolInfo<SRLPServiceInitializationEventProtocol>()));
  EXPECT_TRUE(rt::isEqual(event, event));
  EXPECT_FALSE(rt::isEqual(event, make()));
  EXPECT_EQ(rt::copy(event), event);
}

}  // namespace
