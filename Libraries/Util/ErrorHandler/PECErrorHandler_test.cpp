// Tests what the handler receives, passes on and counts. Tests that need a process without any report so far
// are death tests, which start a new process.

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <latch>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Process/AssertionHandler.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSystemLogger.h"
#include "Shared/Logging/Loggers/Testing/LUMLogMatchers.h"
#include "tests/support/AtEnd.h"
#include "tests/support/PECErrorHandlerTest.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using namespace LUMLogMatchers;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

Ref<LUMLogMessage> errorMessage(const rt::String& file = "a/b/c.m"_s) {
  return LUMLogMessage::initWithLevel(LUMLogLevelFault, "%@ is wrong"_s, "this is wrong"_s, file, "-[A b]"_s,
                                      17, nullptr, nullptr, nullptr, nullptr, nullptr);
}

// Records failed assertions and returns.
class Recorder final : public rt::Implements<Recorder, rt::AssertionHandler> {
 public:
  struct Failure {
    rt::String function;
    rt::String file;
    std::uint64_t lineNumber;
    rt::String description;
  };

  void handleFailureInFunction(const rt::String& function, const rt::String& file, std::uint64_t lineNumber,
                               const rt::String& description) override {
    failures.push_back({function, file, lineNumber, description});
  }

  std::vector<Failure> failures;
};

TEST(PECErrorDescription, HoldsWhatIsSet) {
  const auto error = rt::make<PECErrorDescription>();
  EXPECT_EQ(error->filePath(), nullptr);
  EXPECT_EQ(error->functionName(), nullptr);
  EXPECT_EQ(error->lineNumber(), 0U);
  EXPECT_EQ(error->rawFormatString(), nullptr);
  EXPECT_EQ(error->errorMessage(), nullptr);
  error->setFilePath("a"_s);
  error->setFunctionName("b"_s);
  error->setLineNumber(std::numeric_limits<std::uint64_t>::max());
  error->setRawFormatString("c"_s);
  error->setErrorMessage("d"_s);
  EXPECT_EQ(error->filePath(), "a");
  EXPECT_EQ(error->functionName(), "b");
  EXPECT_EQ(error->lineNumber(), std::numeric_limits<std::uint64_t>::max());
  EXPECT_EQ(error->rawFormatString(), "c");
  EXPECT_EQ(error->errorMessage(), "d");
}

// A handler by itself.

TEST_F(PECErrorHandlerTest, StartsWithoutCallbackAndErrors) {
  const Ref<PECErrorHandler> handler = PECErrorHandler::init();
  EXPECT_FALSE(handler->errorHandlerBlock());
  EXPECT_EQ(handler->errorCount(), 0);
  EXPECT_NE(handler, PECErrorHandler::sharedInstance());
}

TEST_F(PECErrorHandlerTest, IsASyncLoggerForFaultsAndHigherLevels) {
  const Ref<PECErrorHandler> handler = PECErrorHandler::init();
  EXPECT_NE(rt::cast<LUMSyncLogger>(handler.get()), nullptr);
  const Ref<LUMLogFilter> filter = handler->filter();
  EXPECT_NE(rt::cast<LUMLogMinimumLevelFilter>(filter.get()), nullptr);
  EXPECT_EQ(handler->filter(), filter);
  for (LUMLogLevel level = 0; level <= 6; ++level) {
    EXPECT_EQ(filter->allowLogMessage(*messageWith(level)), level >= 4) << level;
  }
  EXPECT_TRUE(filter->allowLogMessage(*messageWith(std::numeric_limits<LUMLogLevel>::max())));
}

TEST_F(PECErrorHandlerTest, DescribesTheMessage) {
  const Ref<PECErrorHandler> handler = PECErrorHandler::init();
  Ref<PECErrorDescription> told;
  handler->setErrorHandlerBlock([&](const Ref<PECErrorDescription>& error) { told = error; });
  handler->logWithMessage(errorMessage());
  ASSERT_NE(told, nullptr);
  EXPECT_EQ(told->filePath(), "a/b/c.m");
  EXPECT_EQ(told->functionName(), "-[A b]");
  EXPECT_EQ(told->lineNumber(), 17U);
  EXPECT_EQ(told->rawFormatString(), "%@ is wrong");
  EXPECT_EQ(told->errorMessage(), "this is wrong");
  const Ref<PECErrorDescription> first = told;
  handler->logWithMessage(errorMessage());
  EXPECT_NE(told, first);
}

// Callbacks may nest and throw. The callbacks of other threads do not count.
TEST_F(PECErrorHandlerTest, TellsWhetherTheThreadRunsACallback) {
  struct Thrown {};
  std::vector<bool> during;
  bool ofAnother = true;
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>&) {
    during.push_back(PECErrorHandler::isCallingBack());
    std::thread([&] { ofAnother = PECErrorHandler::isCallingBack(); }).join();
    if (during.size() == 1) {
      logError();
      during.push_back(PECErrorHandler::isCallingBack());
      throw Thrown();
    }
  });
  EXPECT_FALSE(PECErrorHandler::isCallingBack());
  EXPECT_THROW(logError(), Thrown);
  EXPECT_THAT(during, ElementsAre(true, true, true));
  EXPECT_FALSE(ofAnother);
  EXPECT_FALSE(PECErrorHandler::isCallingBack());
}

TEST_F(PECErrorHandlerTest, CountsAfterTheCallbackHasReturned) {
  std::vector<std::int32_t> during;
  handler_->setErrorHandlerBlock(
      [&](const Ref<PECErrorDescription>&) { during.push_back(handler_->errorCount()); });
  logError();
  EXPECT_EQ(handler_->errorCount(), 1);
  logError();
  logError();
  EXPECT_EQ(handler_->errorCount(), 3);
  EXPECT_THAT(during, ElementsAre(0, 1, 2));
}

TEST_F(PECErrorHandlerTest, IgnoresLevelsBelowFault) {
  handler_->setErrorHandlerBlock(tracing());
  for (LUMLogLevel level = 0; level < LUMLogLevelFault; ++level) {
    LUMLogMultiplexer::sharedInstance()->logWithMessage(messageWith(level, "harmless"_s));
  }
  EXPECT_THAT(trace_.events(), IsEmpty());
  EXPECT_EQ(handler_->errorCount(), 0);
  LUMLogMultiplexer::sharedInstance()->logWithMessage(messageWith(5, "level 5"_s));
  EXPECT_THAT(trace_.events(), ElementsAre("level 5"));
  EXPECT_EQ(handler_->errorCount(), 1);
}

TEST_F(PECErrorHandlerTest, CallsBackOnTheThreadThatLogs) {
  std::thread::id teller;
  handler_->setErrorHandlerBlock(
      [&](const Ref<PECErrorDescription>&) { teller = std::this_thread::get_id(); });
  LUMLogAt(LUMLogLevelFault, "wrong"_s);
  EXPECT_EQ(teller, std::this_thread::get_id());
}

TEST_F(PECErrorHandlerTest, ThrowsWhatTheCallbackThrowsAndDoesNotCountIt) {
  struct Thrown {};
  handler_->setErrorHandlerBlock([](const Ref<PECErrorDescription>&) { throw Thrown(); });
  EXPECT_THROW(logError(), Thrown);
  EXPECT_THROW(LUMLogAt(LUMLogLevelFault, "wrong"_s), Thrown);
  EXPECT_EQ(handler_->errorCount(), 0);
  // The exception has released the lock.
  handler_->setErrorHandlerBlock(tracing());
  std::thread([] { logError("in another thread"_s); }).join();
  EXPECT_THAT(trace_.events(), ElementsAre("in another thread"));
  EXPECT_EQ(handler_->errorCount(), 1);
}

TEST_F(PECErrorHandlerTest, ACallbackMayLogErrors) {
  int depth = 0;
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>& error) {
    trace_.add("begin " + string(error->errorMessage()));
    if (++depth < 4) logError(rt::String::fromUTF8("error " + std::to_string(depth)));
    trace_.add("end, count " + std::to_string(handler_->errorCount()));
  });
  logError("error 0"_s);
  EXPECT_THAT(trace_.events(), ElementsAre("begin error 0", "begin error 1", "begin error 2", "begin error 3",
                                           "end, count 0", "end, count 1", "end, count 2", "end, count 3"));
  EXPECT_EQ(handler_->errorCount(), 4);
}

// Invariant: the callback never runs on two threads at once, and every error is counted.
TEST_F(PECErrorHandlerTest, CallsBackForOneErrorAfterAnother) {
  constexpr int kThreads = 8;
  constexpr int kErrors = 500;
  int running = 0;  // Deliberately not atomic: only the handler's promise protects it.
  int highest = 0;
  int told = 0;
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>& error) {
    highest = std::max(highest, ++running);
    ++told;
    if (told % 10 == 0) std::this_thread::yield();
    if (error->errorMessage() == "twice") logError("once"_s);
    --running;
  });
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&] {
      for (int i = 0; i < kErrors; ++i) logError(i % 10 == 0 ? "twice"_s : "wrong"_s);
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(highest, 2);  // The callback was only nested in itself.
  EXPECT_EQ(told, kThreads * kErrors * 11 / 10);
  EXPECT_EQ(handler_->errorCount(), told);
}

// Installing a callback waits for a running one, even if that one has removed itself.
TEST_F(PECErrorHandlerTest, WaitsForARunningCallbackBeforeItInstallsAnother) {
  std::latch isTold(1);
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>&) {
    handler_->setErrorHandlerBlock(nullptr);
    isTold.count_down();
    for (int i = 0; i < 1000; ++i) std::this_thread::yield();
    trace_.add("ends");
  });
  std::thread reporter([] { logError(); });
  isTold.wait();
  handler_->registerErrorHandlerBlock(tracing());
  trace_.add("installed");
  reporter.join();
  EXPECT_THAT(trace_.events(), ElementsAre("ends", "installed"));
}

// Without a callback.

TEST_F(PECErrorHandlerTest, FailsAnAssertionWithoutACallback) {
  const auto recorder = rt::make<Recorder>();
  rt::AssertionHandler::setCurrentHandler(recorder);
  handler_->logWithMessage(errorMessage());
  ASSERT_EQ(recorder->failures.size(), 1U);
  const Recorder::Failure& failure = recorder->failures.front();
  EXPECT_EQ(failure.function, "-[PECErrorHandler defaultErrorHandlerBlock]_block_invoke");
  EXPECT_EQ(failure.file, "Libraries/Util/ErrorHandler/PECErrorHandler");
  EXPECT_EQ(failure.lineNumber, 64U);
  // The format, not the formatted text.
  EXPECT_EQ(string(failure.description), std::string("\n\n\n   <<< ERROR!    ") + kFace +
                                             "    ERROR! >>>\n\n   in c.m\n   in -[A b]\n"
                                             "   Line 17 says:\n\n   %@ is wrong\n\n\n");
  // A host's assertion handler may return. The error then counts as handled.
  EXPECT_EQ(handler_->errorCount(), 1);
}

TEST_F(PECErrorHandlerTest, ShowsTheLastElementOfTheFilePath) {
  const std::vector<std::pair<rt::String, std::string>> names = {
      {"a/b/c.m"_s, "c.m"}, {"c.m"_s, "c.m"}, {"/c.m"_s, "c.m"},  {"a/b/"_s, ""},     {"a//c"_s, "c"},
      {""_s, ""},           {"/"_s, ""},      {"a\\b"_s, "a\\b"}, {nullptr, "(null)"}};
  for (const auto& [path, name] : names) {
    const auto recorder = rt::make<Recorder>();
    rt::AssertionHandler::setCurrentHandler(recorder);
    handler_->logWithMessage(errorMessage(path));
    ASSERT_EQ(recorder->failures.size(), 1U);
    EXPECT_THAT(string(recorder->failures.front().description),
                testing::HasSubstr("ERROR! >>>\n\n   in " + name + "\n   in -[A b]\n"));
  }
}

TEST_F(PECErrorHandlerTest, ShowsUnknownFieldsAsNull) {
  const auto recorder = rt::make<Recorder>();
  rt::AssertionHandler::setCurrentHandler(recorder);
  handler_->logWithMessage(LUMLogMessage::initWithLevel(LUMLogLevelFault, nullptr, nullptr, nullptr, nullptr,
                                                        std::numeric_limits<std::uint64_t>::max(), nullptr,
                                                        nullptr, nullptr, nullptr, nullptr));
  ASSERT_EQ(recorder->failures.size(), 1U);
  EXPECT_THAT(string(recorder->failures.front().description),
              testing::EndsWith("\n\n   in (null)\n   in (null)\n   Line 18446744073709551615 says:\n\n"
                                "   (null)\n\n\n"));
}

TEST_F(PECErrorHandlerTest, ThrowsWithoutACallbackAndCountsNothing) {
  testing::internal::CaptureStderr();
  bool isRaised = false;
  try {
    LUMLogAt(LUMLogLevelFault, "%@ is wrong"_s, "this"_s);
  } catch (const rt::InternalInconsistencyException& exception) {
    isRaised = true;
    EXPECT_EQ(exception.name(), rt::InternalInconsistencyException::kName);
    EXPECT_EQ(exception.lineNumber(), 64U);
    EXPECT_TRUE(exception.description().contains("%@ is wrong"));
    EXPECT_FALSE(exception.description().contains("this is wrong"));
    EXPECT_TRUE(exception.description().contains("in PECErrorHandler_test.cpp\n"));
  }
  EXPECT_THAT(testing::internal::GetCapturedStderr(), testing::HasSubstr(kFace));
  EXPECT_TRUE(isRaised);
  EXPECT_EQ(handler_->errorCount(), 0);
  // The exception has released the lock.
  handler_->setErrorHandlerBlock(tracing());
  std::thread([] { logError(); }).join();
  EXPECT_EQ(handler_->errorCount(), 1);
}

TEST_F(PECErrorHandlerTest, AlwaysReturnsTheSameDefaultCallback) {
  const PECErrorHandlerBlock block = PECErrorHandler::defaultErrorHandlerBlock();
  ASSERT_TRUE(block);
  EXPECT_EQ(block, handler_->defaultErrorHandlerBlock());
  EXPECT_EQ(block, PECErrorHandler::init()->defaultErrorHandlerBlock());
  const auto recorder = rt::make<Recorder>();
  rt::AssertionHandler::setCurrentHandler(recorder);
  block(rt::make<PECErrorDescription>());
  EXPECT_EQ(recorder->failures.size(), 1U);
  EXPECT_EQ(handler_->errorCount(), 0);
}

// Registering a callback.

TEST_F(PECErrorHandlerTest, InstallsACallback) {
  const PECErrorHandlerBlock block = tracing();
  handler_->registerErrorHandlerBlock(block);
  EXPECT_EQ(handler_->errorHandlerBlock(), block);
  logError();
  EXPECT_THAT(trace_.events(), ElementsAre("wrong"));
  EXPECT_EQ(handler_->errorCount(), 1);
}

TEST_F(PECErrorHandlerTest, KeepsTheFirstCallbackAndReportsTheSecondToIt) {
  std::vector<Ref<PECErrorDescription>> errors;
  const PECErrorHandlerBlock first = [&](const Ref<PECErrorDescription>& error) { errors.push_back(error); };
  handler_->registerErrorHandlerBlock(first);
  handler_->registerErrorHandlerBlock(tracing());
  EXPECT_EQ(handler_->errorHandlerBlock(), first);
  ASSERT_EQ(errors.size(), 1U);
  EXPECT_EQ(errors[0]->filePath(), "Libraries/Util/ErrorHandler/PECErrorHandler");
  EXPECT_EQ(errors[0]->functionName(), "-[PECErrorHandler registerErrorHandlerBlock:]");
  EXPECT_EQ(errors[0]->lineNumber(), 72U);
  EXPECT_EQ(errors[0]->rawFormatString(), "An ErrorHandlerBlock was already set!.");
  EXPECT_EQ(errors[0]->errorMessage(), "An ErrorHandlerBlock was already set!.");
  EXPECT_EQ(handler_->errorCount(), 1);
  handler_->registerErrorHandlerBlock(first);  // Registering the same callback again is an error too.
  EXPECT_EQ(errors.size(), 2U);
  EXPECT_THAT(trace_.events(), IsEmpty());
}

TEST_F(PECErrorHandlerTest, ReportsANullCallback) {
  std::vector<Ref<PECErrorDescription>> errors;
  const PECErrorHandlerBlock first = [&](const Ref<PECErrorDescription>& error) { errors.push_back(error); };
  handler_->registerErrorHandlerBlock(first);
  handler_->registerErrorHandlerBlock(nullptr);
  EXPECT_EQ(handler_->errorHandlerBlock(), first);
  ASSERT_EQ(errors.size(), 1U);
  EXPECT_EQ(errors[0]->filePath(), "Libraries/Util/ErrorHandler/PECErrorHandler");
  EXPECT_EQ(errors[0]->functionName(), "-[PECErrorHandler registerErrorHandlerBlock:]");
  EXPECT_EQ(errors[0]->lineNumber(), 70U);
  EXPECT_EQ(errors[0]->rawFormatString(), "|errorHandlerBlock| cannot be nil!.");
  EXPECT_EQ(errors[0]->errorMessage(), "|errorHandlerBlock| cannot be nil!.");
}

TEST_F(PECErrorHandlerTest, ThrowsForANullCallbackIfNoneIsSet) {
  testing::internal::CaptureStderr();
  EXPECT_THROW(handler_->registerErrorHandlerBlock(nullptr), rt::InternalInconsistencyException);
  EXPECT_THAT(
      testing::internal::GetCapturedStderr(),
      testing::HasSubstr("   in PECErrorHandler\n   in -[PECErrorHandler registerErrorHandlerBlock:]\n"
                         "   Line 70 says:\n\n   |errorHandlerBlock| cannot be nil!.\n"));
  EXPECT_FALSE(handler_->errorHandlerBlock());
  EXPECT_EQ(handler_->errorCount(), 0);
  handler_->registerErrorHandlerBlock(tracing());
  EXPECT_EQ(handler_->errorCount(), 0);
}

TEST_F(PECErrorHandlerTest, ReportsABadCallbackWithoutMetadataAndArguments) {
  const LUMLogCapture capture;
  handler_->registerErrorHandlerBlock(tracing());
  handler_->registerErrorHandlerBlock(nullptr);
  handler_->registerErrorHandlerBlock(tracing());
  EXPECT_THAT(capture.messages(), ElementsAre(HasLevel(LUMLogLevelFault), HasLevel(LUMLogLevelFault)));
  for (const Ref<LUMLogMessage>& message : capture.messages()) {
    EXPECT_EQ(message->logMetadata(), nullptr);
    EXPECT_EQ(message->safeParameters(), nullptr);
  }
}

// A hostile callback registers another one while it runs, and is then told of that error.
TEST_F(PECErrorHandlerTest, ACallbackMayInstallACallback) {
  bool isFirst = true;
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>& error) {
    trace_.add(string(error->errorMessage()));
    if (std::exchange(isFirst, false)) handler_->registerErrorHandlerBlock(tracing());
  });
  logError();
  EXPECT_THAT(trace_.events(), ElementsAre("wrong", "An ErrorHandlerBlock was already set!."));
  EXPECT_EQ(handler_->errorCount(), 2);
}

// All threads register at once. One callback is accepted, and receives an error for each of the others.
TEST_F(PECErrorHandlerTest, InstallsOneOfManyConcurrentCallbacks) {
  constexpr std::int32_t kThreads = 8;
  std::latch mayStart(kThreads);
  std::atomic<std::int32_t> told = 0;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (std::int32_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&] {
      mayStart.arrive_and_wait();
      handler_->registerErrorHandlerBlock([&](const Ref<PECErrorDescription>&) { ++told; });
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(told, kThreads - 1);
  EXPECT_EQ(handler_->errorCount(), kThreads - 1);
}

// Setting a callback and a count.

TEST_F(PECErrorHandlerTest, SetsACallbackWithoutChecks) {
  handler_->registerErrorHandlerBlock(tracing("first "));
  handler_->setErrorHandlerBlock(tracing("second "));
  logError();
  handler_->setErrorHandlerBlock(tracing("third "));
  logError();
  EXPECT_THAT(trace_.events(), ElementsAre("second wrong", "third wrong"));
  EXPECT_EQ(handler_->errorCount(), 2);
  handler_->setErrorHandlerBlock(nullptr);
  EXPECT_FALSE(handler_->errorHandlerBlock());
}

TEST_F(PECErrorHandlerTest, CountsOnFromTheCountThatIsSet) {
  handler_->setErrorHandlerBlock(tracing());
  handler_->setErrorCount(-3);
  EXPECT_EQ(handler_->errorCount(), -3);
  logError();
  EXPECT_EQ(handler_->errorCount(), -2);
  // The count is a signed 32-bit number.
  handler_->setErrorCount(std::numeric_limits<std::int32_t>::max());
  logError();
  EXPECT_EQ(handler_->errorCount(), std::numeric_limits<std::int32_t>::min());
}

// A callback that removes itself lives until it returns. Its captures used to be destroyed with the handler's
// lock held.
TEST_F(PECErrorHandlerTest, ReleasesACallbackWithoutALock) {
  bool hasReturned = false;
  int ended = 0;
  handler_->setErrorHandlerBlock([&, end = AtEnd([&] {
                                       EXPECT_TRUE(hasReturned);
                                       ++ended;
                                       std::thread([&] {
                                         handler_->setErrorHandlerBlock(tracing());
                                         logError("in another thread"_s);
                                       }).join();
                                     })](const Ref<PECErrorDescription>&) {
    handler_->setErrorHandlerBlock(nullptr);
    EXPECT_EQ(ended, 0);
    hasReturned = true;
  });
  logError();
  EXPECT_EQ(ended, 1);
  EXPECT_THAT(trace_.events(), ElementsAre("in another thread"));
}

TEST_F(PECErrorHandlerTest, ReplacesACallbackWithoutALock) {
  int ended = 0;
  const PECErrorHandlerBlock next = tracing();
  handler_->setErrorHandlerBlock([end = AtEnd([&] {
                                    ++ended;
                                    EXPECT_EQ(handler_->errorHandlerBlock(), next);
                                  })](const Ref<PECErrorDescription>&) {});
  handler_->setErrorHandlerBlock(next);
  EXPECT_EQ(ended, 1);
}

// Hostile loggers beside the handler.

TEST_F(PECErrorHandlerTest, SurvivesLoggersThatThrowLogAndRemoveThemselves) {
  struct Thrown {};
  const auto& multiplexer = LUMLogMultiplexer::sharedInstance();
  handler_->setErrorHandlerBlock([&](const Ref<PECErrorDescription>& error) {
    trace_.add(string(error->errorMessage()));
    if (error->errorMessage() == "wrong") logError("from within the callback"_s);
  });
  Ref<LUMSyncLogger> leaving;
  leaving = rt::make<TestSyncLogger>([&](const Ref<LUMLogMessage>& message) {
    if (text(*message) != "wrong") return;
    multiplexer->removeSyncLogger(leaving);
    logError("from within a logger"_s);
  });
  multiplexer->addSyncLogger(leaving);
  logError();
  EXPECT_THAT(trace_.events(),
              testing::UnorderedElementsAre("wrong", "from within the callback", "from within a logger"));
  EXPECT_EQ(handler_->errorCount(), 3);

  const auto throwing = rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) { throw Thrown(); });
  multiplexer->addSyncLogger(throwing);
  EXPECT_THROW(logError(), Thrown);
  multiplexer->removeSyncLogger(throwing);
  trace_.events();
  logError("afterwards"_s);
  EXPECT_THAT(trace_.events(), ElementsAre("afterwards"));
}

// A process without any report so far.

class PECErrorHandlerAtTheStartDeathTest : public testing::Test {
 protected:
  PECErrorHandlerAtTheStartDeathTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }

  // Ends the process with status 0 if `isTrue`, else 1.
  [[noreturn]] static void conclude(bool isTrue) { std::exit(isTrue ? 0 : 1); }
};

TEST_F(PECErrorHandlerAtTheStartDeathTest, IsNotRegisteredBeforeTheFirstReport) {
  const auto body = [] {
    silenceSystemLog();
    int told = 0;
    PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(
        [&](const Ref<PECErrorDescription>&) { ++told; });
    logError();
    const bool isDeafAtFirst = told == 0;
    PECReport({"a", "b"}, "reported"_s);
    const bool isToldOfTheFirst = told == 1;
    logError();
    conclude(isDeafAtFirst && isToldOfTheFirst && told == 2);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "");
}

// A handler that was removed from the multiplexer is not added again.
TEST_F(PECErrorHandlerAtTheStartDeathTest, IsRegisteredOnce) {
  const auto body = [] {
    silenceSystemLog();
    int told = 0;
    PECErrorHandler::register_();
    PECErrorHandler::register_();
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock([&](const Ref<PECErrorDescription>&) { ++told; });
    logError();
    const bool isToldOnce = told == 1;
    LUMLogMultiplexer::sharedInstance()->removeSyncLogger(PECErrorHandler::sharedInstance());
    PECErrorHandler::register_();
    PECReport({"a", "b"}, "reported"_s);
    conclude(isToldOnce && told == 1);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "");
}

TEST_F(PECErrorHandlerAtTheStartDeathTest, IsMadeAndRegisteredOnceByManyThreads) {
  const auto body = [] {
    silenceSystemLog();
    constexpr std::int32_t kThreads = 8;
    std::latch mayStart(kThreads);
    std::vector<std::thread> threads;
    threads.reserve(kThreads);
    std::atomic<bool> isTheSame = true;
    for (std::int32_t thread = 0; thread < kThreads; ++thread) {
      threads.emplace_back([&] {
        mayStart.arrive_and_wait();
        static std::atomic<PECErrorHandler*> first = nullptr;
        PECErrorHandler* const own = PECErrorHandler::sharedInstance().get();
        PECErrorHandler* none = nullptr;
        if (!first.compare_exchange_strong(none, own) && none != own) isTheSame = false;
        own->setErrorHandlerBlock([](const Ref<PECErrorDescription>&) {});
        PECErrorHandler::register_();
        logError();  // Received, because the handler is registered when `register_` returns.
      });
    }
    for (std::thread& thread : threads) thread.join();
    conclude(isTheSame && PECErrorHandler::sharedInstance()->errorCount() == kThreads);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "");
}

// Mistakes with callbacks are reported even if no report has registered the handler before.
TEST_F(PECErrorHandlerAtTheStartDeathTest, RegistersItselfToReportASecondCallback) {
  const auto body = [] {
    silenceSystemLog();
    int told = 0;
    PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(
        [&](const Ref<PECErrorDescription>&) { ++told; });
    PECErrorHandler::sharedInstance()->registerErrorHandlerBlock([](const Ref<PECErrorDescription>&) {});
    conclude(told == 1);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "");
}

TEST_F(PECErrorHandlerAtTheStartDeathTest, AnUncaughtReportEndsTheProgram) {
  const auto body = []() noexcept {
    silenceSystemLog();
    PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(nullptr);
  };
  EXPECT_EXIT(body(), testing::KilledBySignal(SIGABRT),
              "Assertion failed in -\\[PECErrorHandler defaultErrorHandlerBlock\\]_block_invoke, "
              "Libraries/Util/ErrorHandler/PECErrorHandler:64: ");
}

TEST_F(PECErrorHandlerAtTheStartDeathTest, CallsBackUntilTheProcessEnds) {
  const auto body = [] {
    silenceSystemLog();
    std::atexit([] { PECReport({"a", "b"}, "at exit"_s); });
    PECErrorHandler::sharedInstance()->registerErrorHandlerBlock([](const Ref<PECErrorDescription>& error) {
      std::fprintf(stderr, "told of %s.", string(error->errorMessage()).c_str());
    });
    std::exit(0);
  };
  EXPECT_EXIT(body(), testing::ExitedWithCode(0), "told of at exit\\.");
}

}  // namespace
