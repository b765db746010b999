// The three instance types, and the function that makes the right one for its arguments.

#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLInstanceType.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassProtocolType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLMakeInstanceTypeContainer.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType.h"
#include "tests/support/TestReports.h"

namespace {

using rt::classInfo;
using rt::isEqual;
using rt::protocolInfo;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

struct Clock : rt::Protocol<Clock> {
 protected:
  ~Clock() = default;
};
struct AlarmClock : rt::Protocol<AlarmClock, Clock> {
 protected:
  ~AlarmClock() = default;
};
class View : public rt::Implements<View, rt::Object> {};
class ClockView : public rt::Implements<ClockView, View, Clock> {};
class BigClockView final : public rt::Implements<BigClockView, ClockView> {};
class AlarmView final : public rt::Implements<AlarmView, View, AlarmClock> {};
class PlainView final : public rt::Implements<PlainView, View> {};
class OtherClock final : public rt::Implements<OtherClock, rt::Object, Clock> {};

std::uint64_t hashOf(std::string_view text) {
  return std::hash<std::string_view>()(text);
}
std::uint64_t hashOf(const rt::ClassInfo& info) {
  return std::hash<const rt::ClassInfo*>()(&info);
}

// Expects that there is one report, and checks its text and its origin.
void expectFrom(TestReports& reports, const std::string& file, const std::string& function,
                const std::string& report) {
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(messages[0]->file(), "Shared/ServiceRegistry/Source/Entities/InstanceType/" + file);
  EXPECT_EQ(messages[0]->function(), function);
  EXPECT_GT(messages[0]->line(), 0U);
  EXPECT_EQ(text(*messages[0]), report);
  EXPECT_FALSE(messages[0]->safeParameters());
}

TEST(SRLClassType, RepresentsTheClassAndItsSubclasses) {
  const Ref<SRLClassType> type = SRLClassType::initWithClass(&classInfo<ClockView>());
  EXPECT_EQ(&type->concreteClass(), &classInfo<ClockView>());
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<ClockView>()));
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<BigClockView>()));
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<View>()));
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<OtherClock>()));
}

TEST(SRLClassType, HasValueEqualityHashAndDescription) {
  const Ref<SRLClassType> type = SRLClassType::initWithClass(&classInfo<View>());
  EXPECT_EQ(type->description(), "View");
  EXPECT_EQ(type->hash(), hashOf(classInfo<View>()));
  EXPECT_TRUE(isEqual(type, type));
  EXPECT_TRUE(isEqual(type, SRLClassType::initWithClass(&classInfo<View>())));
  EXPECT_FALSE(isEqual(type, SRLClassType::initWithClass(&classInfo<ClockView>())));
  EXPECT_FALSE(
      isEqual(type, SRLClassProtocolType::initWithClass(&classInfo<View>(), &protocolInfo<Clock>())));
  EXPECT_FALSE(type->isEqual(nullptr));
  EXPECT_EQ(rt::copy(type), type);
  EXPECT_EQ(classInfo<SRLClassType>().superclass, &classInfo<rt::Object>());
  EXPECT_TRUE(type->conformsTo(protocolInfo<SRLInstanceType>()));
}

TEST(SRLClassType, ReportsAMissingClassAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(SRLClassType::initWithClass(nullptr), nullptr);
  expectFrom(reports, "SRLClassType", "-[SRLClassType initWithClass:]",
             "SRLClassType's concreteClass must not be nil.");
  EXPECT_EQ(SRLClassType::initWithClass(rt::classNamed("NoSuchClass")), nullptr);
  EXPECT_THAT(reports.texts(), ElementsAre("SRLClassType's concreteClass must not be nil."));
}

TEST(SRLProtocolType, RepresentsTheClassesThatConform) {
  const Ref<SRLProtocolType> type = SRLProtocolType::initWithProtocol(&protocolInfo<Clock>());
  EXPECT_EQ(&type->concreteProtocol(), &protocolInfo<Clock>());
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<ClockView>()));
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<BigClockView>()));  // by its superclass
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<AlarmView>()));     // by an inherited protocol
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<OtherClock>()));
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<View>()));
  const Ref<SRLProtocolType> alarm = SRLProtocolType::initWithProtocol(&protocolInfo<AlarmClock>());
  EXPECT_TRUE(alarm->doesRepresentSupertypeOfClass(classInfo<AlarmView>()));
  EXPECT_FALSE(alarm->doesRepresentSupertypeOfClass(classInfo<ClockView>()));
}

TEST(SRLProtocolType, HasValueEqualityHashAndDescription) {
  const Ref<SRLProtocolType> type = SRLProtocolType::initWithProtocol(&protocolInfo<Clock>());
  EXPECT_EQ(type->description(), "id<Clock>");
  EXPECT_EQ(type->hash(), hashOf("Clock"));
  EXPECT_TRUE(isEqual(type, type));
  EXPECT_TRUE(isEqual(type, SRLProtocolType::initWithProtocol(&protocolInfo<Clock>())));
  // A protocol that inherits from it is a different one.
  EXPECT_FALSE(isEqual(type, SRLProtocolType::initWithProtocol(&protocolInfo<AlarmClock>())));
  EXPECT_FALSE(
      isEqual(type, SRLClassProtocolType::initWithClass(&classInfo<View>(), &protocolInfo<Clock>())));
  EXPECT_FALSE(type->isEqual(nullptr));
  EXPECT_EQ(rt::copy(type), type);
  EXPECT_EQ(classInfo<SRLProtocolType>().superclass, &classInfo<rt::Object>());
}

TEST(SRLProtocolType, ReportsAMissingProtocolAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(SRLProtocolType::initWithProtocol(nullptr), nullptr);
  expectFrom(reports, "SRLProtocolType", "-[SRLProtocolType initWithProtocol:]",
             "SRLProtocolType's concreteProtocol must not be nil.");
}

TEST(SRLClassProtocolType, RepresentsTheSubclassesThatConform) {
  const Ref<SRLClassProtocolType> type =
      SRLClassProtocolType::initWithClass(&classInfo<View>(), &protocolInfo<Clock>());
  EXPECT_EQ(&type->concreteClass(), &classInfo<View>());
  EXPECT_EQ(&type->concreteProtocol(), &protocolInfo<Clock>());
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<ClockView>()));
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<BigClockView>()));
  EXPECT_TRUE(type->doesRepresentSupertypeOfClass(classInfo<AlarmView>()));
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<PlainView>()));   // does not conform
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<OtherClock>()));  // no subclass
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<View>()));
  EXPECT_FALSE(type->doesRepresentSupertypeOfClass(classInfo<rt::Object>()));
}

TEST(SRLClassProtocolType, HasValueEqualityHashAndDescription) {
  const auto typeOf = [](const rt::ClassInfo& aClass, const rt::ProtocolInfo& protocol) {
    return SRLClassProtocolType::initWithClass(&aClass, &protocol);
  };
  const Ref<SRLClassProtocolType> type = typeOf(classInfo<View>(), protocolInfo<Clock>());
  EXPECT_EQ(type->description(), "View<Clock>");
  EXPECT_EQ(type->hash(), 41 * hashOf("Clock") + hashOf(classInfo<View>()));
  EXPECT_TRUE(isEqual(type, type));
  EXPECT_TRUE(isEqual(type, typeOf(classInfo<View>(), protocolInfo<Clock>())));
  EXPECT_FALSE(isEqual(type, typeOf(classInfo<PlainView>(), protocolInfo<Clock>())));
  EXPECT_FALSE(isEqual(type, typeOf(classInfo<View>(), protocolInfo<AlarmClock>())));
  EXPECT_FALSE(isEqual(type, SRLClassType::initWithClass(&classInfo<View>())));
  EXPECT_FALSE(isEqual(type, SRLProtocolType::initWithProtocol(&protocolInfo<Clock>())));
  EXPECT_FALSE(type->isEqual(nullptr));
  EXPECT_EQ(rt::copy(type), type);
  EXPECT_EQ(classInfo<SRLClassProtocolType>().superclass, &classInfo<rt::Object>());
}

TEST(SRLClassProtocolType, ReportsAMissingPartAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(SRLClassProtocolType::initWithClass(nullptr, &protocolInfo<Clock>()), nullptr);
  expectFrom(reports, "SRLClassProtocolType", "-[SRLClassProtocolType initWithClass:constrainedToProtocol:]",
             "concreteClass and concreteProtocol must be provided.");
  EXPECT_EQ(SRLClassProtocolType::initWithClass(&classInfo<View>(), nullptr), nullptr);
  EXPECT_EQ(SRLClassProtocolType::initWithClass(nullptr, nullptr), nullptr);
  EXPECT_THAT(reports.texts(), ElementsAre("concreteClass and concreteProtocol must be provided.",
                                           "concreteClass and concreteProtocol must be provided."));
}

TEST(SRLMakeInstanceTypeContainer, MakesTheTypeForItsArguments) {
  TestReports reports;
  EXPECT_TRUE(isEqual(SRLMakeInstanceTypeContainer(&classInfo<View>(), &protocolInfo<Clock>()),
                      SRLClassProtocolType::initWithClass(&classInfo<View>(), &protocolInfo<Clock>())));
  EXPECT_TRUE(isEqual(SRLMakeInstanceTypeContainer(nullptr, &protocolInfo<Clock>()),
                      SRLProtocolType::initWithProtocol(&protocolInfo<Clock>())));
  EXPECT_TRUE(isEqual(SRLMakeInstanceTypeContainer(&classInfo<View>(), nullptr),
                      SRLClassType::initWithClass(&classInfo<View>())));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLMakeInstanceTypeContainer, ReportsTwoNullsAndYieldsNull) {
  TestReports reports;
  EXPECT_EQ(SRLMakeInstanceTypeContainer(nullptr, nullptr), nullptr);
  expectFrom(reports, "SRLMakeInstanceTypeContainer", "SRLMakeInstanceTypeContainer",
             "Either instanceClass or instanceProtocol must be provided.");
}

}  // namespace
