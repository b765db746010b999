// Measuring: what is recorded, which parent each measurement has, and what is reported. No lock is held while
// other code runs.

#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingMeasurement.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <barrier>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <functional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Base/Private/MonotonicClock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/Weak.h"
#include "Runtime/Process/Thread.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"
#include "tests/support/SRLPProfilingTest.h"
#include "tests/support/TestReports.h"

namespace {

using rt::Ref;
using SRLPProfilingDetail::countOfStacks;
using testing::ElementsAre;
using testing::IsEmpty;
using Event = SRLPServiceInitializationEvent;
using NewInstanceEvent = SRLPServiceInitializationNewInstanceEvent;

constexpr const char* kUnknownLifetime = "Unknown lifetime of implementation in SRLProfilingMeasurement.";

TEST(SRLPCaptureInjectionStart, ReturnsTimeThreadAndParent) {
  const Ref<SRLImplementation> outer = makesClocks();
  const Ref<SRLImplementation> inner = makesCalendars();
  const std::uint64_t before = rt::MonotonicClock::nanoseconds();
  const SRLPProfilingMeasurementPartial first = SRLPCaptureInjectionStart(outer);
  const std::uint64_t after = rt::MonotonicClock::nanoseconds();
  EXPECT_GE(first.startTime, before);
  EXPECT_LE(first.startTime, after);
  EXPECT_EQ(first.callingThread, rt::Thread::currentHandle());
  EXPECT_EQ(first.parent, nullptr);

  const SRLPProfilingMeasurementPartial second = SRLPCaptureInjectionStart(inner);
  EXPECT_GE(second.startTime, after);
  EXPECT_EQ(second.parent, outer);
  EXPECT_EQ(SRLPCaptureInjectionStart(outer).parent, inner);
  for (int i = 0; i < 3; ++i) SRLPCaptureInjectionCancel();
  EXPECT_EQ(SRLPCaptureInjectionStart(inner).parent, nullptr);
  SRLPCaptureInjectionCancel();
}

TEST(SRLPCaptureInjectionStart, RetainsTheImplementationUntilTheEnd) {
  Ref<SRLImplementation> implementation = makesClocks();
  const rt::Weak<SRLImplementation> known = implementation;
  SRLPCaptureInjectionStart(implementation);
  implementation = nullptr;
  EXPECT_NE(known.lock(), nullptr);
  SRLPCaptureInjectionCancel();
  EXPECT_EQ(known.lock(), nullptr);
}

TEST(SRLPCaptureInjectionEnd, RecordsAnEventForASharedInstance) {
  const SRLAPIRegistrationData api = apiNamed("a shared instance");
  const Ref<SRLImplementation> implementation = makesClocks();
  const std::uint64_t beforeStart = rt::MonotonicClock::nanoseconds();
  const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
  const std::uint64_t afterStart = rt::MonotonicClock::nanoseconds();
  const std::uint64_t beforeEnd = rt::MonotonicClock::nanoseconds();
  SRLPCaptureInjectionEnd(partial, &api, implementation);
  const std::uint64_t afterEnd = rt::MonotonicClock::nanoseconds();

  const std::vector<Ref<Event>> events = eventsFor(api);
  ASSERT_EQ(events.size(), 1U);
  EXPECT_EQ(events[0]->implDescription(), implementation->description());
  EXPECT_EQ(events[0]->monotonicRawClockStartTime(), partial.startTime);
  EXPECT_GE(events[0]->durationNs(), beforeEnd - afterStart);
  EXPECT_LE(events[0]->durationNs(), afterEnd - beforeStart);
  EXPECT_EQ(events[0]->callingThread(), rt::Thread::currentHandle());
  EXPECT_TRUE(events[0]->parentImplDescription().isNull());
  EXPECT_THAT(countsFor(api), IsEmpty());
  EXPECT_EQ(countOfStacks(), 0U);
}

TEST(SRLPCaptureInjectionEnd, CountsNewInstancesByImplementation) {
  const SRLAPIRegistrationData api = apiNamed("new instances");
  const Ref<SRLImplementation> implementation = makesNewClocks("NewClock");
  const Ref<SRLImplementation> other = makesNewClocks("OtherNewClock");
  const std::uint64_t before = rt::MonotonicClock::nanoseconds();
  for (int i = 0; i < 3; ++i)
    SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(implementation), &api, implementation);
  SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(other), &api, other);
  const std::uint64_t after = rt::MonotonicClock::nanoseconds();

  EXPECT_THAT(eventsFor(api), IsEmpty());
  const std::vector<Ref<NewInstanceEvent>> counts = countsFor(api);
  ASSERT_EQ(counts.size(), 2U);
  for (const Ref<NewInstanceEvent>& event : counts) {
    const bool isOther = event->implDescription() == other->description();
    EXPECT_EQ(event->implDescription(), (isOther ? other : implementation)->description());
    EXPECT_EQ(event->initializationCount(), isOther ? 1U : 3U);
    EXPECT_LE(event->maximumDurationNs(), after - before);
  }
  EXPECT_EQ(countOfStacks(), 0U);
}

TEST(SRLPCaptureInjectionEnd, MeasuresFromTheGivenStart) {
  const SRLAPIRegistrationData api = apiNamed("a start long ago");
  const Ref<SRLImplementation> implementation = makesClocks();
  SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
  partial.startTime -= 1'000'000'000;
  const int thread = 0;
  partial.callingThread = &thread;
  const std::uint64_t startTime = partial.startTime;
  SRLPCaptureInjectionEnd(std::move(partial), &api, implementation);
  const std::vector<Ref<Event>> events = eventsFor(api);
  ASSERT_EQ(events.size(), 1U);
  EXPECT_EQ(events[0]->monotonicRawClockStartTime(), startTime);
  EXPECT_GE(events[0]->durationNs(), 1'000'000'000U);
  EXPECT_EQ(events[0]->callingThread(), &thread);
}

TEST(SRLPCaptureInjectionEnd, DoesNotCopyTheIdentifier) {
  SRLAPIRegistrationData api = apiNamed("identifier and more");
  api.identifierLength = 10;
  const Ref<SRLImplementation> implementation = makesClocks();
  SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(implementation), &api, implementation);
  const std::vector<Ref<Event>> events = eventsFor(apiNamed("identifier"));
  ASSERT_EQ(events.size(), 1U);
  EXPECT_EQ(events[0]->apiDescription().view().data(), api.identifier);  // not copied
}

TEST(SRLPCaptureInjectionEnd, RepairsAnIdentifierThatIsNotUTF8) {
  SRLAPIRegistrationData api = apiNamed("\xff");
  const Ref<SRLImplementation> implementation = makesClocks();
  SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(implementation), &api, implementation);
  const Ref<rt::Array> events = SRLProfilingStorage::sharedInstance()->serviceInitializationEvents();
  const auto isIt = [&](const Ref<rt::Object>& event) {
    return rt::cast<Event>(event)->implDescription() == implementation->description() &&
           rt::cast<Event>(event)->apiDescription() == "\uFFFD";
  };
  EXPECT_EQ(std::ranges::count_if(*events, isIt), 1);
}

TEST(SRLPCaptureInjectionEnd, DescribesTheParentByItsType) {
  const SRLAPIRegistrationData clock = apiNamed("inner");
  const SRLAPIRegistrationData calendar = apiNamed("outer");
  const Ref<SRLImplementation> inner = makesClocks();
  const Ref<SRLImplementation> outer = makesCalendars();
  const Ref<SRLImplementation> untyped = makes(nullptr);

  const SRLPProfilingMeasurementPartial outerPartial = SRLPCaptureInjectionStart(outer);
  const auto measureInner = [&] { SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(inner), &clock, inner); };
  measureInner();
  measureInner();  // as well as the first: the stack is as it was before
  SRLPCaptureInjectionStart(untyped);
  measureInner();
  SRLPCaptureInjectionCancel();
  measureInner();
  SRLPCaptureInjectionEnd(outerPartial, &calendar, outer);

  const std::vector<Ref<Event>> innerEvents = eventsFor(clock);
  ASSERT_EQ(innerEvents.size(), 4U);
  EXPECT_EQ(innerEvents[3]->parentImplDescription(), "Calendar");
  EXPECT_EQ(innerEvents[2]->parentImplDescription(), "Calendar");
  EXPECT_TRUE(innerEvents[1]->parentImplDescription().isNull());
  EXPECT_EQ(innerEvents[0]->parentImplDescription(), "Calendar");
  EXPECT_EQ(innerEvents[0]->implDescription(), inner->description());
  const std::vector<Ref<Event>> outerEvents = eventsFor(calendar);
  ASSERT_EQ(outerEvents.size(), 1U);
  EXPECT_TRUE(outerEvents[0]->parentImplDescription().isNull());
  EXPECT_EQ(countOfStacks(), 0U);
}

TEST(SRLPCaptureInjectionEnd, PopsTheStackOfTheCallingThread) {
  const SRLAPIRegistrationData api = apiNamed("ended by another thread");
  const Ref<SRLImplementation> outer = makesCalendars();
  const Ref<SRLImplementation> inner = makesClocks();
  const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(inner);
  std::thread([&] {
    SRLPCaptureInjectionStart(outer);
    SRLPCaptureInjectionEnd(partial, &api, inner);
    EXPECT_EQ(countOfStacks(), 1U);
  }).join();

  const std::vector<Ref<Event>> events = eventsFor(api);
  ASSERT_EQ(events.size(), 1U);
  EXPECT_EQ(events[0]->callingThread(), rt::Thread::currentHandle());
  EXPECT_EQ(SRLPCaptureInjectionStart(outer).parent, inner);
  SRLPCaptureInjectionCancel();
  SRLPCaptureInjectionCancel();
  EXPECT_EQ(countOfStacks(), 0U);
}

TEST(SRLPCaptureInjectionEnd, ReportsANullImplementation) {
  const SRLAPIRegistrationData api = apiNamed("no implementation");
  const Ref<SRLImplementation> none;
  TestReports reports;
  SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(none), &api, none);

  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(messages[0]->file(), "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingMeasurement");
  EXPECT_EQ(messages[0]->function(), "SRLPCaptureInjectionEnd");
  EXPECT_GT(messages[0]->line(), 0U);
  EXPECT_EQ(text(*messages[0]), "SRL profiling: nil implDescription");
  EXPECT_FALSE(messages[0]->safeParameters());
  const std::vector<Ref<Event>> events = eventsFor(api);
  ASSERT_EQ(events.size(), 1U);
  EXPECT_EQ(events[0]->implDescription(), "SRL profiling error placeholder key");
  EXPECT_EQ(countOfStacks(), 0U);

  // It is reported every time.
  SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(none), &api, none);
  EXPECT_THAT(reports.texts(), ElementsAre("SRL profiling: nil implDescription"));
}

TEST(SRLPCaptureInjectionEnd, ReportsAnUnknownLifetimeOnce) {
  const SRLAPIRegistrationData api = apiNamed("an unknown lifetime");
  TestReports reports;
  for (const std::uint64_t lifetime : {std::uint64_t{2}, std::uint64_t{3}, ~std::uint64_t{0}}) {
    const Ref<SRLImplementation> implementation = makesClocks(lifetime);
    SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(implementation), &api, implementation);
    EXPECT_EQ(countOfStacks(), 0U);
  }
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(messages[0]->file(), "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingMeasurement");
  EXPECT_EQ(messages[0]->function(), "SRLPCaptureInjectionEnd");
  EXPECT_EQ(text(*messages[0]), kUnknownLifetime);
  EXPECT_THAT(eventsFor(api), IsEmpty());
  EXPECT_THAT(countsFor(api), IsEmpty());
}

TEST(SRLPCaptureInjectionEnd, EndsEvenIfADescriptionOrACallbackThrows) {
  const SRLAPIRegistrationData api = apiNamed("exceptions");
  const Ref<SRLImplementation> implementation =
      makes(rt::make<TalkingType>([]() -> rt::String { throw std::runtime_error("no words"); }));
  EXPECT_THROW(SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(implementation), &api, implementation),
               std::runtime_error);
  EXPECT_EQ(countOfStacks(), 0U);

  // Now the description of the parent's type throws.
  const Ref<SRLImplementation> inner = makesClocks();
  SRLPCaptureInjectionStart(implementation);
  EXPECT_THROW(SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(inner), &api, inner), std::runtime_error);
  EXPECT_EQ(SRLPCaptureInjectionStart(inner).parent, implementation);
  SRLPCaptureInjectionCancel();
  SRLPCaptureInjectionCancel();
  EXPECT_EQ(countOfStacks(), 0U);

  const TestReports reports;
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [](const Ref<PECErrorDescription>&) { throw std::runtime_error("reported"); });
  EXPECT_THROW(SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(nullptr), &api, nullptr),
               std::runtime_error);
  EXPECT_EQ(countOfStacks(), 0U);
  EXPECT_THAT(eventsFor(api), IsEmpty());
}

TEST(SRLPCaptureInjectionEnd, DescribesBeforeItPopsAndWithoutALock) {
  const SRLAPIRegistrationData api = apiNamed("described");
  Ref<SRLImplementation> implementation;
  Ref<SRLImplementation> parent;
  implementation = makes(rt::make<TalkingType>([&] {
    parent = SRLPCaptureInjectionStart(nullptr).parent;
    SRLPCaptureInjectionCancel();
    return rt::String();
  }));
  const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
  SRLPCaptureInjectionEnd(partial, &api, implementation);
  EXPECT_EQ(parent, implementation);
  EXPECT_EQ(eventsFor(api).size(), 1U);
}

TEST(SRLPCaptureInjectionCancel, RecordsNothing) {
  const Ref<SRLImplementation> outer = makesCalendars();
  const Ref<SRLImplementation> inner = makesClocks();
  const auto countOfEvents = [] {
    const SRLProfilingStorage& storage = *SRLProfilingStorage::sharedInstance();
    return storage.serviceInitializationEvents()->count() +
           storage.serviceInitializationNewInstanceEvents()->count();
  };
  const std::size_t before = countOfEvents();
  SRLPCaptureInjectionStart(outer);
  SRLPCaptureInjectionStart(inner);
  SRLPCaptureInjectionCancel();
  EXPECT_EQ(countOfStacks(), 1U);
  EXPECT_EQ(SRLPCaptureInjectionStart(inner).parent, outer);
  SRLPCaptureInjectionCancel();
  SRLPCaptureInjectionCancel();
  EXPECT_EQ(countOfStacks(), 0U);
  EXPECT_EQ(countOfEvents(), before);
}

TEST(SRLPCaptureInjectionCancel, ReleasesTheImplementationWithoutALock) {
  bool isGivenUp = false;
  Ref<SRLImplementation> parentFound;
  Ref<SRLImplementation> outer = makesCalendars();
  SRLPCaptureInjectionStart(outer);
  // Only the stack retains this implementation.
  SRLPCaptureInjectionStart(makes(nullptr, 0, rt::make<AtEnd>([&] {
                                    isGivenUp = true;
                                    parentFound = SRLPCaptureInjectionStart(nullptr).parent;
                                    SRLPCaptureInjectionCancel();
                                  })));
  EXPECT_FALSE(isGivenUp);
  SRLPCaptureInjectionCancel();
  EXPECT_TRUE(isGivenUp);
  EXPECT_EQ(parentFound, outer);
  SRLPCaptureInjectionCancel();
}

TEST(SRLPCaptureInjectionCancel, IsHarmlessWithoutAStart) {
  const SRLAPIRegistrationData api = apiNamed("ended twice");
  const Ref<SRLImplementation> implementation = makesClocks();
  SRLPCaptureInjectionCancel();
  const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(implementation);
  EXPECT_EQ(partial.parent, nullptr);
  SRLPCaptureInjectionEnd(partial, &api, implementation);
  SRLPCaptureInjectionEnd(partial, &api, implementation);
  SRLPCaptureInjectionCancel();
  EXPECT_EQ(eventsFor(api).size(), 2U);
  EXPECT_EQ(countOfStacks(), 0U);
}

TEST(SRLPProfilingMeasurement, KeepsThreadsApart) {
  constexpr std::size_t kThreads = 8;
  constexpr std::size_t kRounds = 100;
  const SRLAPIRegistrationData sharedAPI = apiNamed("shared, by threads");
  const SRLAPIRegistrationData newAPI = apiNamed("new, by threads");
  const Ref<SRLImplementation> counted = makesNewClocks("NewClockOfThreads");
  std::barrier all(std::ptrdiff_t{kThreads});
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      const Ref<SRLImplementation> outer = makesCalendars();
      const Ref<SRLImplementation> inner = makesClocks();
      for (std::size_t round = 0; round < kRounds; ++round) {
        const SRLPProfilingMeasurementPartial partial = SRLPCaptureInjectionStart(outer);
        EXPECT_EQ(partial.parent, nullptr);
        EXPECT_EQ(partial.callingThread, rt::Thread::currentHandle());
        if (round == 0) {
          all.arrive_and_wait();
          EXPECT_EQ(countOfStacks(), kThreads);
          all.arrive_and_wait();
        }
        const SRLPProfilingMeasurementPartial innerPartial = SRLPCaptureInjectionStart(inner);
        EXPECT_EQ(innerPartial.parent, outer);
        SRLPCaptureInjectionEnd(innerPartial, &sharedAPI, inner);
        SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(counted), &newAPI, counted);
        SRLPCaptureInjectionCancel();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();

  EXPECT_EQ(countOfStacks(), 0U);
  const std::vector<Ref<Event>> events = eventsFor(sharedAPI);
  EXPECT_EQ(events.size(), kThreads * kRounds);
  for (const Ref<Event>& event : events) EXPECT_EQ(event->parentImplDescription(), "Calendar");
  const std::vector<Ref<NewInstanceEvent>> counts = countsFor(newAPI);
  ASSERT_EQ(counts.size(), 1U);
  EXPECT_EQ(counts[0]->initializationCount(), kThreads * kRounds);
}

}  // namespace
