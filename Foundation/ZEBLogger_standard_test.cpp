// Tests the factories' loggers and the shared logger.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <utility>

#include "Foundation/ZEBLogLevelFilter.h"
#include "Foundation/ZEBLogStandardFormatter.h"
#include "Foundation/ZEBLogger.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "tests/support/ZEBLoggerTest.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::MatchesRegex;

// Factories.

TEST_F(ZEBLoggerTest, MakesStandardLoggers) {
  const std::pair<rt::Ref<ZEBLogger>, rt::Ref<rt::FileHandle>> cases[] = {
      {ZEBLogger::standardLogger(), rt::FileHandle::standardOutput()},
      {ZEBLogger::standardLoggerWithStderr(), rt::FileHandle::standardError()}};
  for (const auto& [logger, handle] : cases) {
    ASSERT_TRUE(logger);
    EXPECT_EQ(fileHandleOf(*logger), handle);
    EXPECT_TRUE(isA<ZEBLogStandardFormatter>(logger->formatter()));
    EXPECT_TRUE(isA<ZEBLogLevelFilter>(logger->filter()));
  }
}

constexpr const char* kErrorLine =
    R"([0-9]+-[0-9]+-[0-9]+ [0-9]+:[0-9]+:[0-9]+\.[0-9]+ ZEBLogger_standard_test\[[0-9]+/0x[0-9a-f]+\] \[lvl=3\] \(unknown\) error 7)";

TEST_F(ZEBLoggerTest, WritesOnlyErrorsUnlessVerbose) {
  const auto logger = ZEBLogger::standardLogger();
  testing::internal::CaptureStdout();
  logger->logDebug("debug"_s);
  logger->logInfo("info"_s);
  logger->logError("error %d"_s, 7);
  EXPECT_THAT(testing::internal::GetCapturedStdout(), MatchesRegex(std::string(kErrorLine) + "\n"));
}

TEST_F(ZEBLoggerTest, SplitsLinesBetweenBothStreams) {
  setenv("ZEBVerboseLogging", " yes ", 1);
  const auto logger = ZEBLogger::standardLoggerWithStdoutAndStderr();
  ASSERT_TRUE(logger);
  EXPECT_TRUE(isA<ZEBLogStandardFormatter>(logger->formatter()));
  EXPECT_TRUE(isA<ZEBLogLevelFilter>(logger->filter()));
  EXPECT_TRUE(isA<ZEBLogger>(logger->writer()));
  testing::internal::CaptureStdout();
  testing::internal::CaptureStderr();
  logger->logDebug("debug"_s);
  logger->logInfo("100%% %@"_s, "info"_s);
  logger->logError("error %d"_s, 7);
  logger->logAssert("assert"_s);
  EXPECT_THAT(testing::internal::GetCapturedStdout(),
              MatchesRegex("[^\n]*\\[lvl=2\\] \\(unknown\\) 100% info\n"));
  EXPECT_THAT(testing::internal::GetCapturedStderr(),
              MatchesRegex(std::string(kErrorLine) + "\n[^\n]*\\[lvl=4\\] \\(unknown\\) assert\n"));
}

// These levels pass the filter, but no operation logs at them. They are written nowhere, because a logger
// that is used as a writer takes only four levels.
TEST_F(ZEBLoggerTest, DropsLinesOfLevelsThatNoOperationLogsAt) {
  const auto logger = ZEBLogger::standardLoggerWithStdoutAndStderr();
  const auto log = [&](ZEBLogLevel level, ...) {
    std::va_list arguments;
    va_start(arguments, level);
    logger->logInternalFunc(nullptr, "line"_s, arguments, level);
    va_end(arguments);
  };
  testing::internal::CaptureStdout();
  testing::internal::CaptureStderr();
  log(0);
  log(5);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "");
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}

TEST_F(ZEBLoggerTest, WritesToAFile) {
  std::ofstream(path()) << "before\n";
  const auto logger = ZEBLogger::standardLoggerWithPath(pathText());
  ASSERT_TRUE(logger);
  logger->logError("error %d"_s, 7);
  EXPECT_THAT(contents(), MatchesRegex("before\n" + std::string(kErrorLine) + "\n"));
  const mode_t before = umask(0);
  EXPECT_TRUE(ZEBLogger::standardLoggerWithPath(pathText("new")));
  umask(before);
  EXPECT_EQ(static_cast<unsigned>(fs::status(path("new")).permissions()), 0644U);
}

TEST_F(ZEBLoggerTest, IsNullForAFileThatCannotBeOpened) {
  EXPECT_FALSE(ZEBLogger::standardLoggerWithPath(nullptr));
  EXPECT_FALSE(ZEBLogger::standardLoggerWithPath(""_s));
  EXPECT_FALSE(ZEBLogger::standardLoggerWithPath(pathText("no/file")));
  EXPECT_FALSE(ZEBLogger::standardLoggerWithPath(rt::String::fromUTF8(path().parent_path().c_str())));
}

TEST_F(ZEBLoggerTest, BecomesVerboseWhileItRuns) {
  const auto logger = ZEBLogger::standardLogger();
  logger->setWriter(recorder_);
  logger->setFormatter(nullptr);
  const auto defaults = rt::UserDefaults::standardUserDefaults();
  logger->logInfo("before"_s);
  defaults->setBool(true, "ZEBVerboseLogging");
  logger->logInfo("verbose"_s);
  logger->logDebug("never"_s);
  defaults->remove("ZEBVerboseLogging");
  logger->logInfo("after"_s);
  EXPECT_THAT(recorder_->lines(), ElementsAre("2 verbose"));
}

// The shared logger.

TEST_F(ZEBLoggerTest, SharesAStandardLoggerByDefault) {
  const auto logger = ZEBLogger::sharedLogger();
  ASSERT_TRUE(logger);
  EXPECT_EQ(ZEBLogger::sharedLogger(), logger);
  EXPECT_EQ(fileHandleOf(*logger), rt::FileHandle::standardOutput());
  EXPECT_TRUE(isA<ZEBLogStandardFormatter>(logger->formatter()));
  EXPECT_TRUE(isA<ZEBLogLevelFilter>(logger->filter()));
  const auto other = recordingLogger();
  ZEBLogger::setSharedLogger(other);
  EXPECT_EQ(ZEBLogger::sharedLogger(), other);
  ZEBLogger::setSharedLogger(nullptr);
  EXPECT_TRUE(isA<ZEBLogStandardFormatter>(ZEBLogger::sharedLogger()->formatter()));
}

TEST_F(ZEBLoggerTest, APreviousSharedLoggerStaysUsable) {
  ZEBLogger::setSharedLogger(recordingLogger());
  const auto held = ZEBLogger::sharedLogger();
  ZEBLogger::setSharedLogger(nullptr);
  held->logError("still there"_s);
  EXPECT_THAT(recorder_->lines(), ElementsAre("3 still there"));
}

// This would deadlock if the old logger were released under the class's lock.
TEST_F(ZEBLoggerTest, ReleasesTheOldSharedLoggerWithoutALock) {
  const auto filter = rt::make<FunctionFilter>();
  filter->detaching = [&] { std::thread([] { ZEBLogger::sharedLogger(); }).join(); };
  ZEBLogger::setSharedLogger(ZEBLogger::loggerWithWriter(recorder_, nullptr, filter));
  ZEBLogger::setSharedLogger(recordingLogger());
}

// Making the first shared logger may report a malformed file of user defaults, and the report may log. The
// test needs a process of its own, because in this one another thread that watches the file may report first.
TEST(ZEBLoggerDeathTest, SharedLoggerMayBeUsedWhileItIsBeingMade) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  const auto ask = [] {
    std::ofstream(privateDefaults.file()) << "not a setting\n";
    rt::Ref<ZEBLogger> inner;
    rt::UserDefaults::setReportHandler([&](const rt::String&) { inner = ZEBLogger::sharedLogger(); });
    const auto outer = ZEBLogger::sharedLogger();
    std::exit(inner != nullptr && inner == outer ? 0 : 1);
  };
  EXPECT_EXIT(ask(), testing::ExitedWithCode(0), "");
  fs::remove(privateDefaults.file());
}
}  // namespace
