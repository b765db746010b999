#pragma once

// A fixture for the tests of the error handler. Each test begins with the handler in its initial state. Its
// callbacks trace the errors.

#include <gtest/gtest.h>

#include <string>
#include <utility>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "tests/support/TestLoggers.h"

// The face in the banner, as UTF-8.
inline constexpr const char* kFace = "\x3c\x28\xe2\x80\xa2\xcc\x80\x5f\xe2\x80\xa2\xcc\x81\x29\x3e";

inline std::string string(const rt::String& text) {
  return text ? std::string(text.view()) : "(null)";
}

inline void logError(const rt::String& text = rt::String::fromUTF8("wrong")) {
  LUMLogMultiplexer::sharedInstance()->logWithMessage(messageWith(LUMLogLevelFault, text));
}

// Keeps the errors of these tests out of the system's log.
inline void silenceSystemLog() {
  LUMLogMultiplexer::sharedInstance()->addSyncLogger(
      LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
}

class PECErrorHandlerTest : public testing::Test {
 protected:
  static void SetUpTestSuite() { silenceSystemLog(); }

  void SetUp() override {
    PECErrorHandler::register_();
    PECErrorHandler::resetAfterTest();
  }
  void TearDown() override {
    rt::AssertionHandler::setCurrentHandler(nullptr);
    PECErrorHandler::resetAfterTest();
  }

  // Returns a callback that traces `name` and the error's text.
  PECErrorHandlerBlock tracing(std::string name = "") {
    return [this, name = std::move(name)](const rt::Ref<PECErrorDescription>& error) {
      trace_.add(name + string(error->errorMessage()));
    };
  }

  const rt::Ref<PECErrorHandler> handler_ = PECErrorHandler::sharedInstance();
  Trace trace_;
};
