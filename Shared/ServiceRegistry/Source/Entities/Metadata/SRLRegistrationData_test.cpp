#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <bit>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassProtocolType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType.h"
#include "tests/support/TestReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

struct Clock : rt::Protocol<Clock> {
 protected:
  ~Clock() = default;
};
class View : public rt::Implements<View, rt::Object> {};
class ClockView final : public rt::Implements<ClockView, View, Clock> {};

const void* receivedRecord = nullptr;

template <class Record>
Ref<SRLInstanceType> typeOfRecord(const Record* record) {
  receivedRecord = record;
  return SRLProtocolType::initWithProtocol(&rt::protocolInfo<Clock>());
}
template <class Record>
Ref<SRLInstanceType> configTypeOfRecord(const Record* record) {
  receivedRecord = record;
  return SRLClassType::initWithClass(&rt::classInfo<View>());
}
Ref<rt::Object> makeView(SRLScopeTagSet) {
  return rt::make<ClockView>();
}

// Records as a generator writes them. All of them are constants.
constinit const SRLAPIRegistrationData clockAPI{
    .identifier = "Clock",
    .instanceType = {.names = {.protocolName = "Clock"}},
    .scopeType = 0b101,
    .identifierLength = 5,
    .instanceTypeKind = SRLInstanceTypeKindNames,
    .isMultibound = 1,
};
constinit const SRLImplementationRegistrationData clockView{
    .identifier = "ClockView",
    .instanceType = {.className = "ClockView"},
    .factory = makeView,
    .scopeType = 0b1,
};
constinit const SRLImplementationRegistrationData* const clockViews[] = {&clockView, nullptr};
constinit const SRLImplementationRegistrationData* const noViews[] = {nullptr};
constinit const _SRLBindingRegistrationData clockBinding{&clockAPI, clockViews};
constinit const _SRLBindingRegistrationData emptyBinding{&clockAPI, noViews};

template <class Record>
std::array<std::uint8_t, sizeof(Record)> bytesOf(const Record& record) {
  return std::bit_cast<std::array<std::uint8_t, sizeof(Record)>>(record);
}

// Returns the little-endian value of some bytes.
template <std::size_t size>
std::uint64_t valueAt(const std::array<std::uint8_t, size>& bytes, std::size_t offset, std::size_t width) {
  std::uint64_t value = 0;
  for (std::size_t i = width; i > 0; --i) value = value << 8 | bytes.at(offset + i - 1);
  return value;
}
std::uint64_t addressOf(const void* pointer) {
  return reinterpret_cast<std::uintptr_t>(pointer);
}

TEST(SRLRegistrationDataLayout, PlacesTheFieldsOfAnAPI) {
  ASSERT_EQ(sizeof(SRLAPIRegistrationData), 32U);
  const SRLAPIRegistrationData record{
      .identifier = "id",
      .instanceType = {.names = {.protocolName = "protocol", .className = "class"}},
      .scopeType = 0x04030201,
      .identifierLength = 0x0605,
  };
  const auto bytes = bytesOf(record);
  EXPECT_EQ(valueAt(bytes, 0, 8), addressOf(record.identifier));
  EXPECT_EQ(valueAt(bytes, 8, 8), addressOf(record.instanceType.names.protocolName));
  EXPECT_EQ(valueAt(bytes, 16, 8), addressOf(record.instanceType.names.className));
  EXPECT_EQ(valueAt(bytes, 24, 4), 0x04030201U);
  EXPECT_EQ(valueAt(bytes, 28, 2), 0x0605U);
  EXPECT_EQ(valueAt(bytes, 30, 2), 0U);
  const SRLAPIRegistrationData byFunction{.instanceType = {.function = typeOfRecord}};
  EXPECT_EQ(valueAt(bytesOf(byFunction), 8, 8),
            reinterpret_cast<std::uintptr_t>(&typeOfRecord<SRLAPIRegistrationData>));
}

// Sets each bit alone and looks at the bytes. Then reads the bits from given bytes.
TEST(SRLRegistrationDataLayout, PlacesTheBitFieldsOfAnAPI) {
  for (std::uint8_t kind = 0; kind < 4; ++kind) {
    SRLAPIRegistrationData record;
    record.instanceTypeKind = kind & 3U;
    EXPECT_EQ(valueAt(bytesOf(record), 24, 8), std::uint64_t{kind} << 48);
  }
  SRLAPIRegistrationData record;
  record.isMultibound = 1;
  EXPECT_EQ(valueAt(bytesOf(record), 24, 8), std::uint64_t{1} << 50);

  std::array<std::uint8_t, 32> bytes{};
  bytes[30] = 0b110;
  const auto read = std::bit_cast<SRLAPIRegistrationData>(bytes);
  EXPECT_EQ(read.instanceTypeKind, 2);
  EXPECT_EQ(read.isMultibound, 1);
  EXPECT_EQ(read.reserved, 0);
}

TEST(SRLRegistrationDataLayout, PlacesTheFieldsOfAnImplementation) {
  ASSERT_EQ(sizeof(SRLImplementationRegistrationData), 40U);
  const SRLImplementationRegistrationData record{
      .identifier = "id",
      .instanceType = {.className = "class"},
      .configInstanceType = {.className = "configuration"},
      .factory = makeView,
      .scopeType = 0x04030201,
  };
  const auto bytes = bytesOf(record);
  EXPECT_EQ(valueAt(bytes, 0, 8), addressOf(record.identifier));
  EXPECT_EQ(valueAt(bytes, 8, 8), addressOf(record.instanceType.className));
  EXPECT_EQ(valueAt(bytes, 16, 8), addressOf(record.configInstanceType.className));
  EXPECT_EQ(valueAt(bytes, 24, 8), reinterpret_cast<std::uintptr_t>(&makeView));
  EXPECT_EQ(valueAt(bytes, 32, 4), 0x04030201U);
  EXPECT_EQ(valueAt(bytes, 36, 4), 0U);
  const SRLImplementationRegistrationData byFunction{.instanceType = {.function = typeOfRecord},
                                                     .configInstanceType = {.function = configTypeOfRecord}};
  EXPECT_EQ(valueAt(bytesOf(byFunction), 8, 8),
            reinterpret_cast<std::uintptr_t>(&typeOfRecord<SRLImplementationRegistrationData>));
  EXPECT_EQ(valueAt(bytesOf(byFunction), 16, 8),
            reinterpret_cast<std::uintptr_t>(&configTypeOfRecord<SRLImplementationRegistrationData>));
}

TEST(SRLRegistrationDataLayout, PlacesTheBitFieldsOfAnImplementation) {
  const auto bitsOf = [](const SRLImplementationRegistrationData& record) {
    return valueAt(bytesOf(record), 36, 4);
  };
  for (std::uint8_t kind = 0; kind < 4; ++kind) {
    SRLImplementationRegistrationData record;
    record.instanceTypeKind = kind & 3U;
    EXPECT_EQ(bitsOf(record), kind);
    record = {};
    record.configInstanceTypeKind = kind & 3U;
    EXPECT_EQ(bitsOf(record), std::uint64_t{kind} << 2);
  }
  EXPECT_EQ(bitsOf({.lifetime = 1}), 1U << 4);
  EXPECT_EQ(bitsOf({.hasConfiguration = 1}), 1U << 5);
  EXPECT_EQ(bitsOf({.isConfigurationRequired = 1}), 1U << 6);

  std::array<std::uint8_t, 40> bytes{};
  bytes[36] = 0b1011001;
  const auto read = std::bit_cast<SRLImplementationRegistrationData>(bytes);
  EXPECT_EQ(read.instanceTypeKind, 1U);
  EXPECT_EQ(read.configInstanceTypeKind, 2U);
  EXPECT_EQ(read.lifetime, 1U);
  EXPECT_EQ(read.hasConfiguration, 0U);
  EXPECT_EQ(read.isConfigurationRequired, 1U);
  EXPECT_EQ(read.reserved, 0U);
}

TEST(SRLRegistrationDataLayout, PlacesTheFieldsOfABinding) {
  ASSERT_EQ(sizeof(_SRLBindingRegistrationData), 16U);
  EXPECT_EQ(valueAt(bytesOf(clockBinding), 0, 8), addressOf(&clockAPI));
  EXPECT_EQ(valueAt(bytesOf(clockBinding), 8, 8), addressOf(&clockViews));
  EXPECT_EQ(clockBinding.implementations[0], &clockView);
  EXPECT_EQ(clockBinding.implementations[1], nullptr);
  // An empty list still names the API.
  EXPECT_EQ(emptyBinding.implementations[0], nullptr);
  EXPECT_EQ(emptyBinding.api, &clockAPI);
}

TEST(SRLAPIRegistrationDataInstanceType, LooksUpTheNames) {
  TestReports reports;
  const auto typeOf = [](const char* protocolName, const char* className) {
    const SRLAPIRegistrationData record{
        .instanceType = {.names = {.protocolName = protocolName, .className = className}}};
    return SRLAPIRegistrationDataInstanceType(&record);
  };
  EXPECT_TRUE(
      rt::isEqual(typeOf("Clock", nullptr), SRLProtocolType::initWithProtocol(&rt::protocolInfo<Clock>())));
  EXPECT_TRUE(rt::isEqual(typeOf(nullptr, "View"), SRLClassType::initWithClass(&rt::classInfo<View>())));
  const Ref<SRLInstanceType> both = typeOf("Clock", "View");
  EXPECT_TRUE(rt::isEqual(
      both, SRLClassProtocolType::initWithClass(&rt::classInfo<View>(), &rt::protocolInfo<Clock>())));
  EXPECT_EQ(both->asObject()->description(), "View<Clock>");
  // An unknown name is ignored if the other one is known.
  EXPECT_TRUE(rt::isEqual(typeOf("Clock", "NoSuchClass"),
                          SRLProtocolType::initWithProtocol(&rt::protocolInfo<Clock>())));
  EXPECT_TRUE(
      rt::isEqual(typeOf("NoSuchProtocol", "View"), SRLClassType::initWithClass(&rt::classInfo<View>())));
  EXPECT_THAT(reports.texts(), IsEmpty());
  EXPECT_TRUE(rt::isEqual(SRLAPIRegistrationDataInstanceType(&clockAPI), typeOf("Clock", nullptr)));
}

TEST(SRLAPIRegistrationDataInstanceType, ReturnsANewObjectEachTime) {
  const Ref<SRLInstanceType> first = SRLAPIRegistrationDataInstanceType(&clockAPI);
  EXPECT_NE(SRLAPIRegistrationDataInstanceType(&clockAPI), first);
}

TEST(SRLAPIRegistrationDataInstanceType, ReportsThatNoNameIsKnownAndYieldsNull) {
  TestReports reports;
  for (const auto& names :
       {SRLAPIInstanceType::Names{}, SRLAPIInstanceType::Names{.className = "NoSuchClass"},
        SRLAPIInstanceType::Names{.protocolName = "NoSuchProtocol"}, SRLAPIInstanceType::Names{"", ""}}) {
    const SRLAPIRegistrationData record{.instanceType = {.names = names}};
    EXPECT_EQ(SRLAPIRegistrationDataInstanceType(&record), nullptr);
    EXPECT_THAT(reports.texts(), ElementsAre("Either instanceClass or instanceProtocol must be provided."));
  }
}

TEST(SRLAPIRegistrationDataInstanceType, ReturnsTheFunctionsResult) {
  const SRLAPIRegistrationData record{.instanceType = {.function = typeOfRecord},
                                      .instanceTypeKind = SRLInstanceTypeKindFunction};
  const Ref<SRLInstanceType> type = SRLAPIRegistrationDataInstanceType(&record);
  EXPECT_EQ(receivedRecord, &record);
  EXPECT_TRUE(rt::isEqual(type, SRLProtocolType::initWithProtocol(&rt::protocolInfo<Clock>())));
}

TEST(SRLImplementationRegistrationDataInstanceType, LooksUpTheClassName) {
  TestReports reports;
  const Ref<SRLClassType> expected = SRLClassType::initWithClass(&rt::classInfo<View>());
  for (const unsigned kind : {0U, 3U}) {
    const SRLImplementationRegistrationData record{.instanceType = {.className = "View"},
                                                   .instanceTypeKind = kind & 3U};
    const Ref<SRLInstanceType> type = SRLImplementationRegistrationDataInstanceType(&record);
    EXPECT_TRUE(rt::isEqual(type, expected));
    EXPECT_NE(SRLImplementationRegistrationDataInstanceType(&record), type);
  }
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLImplementationRegistrationDataInstanceType, ReportsAnUnknownClassNameAndYieldsNull) {
  TestReports reports;
  // "Clock" is a protocol, not a class.
  for (const char* name : {"NoSuchClass", "Clock", static_cast<const char*>(nullptr)}) {
    const SRLImplementationRegistrationData record{.instanceType = {.className = name}};
    EXPECT_EQ(SRLImplementationRegistrationDataInstanceType(&record), nullptr);
    EXPECT_THAT(reports.texts(), ElementsAre("SRLClassType's concreteClass must not be nil."));
  }
}

TEST(SRLImplementationRegistrationDataInstanceType, ReturnsTheFunctionsResult) {
  const SRLImplementationRegistrationData record{
      .instanceType = {.function = typeOfRecord},
      .configInstanceType = {.function = configTypeOfRecord},
      .instanceTypeKind = SRLInstanceTypeKindFunction,
  };
  const Ref<SRLInstanceType> type = SRLImplementationRegistrationDataInstanceType(&record);
  EXPECT_EQ(receivedRecord, &record);
  EXPECT_EQ(type->asObject()->description(), "id<Clock>");
}

TEST(SRLImplementationRegistrationDataInstanceType, IsNullForTheKindNone) {
  TestReports reports;
  const SRLImplementationRegistrationData record{.instanceType = {.className = "View"},
                                                 .instanceTypeKind = SRLInstanceTypeKindNone};
  EXPECT_EQ(SRLImplementationRegistrationDataInstanceType(&record), nullptr);
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLImplementationRegistrationDataConfigInstanceType, IsNullWithoutAConfiguration) {
  TestReports reports;
  for (const unsigned kind : {0U, 1U, 2U, 3U}) {
    const SRLImplementationRegistrationData record{.configInstanceType = {.className = "View"},
                                                   .configInstanceTypeKind = kind & 3U,
                                                   .isConfigurationRequired = 1};
    EXPECT_EQ(SRLImplementationRegistrationDataConfigInstanceType(&record), nullptr);
  }
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST(SRLImplementationRegistrationDataConfigInstanceType, LooksUpTheClassName) {
  TestReports reports;
  SRLImplementationRegistrationData record{
      .instanceType = {.className = "ClockView"},
      .configInstanceType = {.className = "View"},
      .hasConfiguration = 1,
  };
  EXPECT_TRUE(rt::isEqual(SRLImplementationRegistrationDataConfigInstanceType(&record),
                          SRLClassType::initWithClass(&rt::classInfo<View>())));
  EXPECT_THAT(reports.texts(), IsEmpty());
  for (const char* name : {"NoSuchClass", static_cast<const char*>(nullptr)}) {
    record.configInstanceType.className = name;
    EXPECT_EQ(SRLImplementationRegistrationDataConfigInstanceType(&record), nullptr);
    EXPECT_THAT(reports.texts(), ElementsAre("SRLClassType's concreteClass must not be nil."));
  }
}

TEST(SRLImplementationRegistrationDataConfigInstanceType, ReturnsTheFunctionsResult) {
  const SRLImplementationRegistrationData record{
      .instanceType = {.function = typeOfRecord},
      .configInstanceType = {.function = configTypeOfRecord},
      .configInstanceTypeKind = SRLInstanceTypeKindFunction,
      .hasConfiguration = 1,
  };
  const Ref<SRLInstanceType> type = SRLImplementationRegistrationDataConfigInstanceType(&record);
  EXPECT_EQ(receivedRecord, &record);
  EXPECT_EQ(type->asObject()->description(), "View");
}

// The error callback prints the report and returns. The program ends nevertheless.
class SRLRegistrationDataDeathTest : public testing::Test {
 protected:
  void SetUp() override { PECErrorHandler::sharedInstance()->setErrorHandlerBlock(print); }
  void TearDown() override { PECErrorHandler::resetAfterTest(); }

  static void print(const Ref<PECErrorDescription>& error) {
    std::fprintf(stderr, "%s: %s: %s\n", std::string(error->filePath().view()).c_str(),
                 std::string(error->functionName().view()).c_str(),
                 std::string(error->errorMessage().view()).c_str());
  }

  TestReports reports_;
};

TEST_F(SRLRegistrationDataDeathTest, AnAPIOfUnknownTypeEndsTheProgram) {
  for (const unsigned kind : {2U, 3U}) {
    SRLAPIRegistrationData record = clockAPI;
    record.instanceTypeKind = kind & 3U;
    const auto ask = [&] { SRLAPIRegistrationDataInstanceType(&record); };
    EXPECT_EXIT(ask(), testing::KilledBySignal(SIGABRT),
                "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData: "
                "SRLAPIRegistrationDataInstanceType: APIs cannot be of an unknown type\n");
  }
}

TEST_F(SRLRegistrationDataDeathTest, AConfigurationOfUnknownTypeEndsTheProgram) {
  for (const unsigned kind : {2U, 3U}) {
    const SRLImplementationRegistrationData record{.configInstanceTypeKind = kind & 3U,
                                                   .hasConfiguration = 1};
    const auto ask = [&] { SRLImplementationRegistrationDataConfigInstanceType(&record); };
    EXPECT_EXIT(ask(), testing::KilledBySignal(SIGABRT),
                "Shared/ServiceRegistry/Source/Entities/Metadata/SRLRegistrationData: "
                "SRLImplementationRegistrationDataConfigInstanceType: "
                "Configurations cannot be of an unknown type\n");
  }
}

// The default error callback throws. No caller can catch that exception.
TEST_F(SRLRegistrationDataDeathTest, TheProgramEndsEvenIfTheErrorCallbackThrows) {
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(nullptr);
  SRLAPIRegistrationData record = clockAPI;
  record.instanceTypeKind = 2;
  const auto ask = [&] {
    try {
      SRLAPIRegistrationDataInstanceType(&record);
    } catch (...) {
      std::fputs("caught\n", stderr);
    }
  };
  EXPECT_EXIT(ask(), testing::KilledBySignal(SIGABRT), "APIs cannot be of an unknown type");
}

}  // namespace
