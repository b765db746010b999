#pragma once

/// Implementations whose making is measured, and what was recorded of it.
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

/// A type whose description is whatever the test does in it.
class TalkingType final : public rt::Implements<TalkingType, rt::Object, SRLInstanceType> {
 public:
  explicit TalkingType(std::function<rt::String()> talk) : talk_(std::move(talk)) {}
  bool doesRepresentSupertypeOfClass(const rt::ClassInfo&) const override { return false; }
  rt::String description() const override { return talk_(); }

 private:
  const std::function<rt::String()> talk_;
};

/// Does something when it is destroyed.
class AtEnd final : public rt::Implements<AtEnd, rt::Object> {
 public:
  explicit AtEnd(std::function<void()> action) : action_(std::move(action)) {}
  ~AtEnd() override { action_(); }

 private:
  const std::function<void()> action_;
};

/// A record, of an API that is no other test's, since the storage is shared by all.
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
/// What is counted stays in the storage by its description, and an address in that may be taken again.
inline rt::Ref<SRLImplementation> makesNewClocks(std::string_view uniqueIdentifier) {
  return makes(SRLClassType::initWithClass(&rt::classInfo<Clock>()), 1, nullptr, uniqueIdentifier);
}
inline rt::Ref<SRLImplementation> makesCalendars() {
  return makes(SRLClassType::initWithClass(&rt::classInfo<Calendar>()));
}

/// The events for the API, the last stored first.
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
