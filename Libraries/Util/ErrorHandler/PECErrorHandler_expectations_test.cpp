// Tests how a host's tests check whether errors are reported: by counts and expectations.

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

TEST_F(PECErrorHandlerTest, ResetsCallbackAndCountAfterATest) {
  handler_->setErrorHandlerBlock(tracing());
  logError();
  PECErrorHandler::resetAfterTest();
  EXPECT_FALSE(handler_->errorHandlerBlock());
  EXPECT_EQ(handler_->errorCount(), 0);
  handler_->registerErrorHandlerBlock(tracing());  // Accepted as the first callback.
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

TEST_F(PECErrorHandlerTest, FailsNoAssertionWhileItCounts) {
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

TEST_F(PECErrorHandlerTest, CountsMayNest) {
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {
              logError();
              EXPECT_EQ(PECErrorHandler::errorCountInBlock([] { logError(); }), 1);
              logError();
            }),
            3);
}

TEST_F(PECErrorHandlerTest, CountsAcrossIntegerOverflow) {
  handler_->setErrorCount(std::numeric_limits<std::int32_t>::max());
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([] {
              logError();
              logError();
            }),
            2);
  EXPECT_EQ(PECErrorHandler::errorCountInBlock([&] { handler_->setErrorCount(0); }),
            std::numeric_limits<std::int32_t>::max());
}

// Deliberate: if a block throws, the callback that does nothing stays set.
TEST_F(PECErrorHandlerTest, KeepsTheEmptyCallbackIfABlockThrows) {
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

// Counting does not wait. A running callback delays only the threads that report.
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

// Returns the name and the reason of the exception that `body` throws.
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

// A count that has decreased meets both expectations.
TEST_F(PECErrorHandlerTest, AssertsNothingIfTheCountDecreases) {
  EXPECT_NO_THROW(PECErrorHandler::assertBlockReportsError([&] { handler_->setErrorCount(-1); }));
  EXPECT_NO_THROW(PECErrorHandler::assertBlockDoesNotReportError([&] { handler_->setErrorCount(-2); }));
}

}  // namespace
