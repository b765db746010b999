#pragma once

/// Provides implementations for the tests of profiling, and finds the events that were recorded for an API.
///
///     const SRLAPIRegistrationData api = apiNamed("of this test alone");
///     const rt::Ref<SRLImplementation> implementation = makesClocks();
///     SRLPCaptureInjectionEnd(SRLPCaptureInjectionStart(implementation), &api, implementation);
///     EXPECT_EQ(eventsFor(api).size(), 1U);
///
/// Not for: anything but tests.

#include <cstdint>
#include <cstring>
#include <functional>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLImplementation.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"

class Clock final : public rt::Implements<Clock, rt::Object> {};
class Calendar final : public rt::Implements<Calendar, rt::Object> {};

/// A type whose `description` calls a function of the test.
class TalkingType final : public rt::Implements<TalkingType, rt::Object, SRLInstanceType> {
 public:
  explicit TalkingType(std::function<rt::String()> talk) : talk_(std::move(talk)) {}
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo&) const override { return false; }
  rt::String description() const override { return talk_(); }

 private:
  const std::function<rt::String()> talk_;
};

/// Calls a function when it is destroyed.
class AtEnd final : public rt::Implements<AtEnd, rt::Object> {
 public:
  explicit AtEnd(std::function<void()> action) : action_(std::move(action)) {}
  ~AtEnd() override { action_(); }

 private:
  const std::function<void()> action_;
};

/// Returns the record of an API. Each test needs an identifier of its own, because all tests share the
/// storage.
inline SRLAPIRegistrationData apiNamed(const char* identifier) {
  SRLAPIRegistrationData record;
  record.identifier = identifier;
  record.identifierLength = static_cast<decltype(record.identifierLength)>(std::strlen(identifier));
  return record;
}

inline rt::Ref<SRLImplementation> makes(rt::Ref<SRLInstanceType> type, std::uint64_t lifetime = 0,
                                        const rt::Ref<rt::Object>& captured = nullptr,
                                        std::string_view identifier = "Implementation") {
  return SRLImplementation::initWithIdentifier(
      identifier, std::move(type), lifetime, /*scope=*/0,
      [captured](const SRLScopeTagSet&, bool*) { return captured; }, nullptr);
}

inline rt::Ref<SRLImplementation> makesClocks(std::uint64_t lifetime = 0) {
  return makes(SRLClassType::initWithClass(&rt::classInfo<Clock>()), lifetime);
}
/// Returns an implementation whose instances are counted. The storage keeps each count under a description
/// that contains an address, which a later object may reuse. So the identifier must be unique.
inline rt::Ref<SRLImplementation> makesNewClocks(std::string_view uniqueIdentifier) {
  return makes(SRLClassType::initWithClass(&rt::classInfo<Clock>()), 1, nullptr, uniqueIdentifier);
}
inline rt::Ref<SRLImplementation> makesCalendars() {
  return makes(SRLClassType::initWithClass(&rt::classInfo<Calendar>()));
}

/// Returns the events for the API. The newest comes first.
inline std::vector<rt::Ref<SRLPServiceInitializationEvent>> eventsFor(const SRLAPIRegistrationData& api) {
  std::vector<rt::Ref<SRLPServiceInitializationEvent>> events;
  const rt::Ref<rt::Array> all = SRLProfilingStorage::sharedInstance()->serviceInitializationEvents();
  for (const rt::Ref<rt::Object>& object : *all) {
    rt::Ref<SRLPServiceInitializationEvent> event = rt::cast<SRLPServiceInitializationEvent>(object);
    if (event->apiDescription() == api.identifier) events.push_back(std::move(event));
  }
  return events;
}

inline std::vector<rt::Ref<SRLPServiceInitializationNewInstanceEvent>> countsFor(
    const SRLAPIRegistrationData& api) {
  std::vector<rt::Ref<SRLPServiceInitializationNewInstanceEvent>> events;
  const rt::Ref<rt::Array> all =
      SRLProfilingStorage::sharedInstance()->serviceInitializationNewInstanceEvents();
  for (const rt::Ref<rt::Object>& object : *all) {
    rt::Ref<SRLPServiceInitializationNewInstanceEvent> event =
        rt::cast<SRLPServiceInitializationNewInstanceEvent>(object);
    if (event->apiDescription() == api.identifier) events.push_back(std::move(event));
  }
  return events;
}
