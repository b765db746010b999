// Tests the message that a report logs, and what the error handler receives.

#include "Libraries/Util/ErrorHandler/PECReport.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/LUMSafeStringParameter.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Loggers/Testing/LUMLogMatchers.h"

namespace {

using namespace rt::literals;
using namespace LUMLogMatchers;
using rt::Ref;
using testing::ElementsAre;
using testing::HasSubstr;

constexpr const char* kFile = "Libraries/Util/ErrorHandler/PECReport_test";

class PECReportTest : public testing::Test {
 protected:
  static void SetUpTestSuite() {
    // The system's log would only repeat the reports.
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
  }

  void SetUp() override {
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
        [this](const Ref<PECErrorDescription>& error) { errors_.push_back(error); });
  }
  void TearDown() override {
    LUMLogMultiplexer::sharedInstance()->setCaptureCallStackAddresses(true);
    PECErrorHandler::resetAfterTest();
  }

  Ref<LUMLogMessage> message() const { return capture_.messages().at(0); }

  // Returns the safe parameter at an index, cast to its class.
  template <class Parameter>
  const Parameter* parameterAt(std::int32_t place) const {
    return rt::cast<Parameter>(message()->safeParameters()->objectForKey(rt::Number::of(place).get()));
  }

  LUMLogCapture capture_;
  std::vector<Ref<PECErrorDescription>> errors_;
};

TEST_F(PECReportTest, LogsAFaultFromItsSite) {
  PECReport({kFile, "-[Registry add:]", 70}, "nothing to add"_s);
  EXPECT_THAT(capture_.messages(), ElementsAre(HasLevel(LUMLogLevelFault)));
  EXPECT_EQ(message()->file(), kFile);
  EXPECT_EQ(message()->function(), "-[Registry add:]");
  EXPECT_EQ(message()->line(), 70U);
  EXPECT_EQ(message()->format(), "nothing to add");
  EXPECT_EQ(message()->formattedString(), "nothing to add");
  EXPECT_EQ(message()->logMetadata(), nullptr);
  EXPECT_EQ(message()->safeParameters(), nullptr);
}

TEST_F(PECReportTest, ReachesTheErrorHandler) {
  PECReport({kFile, "-[Registry add:]", 70}, "%@ is bound %@ times."_s, "API"_s, 2);
  ASSERT_EQ(errors_.size(), 1U);
  EXPECT_EQ(errors_[0]->filePath(), kFile);
  EXPECT_EQ(errors_[0]->functionName(), "-[Registry add:]");
  EXPECT_EQ(errors_[0]->lineNumber(), 70U);
  EXPECT_EQ(errors_[0]->rawFormatString(), "%@ is bound %@ times.");
  EXPECT_EQ(errors_[0]->errorMessage(), "API is bound 2 times.");
  EXPECT_EQ(PECErrorHandler::sharedInstance()->errorCount(), 1);
}

TEST_F(PECReportTest, RecordsItsLine) {
  PECReport({kFile, "f"}, "first"_s);
  const std::uint64_t line = __LINE__ - 1;
  PECReport({kFile, "f"}, "second"_s);
  const std::vector<Ref<LUMLogMessage>> messages = capture_.messages();
  ASSERT_EQ(messages.size(), 2U);
  EXPECT_EQ(messages[0]->line(), line);
  EXPECT_EQ(messages[1]->line(), line + 2);
}

TEST_F(PECReportTest, KeepsEveryParameterAsASafeParameterOfTypeOne) {
  const rt::String name = rt::String::fromUTF8("Clock");
  PECReport({kFile, "f"}, "%@ of %@ and %@"_s, name, 4, "literal"_s);
  EXPECT_EQ(message()->formattedString(), "Clock of 4 and literal");
  ASSERT_EQ(message()->safeParameters()->count(), 3U);
  ASSERT_NE(parameterAt<LUMSafeStringParameter>(0), nullptr);
  EXPECT_EQ(parameterAt<LUMSafeStringParameter>(0)->stringValue(), "Clock");
  EXPECT_EQ(parameterAt<LUMSafeStringParameter>(0)->type(), 1U);
  ASSERT_NE(parameterAt<LUMSafeNumberParameter>(1), nullptr);
  EXPECT_TRUE(rt::isEqual(parameterAt<LUMSafeNumberParameter>(1)->numberValue(), rt::Number::of(4)));
  EXPECT_EQ(parameterAt<LUMSafeNumberParameter>(1)->type(), 1U);
  ASSERT_NE(parameterAt<LUMSafeStringParameter>(2), nullptr);
  EXPECT_EQ(parameterAt<LUMSafeStringParameter>(2)->stringValue(), "literal");
}

TEST_F(PECReportTest, PrintsAnyIntegerInFull) {
  PECReport({kFile, "f"}, "%@ %@ %@ %@ %@"_s, std::numeric_limits<std::uint64_t>::max(),
            std::numeric_limits<std::int64_t>::min(), -1, std::uint8_t{200}, std::size_t{7});
  EXPECT_EQ(message()->formattedString(), "18446744073709551615 -9223372036854775808 -1 200 7");
}

TEST_F(PECReportTest, PrintsNullText) {
  PECReport({kFile, "f"}, "no %@, and %@"_s, rt::String(), ""_s);
  EXPECT_EQ(message()->formattedString(), "no (null), and ");
  EXPECT_EQ(message()->safeParameters()->count(), 2U);
}

// Directives in a parameter are printed unchanged.
TEST_F(PECReportTest, PrintsDirectivesInParametersUnchanged) {
  PECReport({kFile, "f"}, "100 %% of %@"_s, "%@%s%n"_s);
  EXPECT_EQ(message()->formattedString(), "100 % of %@%s%n");
  EXPECT_EQ(message()->format(), "100 %% of %@");
}

// Reporting is the last thing that these functions do.
[[gnu::noinline]] void functionThatReports() {
  PECReport({kFile, "f"}, "wrong"_s);
}
[[gnu::noinline]] void functionThatReportsParameters(const rt::String& text) {
  PECReport({kFile, "f"}, "%@ %@"_s, text, 1);
}

std::string firstSymbolOf(const LUMLogMessage& message) {
  if (auto* symbols = rt::cast<LUMLogSymbolCallstack>(message.callstack().get())) {
    return std::string(symbols->symbols()->stringAt(0).view());
  }
  std::string line;
  rt::cast<LUMLogAddressCallstack>(message.callstack().get())
      ->enumerateAddressesWithBlock([&](std::uint64_t address, std::uint64_t, bool* stop) {
        line = rt::CallStack::symbols(std::array{address}).front().view();
        *stop = true;
      });
  return line;
}

TEST_F(PECReportTest, CallStackBeginsWithTheReportingFunction) {
  for (const bool captureAddresses : {true, false}) {
    LUMLogMultiplexer::sharedInstance()->setCaptureCallStackAddresses(captureAddresses);
    functionThatReports();
    functionThatReportsParameters("text"_s);
    const std::vector<Ref<LUMLogMessage>> messages = capture_.takeMessages();
    ASSERT_EQ(messages.size(), 2U);
    EXPECT_THAT(firstSymbolOf(*messages[0]), HasSubstr("functionThatReports("));
    EXPECT_THAT(firstSymbolOf(*messages[1]), HasSubstr("functionThatReportsParameters("));
  }
}

TEST_F(PECReportTest, ReturnsOrThrowsAsTheCallbackDoes) {
  struct Thrown {};
  EXPECT_NO_THROW(functionThatReports());
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [](const Ref<PECErrorDescription>&) { throw Thrown(); });
  EXPECT_THROW(functionThatReports(), Thrown);
  EXPECT_THROW(functionThatReportsParameters("text"_s), Thrown);
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(nullptr);
  testing::internal::CaptureStderr();
  EXPECT_THROW(functionThatReports(), rt::InternalInconsistencyException);
  EXPECT_THAT(testing::internal::GetCapturedStderr(), HasSubstr("in PECReport_test\n   in f\n"));
}

TEST_F(PECReportTest, IsCountedInABlock) {
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {
              functionThatReports();
              functionThatReportsParameters("text"_s);
            }),
            2);
  EXPECT_NO_THROW(PECErrorHandler::assertBlockReportsError([] { functionThatReports(); }));
}

}  // namespace
