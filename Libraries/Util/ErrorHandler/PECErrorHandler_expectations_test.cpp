// What tests of a host's use to see whether errors are reported: counts and expectations.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <latch>
#include <limits>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/Exception.h"
#include "Shared/Logging/LUMLog.h"
#include "tests/support/PECErrorHandlerTest.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::IsEmpty;

TEST_F(PECErrorHandlerTest, ForgetsCallbackAndCountAfterATest) {
  handler_->setErrorHandlerBlock(tracing());
  logError();
  PECErrorHandler::resetAfterTest();
  EXPECT_FALSE(handler_->errorHandlerBlock());
  EXPECT_EQ(handler_->errorCount(), 0);
  handler_->registerErrorHandlerBlock(tracing());  // As the first.
  EXPECT_EQ(handler_->errorCount(), 0);
}

TEST_F(PECErrorHandlerTest, CountsTheErrorsOfABlock) {
  const PECErrorHandlerBlock kept = tracing();
  handler_->setErrorHandlerBlock(kept);
  handler_->setErrorCount(40);
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {
              logError();
              LUMLogAt(LUMLogLevelError, "no error"_s);
              logError();
            }),
            2);
  EXPECT_EQ(handler_->errorHandlerBlock(), kept);
  EXPECT_EQ(handler_->errorCount(), 42);
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {}), 0);
  EXPECT_THAT(trace_.events(), IsEmpty());
}

TEST_F(PECErrorHandlerTest, RaisesNothingWhileItCountsAndRaisesAgainAfterwards) {
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([&] {
              EXPECT_TRUE(handler_->errorHandlerBlock());
              logError();
            }),
            1);
  EXPECT_FALSE(handler_->errorHandlerBlock());
  testing::internal::CaptureStderr();
  EXPECT_THROW(logError(), rt::InternalInconsistencyException);
  testing::internal::GetCapturedStderr();
}

TEST_F(PECErrorHandlerTest, CountsWithinWhatIsCounted) {
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {
              logError();
              EXPECT_EQ(PECErrorHandler::errorCountInBlock([] { logError(); }), 1);
              logError();
            }),
            3);
}

TEST_F(PECErrorHandlerTest, CountsOverTheEndOfTheNumbers) {
  handler_->setErrorCount(std::numeric_limits<std::int32_t>::max());
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {
              logError();
              logError();
            }),
            2);
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([&] { handler_->setErrorCount(0); }),
            std::numeric_limits<std::int32_t>::max());
}

// On purpose: what a block throws leaves the callback that does nothing behind.
TEST_F(PECErrorHandlerTest, PutsNothingBackWhereABlockThrows) {
  struct Thrown {};
  handler_->setErrorHandlerBlock(tracing());
  EXPECT_THROW(PECErrorHandler::errorCountInBlock([] {
                 logError();
                 throw Thrown();
               }),
               Thrown);
  logError();
  EXPECT_THAT(trace_.events(), IsEmpty());
  EXPECT_EQ(handler_->errorCount(), 2);
  EXPECT_TRUE(handler_->errorHandlerBlock());
}

// Counting waits for nobody: a callback that is running holds up only those that report.
TEST_F(PECErrorHandlerTest, CountsWhileACallbackRuns) {
  std::latch isRunning(1);
  std::latch mayReturn(1);
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>&) {
    isRunning.count_down();
    mayReturn.wait();
  });
  std::thread reporter([] { logError(); });
  isRunning.wait();
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {}), 0);
  mayReturn.count_down();
  reporter.join();
}

// The name and the reason of what `body` throws.
template <class Body>
std::pair<std::string, std::string> thrownBy(Body body) {
  try {
    body();
  } catch (const rt::Exception& exception) {
    return {string(exception.name()), string(exception.reason())};
  }
  return {"nothing", ""};
}

TEST_F(PECErrorHandlerTest, AssertsThatABlockReportsAnError) {
  EXPECT_EQ(thrownBy([] { PECErrorHandler::assertBlockReportsError([] {}); }),
            std::make_pair(std::string("Assertion Failed!"),
                           std::string("\n\n     ") + kFace + "     Expected block to report an error!\n\n"));
  EXPECT_NO_THROW(PECErrorHandler::assertBlockReportsError([] { logError(); }));
  EXPECT_NO_THROW(PECErrorHandler::assertBlockReportsError([] {
    logError();
    logError();
  }));
  EXPECT_FALSE(handler_->errorHandlerBlock());
}

TEST_F(PECErrorHandlerTest, AssertsThatABlockReportsNoError) {
  EXPECT_EQ(
      thrownBy([] { PECErrorHandler::assertBlockDoesNotReportError([] { logError(); }); }),
      std::make_pair(std::string("Assertion Failed!"),
                     std::string("\n\n     ") + kFace + "     Expected block to report no errors!\n\n"));
  EXPECT_NO_THROW(
      PECErrorHandler::assertBlockDoesNotReportError([] { LUMLogAt(LUMLogLevelError, "no error"_s); }));
  EXPECT_FALSE(handler_->errorHandlerBlock());
}

// A count that has gone down is neither no error nor some.
TEST_F(PECErrorHandlerTest, AssertsNothingWhereABlockCountsDown) {
  EXPECT_NO_THROW(PECErrorHandler::assertBlockReportsError([&] { handler_->setErrorCount(-1); }));
  EXPECT_NO_THROW(PECErrorHandler::assertBlockDoesNotReportError([&] { handler_->setErrorCount(-2); }));
}

}  // namespace
