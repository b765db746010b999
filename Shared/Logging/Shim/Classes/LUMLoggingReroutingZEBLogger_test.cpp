#include "Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdarg>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "Foundation/ZEBLogBasicFormatter.h"
#include "Foundation/ZEBLogNoFilter.h"
#include "Foundation/ZEBLoggerMacroHelpers.h"
#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Queues/Queue.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "tests/support/FirstSymbol.h"

namespace {

using namespace rt::literals;
using testing::HasSubstr;

class Recorder final : public rt::Implements<Recorder, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override { messages.push_back(message); }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }

  std::vector<rt::Ref<LUMLogMessage>> messages;
};

// Records the questions that it is asked.
class StackFilter final : public rt::Implements<StackFilter, rt::Object, ZEBLogFilter> {
 public:
  bool filterAllowsMessage(const rt::String& message, ZEBLogLevel level) override {
    questions.emplace_back(std::string(message.view()), level);
    return answer;
  }

  bool answer = true;
  std::vector<std::pair<std::string, ZEBLogLevel>> questions;
};

class ReroutingTest : public testing::Test {
 protected:
  ReroutingTest() { multiplexer_->addSyncLogger(recorder_); }

  const LUMLogMessage& last() const { return *recorder_->messages.back(); }

  void logInternal(const char* func, const rt::String* format, ZEBLogLevel level, ...) {
    std::va_list arguments;
    va_start(arguments, level);
    logger_->logInternalFunc(func, *format, arguments, level);
    va_end(arguments);
  }
  void logAt(ZEBLogLevel level) {
    const rt::String text = "text"_s;
    logInternal(nullptr, &text, level);
  }

  const rt::Ref<LUMLogMultiplexer> multiplexer_ = LUMLogMultiplexer::initWithSystemLogger(nullptr);
  const rt::Ref<Recorder> recorder_ = rt::make<Recorder>();
  const rt::Ref<LUMLoggingReroutingZEBLogger> logger_ =
      LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(multiplexer_);
};

TEST_F(ReroutingTest, NeedsAMultiplexer) {
  EXPECT_FALSE(LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(nullptr));
  EXPECT_FALSE(LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(nullptr, rt::make<ZEBLogNoFilter>()));
  EXPECT_TRUE(LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(multiplexer_, nullptr));
}

TEST_F(ReroutingTest, MakesAMessageOfACall) {
  logger_->logInfo("%@ has %d entries"_s, "a"_s, 3);
  ASSERT_EQ(recorder_->messages.size(), 1U);
  EXPECT_EQ(last().level(), LUMLogLevelInfo);
  EXPECT_EQ(last().format(), "%@ has %d entries");
  EXPECT_EQ(last().formattedString(), "a has 3 entries");
  EXPECT_TRUE(last().file().isNull());
  EXPECT_TRUE(last().function().isNull());
  EXPECT_EQ(last().line(), 0U);
  EXPECT_EQ(last().dispatchQueueLabel(), "");
  EXPECT_FALSE(last().callstack());
  EXPECT_FALSE(last().safeParameters());
  EXPECT_FALSE(last().logMetadata());
}

TEST_F(ReroutingTest, MapsLevels) {
  logger_->logDebug("text");
  logger_->logInfo("text");
  logger_->logError("text");
  logger_->logAssert("text");
  logger_->logFuncDebug("f", "text");
  logger_->logFuncInfo("f", "text");
  logger_->logFuncError("f", "text");
  logger_->logFuncAssert("f", "text");
  for (ZEBLogLevel level = 1; level <= 4; ++level) logger_->logMessage("text"_s, level);
  std::vector<LUMLogLevel> levels;
  for (const auto& message : recorder_->messages) levels.push_back(message->level());
  EXPECT_THAT(levels, testing::ElementsAre(1, 2, 3, 4, 1, 2, 3, 4, 1, 2, 3, 4));
}

TEST_F(ReroutingTest, PromotesUnknownLevelsToFault) {
  for (const ZEBLogLevel level : {0, 5, 7, -1, 1000}) {
    logAt(level);
    EXPECT_EQ(last().level(), LUMLogLevelFault) << level;
  }
  // The base class drops these before they get here.
  const std::size_t count = recorder_->messages.size();
  logger_->logMessage("text"_s, 0);
  logger_->logMessage("text"_s, 5);
  EXPECT_EQ(recorder_->messages.size(), count);
}

TEST_F(ReroutingTest, RecordsTheFunctionButNeitherFileNorLine) {
  logger_->logFuncError("-[A b]", "%d", 1);
  EXPECT_EQ(last().function(), "-[A b]");
  EXPECT_TRUE(last().file().isNull());
  EXPECT_EQ(last().line(), 0U);
  logger_->logFuncError("a\xFF", "%d", 1);
  EXPECT_TRUE(last().function().isNull());
  logger_->logFuncError(nullptr, "%d", 1);
  EXPECT_TRUE(last().function().isNull());
}

TEST_F(ReroutingTest, RecordsThreadAndQueue) {
  std::thread([&] {
    rt::Thread::setCurrentName("Importer"_s);
    logger_->logInfo("text");
  }).join();
  EXPECT_EQ(last().threadName(), "Importer");
  rt::make<rt::Queue>("Letters"_s)->sync([&] { logger_->logInfo("text"); });
  EXPECT_EQ(last().dispatchQueueLabel(), "Letters");
}

TEST_F(ReroutingTest, KeepsNoSafeParameters) {
  logger_->logMessage("100 %@"_s, ZEBLogLevelInfo);
  EXPECT_EQ(last().format(), "%@");
  EXPECT_EQ(last().formattedString(), "100 %@");
  EXPECT_FALSE(last().safeParameters());
}

TEST_F(ReroutingTest, CapturesCallStacksFromTheLevelErrorOn) {
  logger_->logDebug("text");
  EXPECT_FALSE(last().callstack());
  logger_->logInfo("text");
  EXPECT_FALSE(last().callstack());
  logger_->logError("text");
  EXPECT_TRUE(rt::cast<LUMLogAddressCallstack>(last().callstack()));
  logger_->logAssert("text");
  EXPECT_TRUE(rt::cast<LUMLogAddressCallstack>(last().callstack()));
  // The filter gets the level as given: 0 is not promoted for it, and 7 is not one of its levels.
  logAt(0);
  EXPECT_FALSE(last().callstack());
  logAt(7);
  EXPECT_FALSE(last().callstack());
}

TEST_F(ReroutingTest, CapturesCallStacksAsTheMultiplexerIsSet) {
  multiplexer_->setCaptureCallStackAddresses(false);
  logger_->logError("text");
  EXPECT_TRUE(rt::cast<LUMLogSymbolCallstack>(last().callstack()));
  multiplexer_->setCaptureCallStack(false);
  logger_->logError("text");
  EXPECT_FALSE(last().callstack());
}

TEST_F(ReroutingTest, AsksItsFilterForCallStacks) {
  const rt::Ref<StackFilter> filter = rt::make<StackFilter>();
  const auto logger = LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(multiplexer_, filter);
  logger->logDebug("%d", 1);
  EXPECT_TRUE(last().callstack());
  filter->answer = false;
  logger->logAssert("%d", 2);
  EXPECT_FALSE(last().callstack());
  EXPECT_THAT(filter->questions, testing::ElementsAre(std::pair("1", 1), std::pair("2", 4)));

  LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(multiplexer_, nullptr)->logAssert("%d", 3);
  EXPECT_FALSE(last().callstack());
}

// A multiplexer without switches for call stacks.
class PlainMultiplexer final : public rt::Implements<PlainMultiplexer, rt::Object, LUMLogMultiplexing> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override { messages.push_back(message); }
  void addLogFilter(const rt::Ref<LUMLogFilter>& /*filter*/) override {}
  void removeLogFilter(const rt::Ref<LUMLogFilter>& /*filter*/) override {}
  void addSyncLogger(const rt::Ref<LUMSyncLogger>& /*logger*/) override {}
  void removeSyncLogger(const rt::Ref<LUMSyncLogger>& /*logger*/) override {}
  void addAsyncLogger(const rt::Ref<LUMAsyncLogger>& /*logger*/) override {}
  void removeAsyncLogger(const rt::Ref<LUMAsyncLogger>& /*logger*/) override {}

  std::vector<rt::Ref<LUMLogMessage>> messages;
};

TEST_F(ReroutingTest, CapturesNoCallStackForAMultiplexerWithoutSwitches) {
  const rt::Ref<PlainMultiplexer> plain = rt::make<PlainMultiplexer>();
  LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(plain)->logError("text");
  ASSERT_EQ(plain->messages.size(), 1U);
  EXPECT_FALSE(plain->messages[0]->callstack());
}

[[gnu::noinline]] void functionThatLogs(ZEBLogger& logger) {
  logger.logError("%d", 1);
}

TEST_F(ReroutingTest, CallStacksBeginWithTheCallingFunction) {
  functionThatLogs(*logger_);
  EXPECT_THAT(firstSymbolOf(last()), HasSubstr("functionThatLogs("));
  multiplexer_->setCaptureCallStackAddresses(false);
  functionThatLogs(*logger_);
  EXPECT_THAT(firstSymbolOf(last()), HasSubstr("functionThatLogs("));
}

TEST_F(ReroutingTest, HasNoPieces) {
  EXPECT_FALSE(logger_->writer());
  EXPECT_FALSE(logger_->formatter());
  EXPECT_FALSE(logger_->filter());
  EXPECT_NO_THROW(logger_->setWriter(nullptr));
  EXPECT_NO_THROW(logger_->setFormatter(nullptr));
  EXPECT_NO_THROW(logger_->setFilter(nullptr));
  EXPECT_FALSE(logger_->writer());
  EXPECT_FALSE(logger_->formatter());
  EXPECT_FALSE(logger_->filter());
}

// Records a failure and lets the program go on.
class Notes final : public rt::Implements<Notes, rt::AssertionHandler> {
 public:
  void handleFailureInFunction(const rt::String& function, const rt::String& file, std::uint64_t lineNumber,
                               const rt::String& description) override {
    lines.push_back(std::string(function.view()) + "|" + std::string(file.view()) + "|" +
                    std::to_string(lineNumber) + "|" + std::string(description.view()));
  }

  std::vector<std::string> lines;
};

TEST_F(ReroutingTest, FailsAnAssertionIfAPieceIsSet) {
  const rt::Ref<Notes> notes = rt::make<Notes>();
  rt::AssertionHandler::setCurrentHandler(notes);
  logger_->setWriter(ZEBLogger::logger());
  logger_->setFormatter(rt::make<ZEBLogBasicFormatter>());
  logger_->setFilter(rt::make<ZEBLogNoFilter>());
  rt::AssertionHandler::setCurrentHandler(nullptr);
  const std::string file = "|Shared/Logging/Shim/Classes/LUMLoggingReroutingZEBLogger|";
  EXPECT_THAT(notes->lines,
              testing::ElementsAre("-[LUMLoggingReroutingZEBLogger setWriter:]" + file +
                                       "118|ZEBLogWriter won't be used by LUMLoggingReroutingZEBLogger.",
                                   "-[LUMLoggingReroutingZEBLogger setFormatter:]" + file +
                                       "127|ZEBLogFormatter won't be used by LUMLoggingReroutingZEBLogger.",
                                   "-[LUMLoggingReroutingZEBLogger setFilter:]" + file +
                                       "136|ZEBLogFilter won't be used by LUMLoggingReroutingZEBLogger."));
  EXPECT_FALSE(logger_->writer());
  EXPECT_FALSE(logger_->formatter());
  EXPECT_FALSE(logger_->filter());
  // The default handler throws.
  EXPECT_THROW(logger_->setWriter(ZEBLogger::logger()), rt::InternalInconsistencyException);
}

class Thrower final : public rt::Implements<Thrower, rt::Object> {
 public:
  rt::String description() const override { throw std::runtime_error("no description"); }
};

TEST_F(ReroutingTest, LogsNothingIfTheTextCannotBeMade) {
  EXPECT_NO_THROW(logger_->logError("%@", rt::make<Thrower>()));
  EXPECT_TRUE(recorder_->messages.empty());
  logger_->logError("the next");
  EXPECT_EQ(recorder_->messages.size(), 1U);
}

class ThrowingLogger final : public rt::Implements<ThrowingLogger, rt::Object, LUMSyncLogger> {
 public:
  void logWithMessage(const rt::Ref<LUMLogMessage>& /*message*/) override {
    throw std::runtime_error("full");
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
};

TEST_F(ReroutingTest, ThrowsWhatALoggerThrows) {
  multiplexer_->addSyncLogger(rt::make<ThrowingLogger>());
  EXPECT_THROW(logger_->logInfo("text"), std::runtime_error);
}

TEST_F(ReroutingTest, SendsAssertsToTheErrorHandler) {
  PECErrorHandler::register_();
  std::vector<std::string> errors;
  PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(
      [&](const rt::Ref<PECErrorDescription>& error) { errors.emplace_back(error->errorMessage().view()); });
  const auto logger =
      LUMLoggingReroutingZEBLogger::initWithLogMultiplexer(LUMLogMultiplexer::sharedInstance());
  logger->logInfo("%d", 1);
  logger->logAssert("%d", 2);
  EXPECT_THAT(errors, testing::ElementsAre("2"));
  PECErrorHandler::resetAfterTest();
}

TEST_F(ReroutingTest, MayBeTheSharedLogger) {
  ZEBLogger::setSharedLogger(logger_);
  ZEBLogError("%@ has no entries", "a"_s);
  EXPECT_EQ(last().formattedString(), "a has no entries");
  EXPECT_THAT(std::string(last().function().view()), HasSubstr("TestBody"));
  ZEBLogger::setSharedLogger(nullptr);
}

}  // namespace
