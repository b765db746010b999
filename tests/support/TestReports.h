#pragma once

/// Records the misuse that the libraries report during its lifetime. Meanwhile the error callback does
/// nothing, and no message reaches the system's log.
///
///     TestReports reports;
///     SRLClassType::initWithClass(nullptr);
///     EXPECT_THAT(reports.texts(), ElementsAre("SRLClassType's concreteClass must not be nil."));
///
/// Threads: not thread-safe. Only one thread may report.
///
/// Not for: anything but tests.

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSafeParameter.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "tests/support/TestLoggers.h"

class TestReports {
 public:
  TestReports() {
    static const bool isSystemLogQuiet = [] {
      LUMLogMultiplexer::sharedInstance()->addSyncLogger(
          LUMSystemLogger::initWithFilter(LUMLogDropAllFilter::init()));
      return true;
    }();
    static_cast<void>(isSystemLogQuiet);
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger_);
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock([](const rt::Ref<PECErrorDescription>&) {});
  }
  TestReports(const TestReports&) = delete;
  TestReports& operator=(const TestReports&) = delete;
  ~TestReports() {
    LUMLogMultiplexer::sharedInstance()->removeSyncLogger(logger_);
    PECErrorHandler::resetAfterTest();
  }

  /// Returns the messages since the last call of `messages` or `texts`.
  std::vector<rt::Ref<LUMLogMessage>> messages() { return std::exchange(messages_, {}); }

  /// Returns the texts of the faults among these messages.
  std::vector<std::string> texts() {
    std::vector<std::string> texts;
    for (const rt::Ref<LUMLogMessage>& message : messages()) {
      if (message->level() == LUMLogLevelFault) texts.push_back(text(*message));
    }
    return texts;
  }

 private:
  std::vector<rt::Ref<LUMLogMessage>> messages_;
  const rt::Ref<LUMSyncLogger> logger_ = rt::make<TestSyncLogger>(
      [this](const rt::Ref<LUMLogMessage>& message) { messages_.push_back(message); });
};

/// Returns how many parameters the message keeps as safe parameters of type 1.
inline std::int32_t countOfSafeParameters(const LUMLogMessage& message) {
  if (!message.safeParameters()) return 0;
  std::int32_t count = 0;
  for (const auto& entry : *message.safeParameters()) {
    const auto* parameter = rt::cast<LUMSafeParameter>(entry.second.get());
    if (parameter != nullptr && parameter->type() == 1) ++count;
  }
  return count;
}
