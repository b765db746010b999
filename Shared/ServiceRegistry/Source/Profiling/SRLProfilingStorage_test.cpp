// The storage returns what was stored, in the order of the sort, for any threads.

#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

using namespace rt::literals;

namespace {

using rt::Ref;
using testing::ElementsAre;
using NewInstanceEvent = SRLPServiceInitializationNewInstanceEvent;

Ref<SRLPServiceInitializationEvent> eventAt(std::uint64_t startTime) {
  return SRLPServiceInitializationEvent::initWithAPIDescription("Clock"_s, "SystemClock"_s, startTime, 1,
                                                                nullptr, nullptr);
}

// Returns the start times of the events, in the order in which the storage returns these.
std::vector<std::uint64_t> startTimes(const SRLProfilingStorage& storage) {
  std::vector<std::uint64_t> times;
  const Ref<rt::Array> events = storage.serviceInitializationEvents();
  for (const Ref<rt::Object>& event : *events)
    times.push_back(rt::cast<SRLPServiceInitializationEventProtocol>(event)->monotonicRawClockStartTime());
  return times;
}

std::vector<std::uint64_t> startTimesOf(const std::vector<std::uint64_t>& stored) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  for (const std::uint64_t time : stored) storage->storeServiceInitializationEvent(eventAt(time));
  return startTimes(*storage);
}

// Returns the statistics of an implementation. Null if there are none.
Ref<NewInstanceEvent> eventOf(const SRLProfilingStorage& storage, const rt::String& implDescription) {
  Ref<NewInstanceEvent> result;
  const Ref<rt::Array> events = storage.serviceInitializationNewInstanceEvents();
  for (const Ref<rt::Object>& object : *events) {
    Ref<NewInstanceEvent> event = rt::cast<NewInstanceEvent>(object);
    if (event->implDescription() != implDescription) continue;
    EXPECT_EQ(result, nullptr);
    result = std::move(event);
  }
  return result;
}

TEST(SRLProfilingStorage, IsEmptyAtFirst) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  EXPECT_TRUE(storage->serviceInitializationEvents()->isEmpty());
  EXPECT_TRUE(storage->serviceInitializationNewInstanceEvents()->isEmpty());
  EXPECT_TRUE(storage->conformsTo(rt::protocolInfo<SRLProfilingStorageProtocol>()));
}

TEST(SRLProfilingStorage, SharesOneInstanceAmongThreads) {
  const Ref<SRLProfilingStorage> shared = SRLProfilingStorage::sharedInstance();
  ASSERT_NE(shared, nullptr);
  Ref<SRLProfilingStorage> ofAnotherThread;
  std::thread([&] { ofAnotherThread = SRLProfilingStorage::sharedInstance(); }).join();
  EXPECT_EQ(ofAnotherThread, shared);
  EXPECT_NE(SRLProfilingStorage::init(), shared);
}

TEST(SRLProfilingStorage, StoresTheEventsThemselves) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  const Ref<SRLPServiceInitializationEvent> event = eventAt(1);
  storage->storeServiceInitializationEvent(event);
  storage->storeServiceInitializationEvent(nullptr);
  const Ref<rt::Array> events = storage->serviceInitializationEvents();
  ASSERT_EQ(events->count(), 1U);
  EXPECT_EQ(events->at(0), event.get());
  EXPECT_TRUE(storage->serviceInitializationNewInstanceEvents()->isEmpty());
}

TEST(SRLProfilingStorage, ReturnsTheLastStoredEventFirst) {
  EXPECT_THAT(startTimesOf({1, 2}), ElementsAre(2, 1));
  EXPECT_THAT(startTimesOf({10, 20, 30, 40, 50}), ElementsAre(50, 40, 30, 20, 10));
  // This is so for any start times, since they are not compared.
  EXPECT_THAT(startTimesOf({30, 10, 20}), ElementsAre(20, 10, 30));
}

TEST(SRLProfilingStorage, SortsByStartTimesAsSignedAnswers) {
  constexpr std::uint64_t kNegative = std::uint64_t{1} << 63;
  EXPECT_THAT(startTimesOf({0, 5}), ElementsAre(0, 5));
  EXPECT_THAT(startTimesOf({5, 0}), ElementsAre(0, 5));
  EXPECT_THAT(startTimesOf({kNegative, 5}), ElementsAre(kNegative, 5));
  EXPECT_THAT(startTimesOf({kNegative - 1, 5}), ElementsAre(5, kNegative - 1));
}

TEST(SRLProfilingStorage, ReturnsASnapshot) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  storage->storeServiceInitializationEvent(eventAt(1));
  const Ref<rt::Array> before = storage->serviceInitializationEvents();
  storage->storeServiceInitializationEvent(eventAt(2));
  storage->storeServiceInitializationEvent(eventAt(3));
  EXPECT_EQ(before->count(), 1U);
  // Sorting does not change the order in which the events are stored.
  EXPECT_THAT(startTimes(*storage), ElementsAre(3, 2, 1));
  EXPECT_THAT(startTimes(*storage), ElementsAre(3, 2, 1));
}

TEST(SRLProfilingStorage, CountsInstancesByImplementation) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  for (const std::uint64_t duration : {10U, 20U, 30U})
    storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "SystemClock"_s,
                                                                          duration);
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "TestClock"_s, 10);
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "TestClock"_s, 15);
  EXPECT_EQ(storage->serviceInitializationNewInstanceEvents()->count(), 2U);
  EXPECT_TRUE(storage->serviceInitializationEvents()->isEmpty());

  const Ref<NewInstanceEvent> system = eventOf(*storage, "SystemClock"_s);
  ASSERT_NE(system, nullptr);
  EXPECT_EQ(system->initializationCount(), 3U);
  EXPECT_EQ(system->averageDurationNs(), 20U);
  EXPECT_EQ(system->maximumDurationNs(), 30U);
  const Ref<NewInstanceEvent> test = eventOf(*storage, "TestClock"_s);
  ASSERT_NE(test, nullptr);
  EXPECT_EQ(test->initializationCount(), 2U);
  EXPECT_EQ(test->averageDurationNs(), 12U);
  EXPECT_EQ(test->maximumDurationNs(), 15U);
}

TEST(SRLProfilingStorage, KeepsTheDescriptionOfTheFirstAPI) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "SystemClock"_s, 10);
  // An equal string stands for the same implementation.
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription(
      "Timer"_s, rt::String::fromUTF8(std::string("SystemClock")), 20);
  const Ref<NewInstanceEvent> event = eventOf(*storage, "SystemClock"_s);
  ASSERT_NE(event, nullptr);
  EXPECT_EQ(event->apiDescription(), "Clock");
  EXPECT_EQ(event->initializationCount(), 2U);
}

TEST(SRLProfilingStorage, TellsANullDescriptionFromAnEmptyOne) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription(nullptr, nullptr, 1);
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription(nullptr, ""_s, 2);
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription(nullptr, nullptr, 3);
  EXPECT_EQ(storage->serviceInitializationNewInstanceEvents()->count(), 2U);
  EXPECT_EQ(eventOf(*storage, nullptr)->maximumDurationNs(), 3U);
  EXPECT_EQ(eventOf(*storage, ""_s)->maximumDurationNs(), 2U);
}

TEST(SRLProfilingStorage, ReturnsCopiesOfTheStatistics) {
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "SystemClock"_s, 10);
  const Ref<NewInstanceEvent> event = eventOf(*storage, "SystemClock"_s);
  ASSERT_NE(event, nullptr);
  EXPECT_EQ(event->firstDurationNs(), 0U);
  storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "SystemClock"_s, 20);
  EXPECT_EQ(event->initializationCount(), 1U);
  event->addInitializationWithDurationNs(1000);
  EXPECT_EQ(eventOf(*storage, "SystemClock"_s)->maximumDurationNs(), 20U);
}

TEST(SRLProfilingStorage, IsThreadSafe) {
  constexpr std::uint64_t kThreads = 8;
  constexpr std::uint64_t kRounds = 200;
  const Ref<SRLProfilingStorage> storage = SRLProfilingStorage::init();
  std::vector<std::thread> threads;
  for (std::uint64_t i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      for (std::uint64_t round = 0; round < kRounds; ++round) {
        storage->storeServiceInitializationEvent(eventAt(1));
        storage->storeServiceInitializationNewInstanceEventWithAPIDescription("Clock"_s, "SystemClock"_s, 10);
        if (round % 20 != 0) continue;
        EXPECT_FALSE(storage->serviceInitializationEvents()->isEmpty());
        EXPECT_EQ(storage->serviceInitializationNewInstanceEvents()->count(), 1U);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();

  EXPECT_EQ(storage->serviceInitializationEvents()->count(), kThreads * kRounds);
  const Ref<NewInstanceEvent> event = eventOf(*storage, "SystemClock"_s);
  ASSERT_NE(event, nullptr);
  EXPECT_EQ(event->initializationCount(), kThreads * kRounds);
  EXPECT_EQ(event->maximumDurationNs(), 10U);
}

}  // namespace
