#include "Foundation/ZEBLogLevelFilter.h"

#include <gtest/gtest.h>

#include <climits>
#include <cstdlib>
#include <fstream>
#include <semaphore>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Foundation/ZEBLogger.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Process/AssertionHandler.h"
#include "tests/support/PrivateDefaults.h"
#include "tests/support/Process.h"

namespace {

using namespace rt::literals;

constexpr const char* kSetting = "ZEBVerboseLogging";

const PrivateDefaults privateDefaults;

class ZEBLogLevelFilterTest : public testing::Test {
 protected:
  ZEBLogLevelFilterTest() { clear(); }
  ~ZEBLogLevelFilterTest() override { clear(); }

  static void clear() {
    unsetenv(kSetting);
    std::filesystem::remove(privateDefaults.file());
  }
  static void set(const char* value) { setenv(kSetting, value, 1); }
  static void setDefault(const std::string& value) {
    std::ofstream(privateDefaults.file()) << kSetting << " = " << value << "\n";
  }

  static bool allows(ZEBLogFilter& filter, ZEBLogLevel level) {
    return filter.filterAllowsMessage("line"_s, level);
  }
};

TEST_F(ZEBLogLevelFilterTest, AllowsAllLinesExceptDebugAndInfo) {
  const auto filter = ZEBLogLevelFilter::init();
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  for (const ZEBLogLevel level : {INT_MIN, -1, 0, 3, 4, 5, INT_MAX})
    EXPECT_TRUE(allows(*filter, level)) << level;
  EXPECT_FALSE(allows(*filter, 1));
  EXPECT_FALSE(allows(*filter, 2));
}

TEST_F(ZEBLogLevelFilterTest, AllowsInfoLinesIfVerbose) {
  set("1");
  const auto filter = ZEBLogLevelFilter::init();
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  for (const ZEBLogLevel level : {INT_MIN, -1, 0, 2, 3, 4, 5, INT_MAX})
    EXPECT_TRUE(allows(*filter, level)) << level;
  EXPECT_FALSE(allows(*filter, 1));
}

TEST_F(ZEBLogLevelFilterTest, AcceptsManySpellingsInTheEnvironment) {
  for (const char* value : {"yes", "YES", " \tyes\n", "y", "Yonder", "true", "T", "tomorrow", "1", "2", "-1",
                            "+3", " 7 dwarfs", "007", "99999999999999999999"}) {
    set(value);
    EXPECT_TRUE(ZEBLogLevelFilter::init()->verboseLoggingEnabled()) << value;
  }
  for (const char* value : {"", " ", "no", "NO", "0", "-0", "000", "false", "on", "0.5", "x1", "\"yes\""}) {
    set(value);
    EXPECT_FALSE(ZEBLogLevelFilter::init()->verboseLoggingEnabled()) << value;
  }
}

TEST_F(ZEBLogLevelFilterTest, ReadsTheUserDefaultOnceItIsAttached) {
  setDefault("YES");
  const auto filter = ZEBLogLevelFilter::init();
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  filter->didAttachToLogger();
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

TEST_F(ZEBLogLevelFilterTest, PrefersTheEnvironmentToTheUserDefault) {
  setDefault("YES");
  set("no");
  const auto filter = ZEBLogLevelFilter::init();
  filter->didAttachToLogger();
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  privateDefaults.change(kSetting, "2");
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

// The variable's value at the time of reading counts, as for the user default.
TEST_F(ZEBLogLevelFilterTest, ReadsTheEnvironmentAgainWhenItIsAttached) {
  const auto filter = ZEBLogLevelFilter::init();
  set("yes");
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  filter->didAttachToLogger();
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

TEST_F(ZEBLogLevelFilterTest, FollowsTheUserDefaultFromAttachmentToDetachment) {
  const auto filter = ZEBLogLevelFilter::init();
  setDefault("YES");
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  filter->didAttachToLogger();
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  privateDefaults.change(kSetting, "NO");
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  // The file has both settings then. Another key does not matter.
  privateDefaults.change("another key", "YES", {{kSetting, "NO"}});
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  privateDefaults.change(kSetting, "YES");
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
  // The filter no longer hears of changes.
  privateDefaults.change(kSetting, "NO");
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  filter->didAttachToLogger();
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

TEST_F(ZEBLogLevelFilterTest, ReadsNothingIfAttachedAlready) {
  const auto filter = ZEBLogLevelFilter::init();
  set("yes");
  filter->didAttachToLogger();
  set("no");
  filter->didAttachToLogger();
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

TEST_F(ZEBLogLevelFilterTest, IsDetachedOnceHoweverOftenItWasAttached) {
  const auto filter = ZEBLogLevelFilter::init();
  filter->willDetachFromLogger();
  filter->didAttachToLogger();
  filter->didAttachToLogger();
  filter->willDetachFromLogger();
  privateDefaults.change(kSetting, "YES");
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

TEST_F(ZEBLogLevelFilterTest, FollowsChangesByAnotherProcess) {
  const auto filter = ZEBLogLevelFilter::init();
  const auto logger = ZEBLogger::loggerWithWriter(nullptr, nullptr, filter);
  // Observers are called in the order of their registration. So the filter has been called before this one.
  std::counting_semaphore<> changes(0);
  const auto observation = rt::UserDefaults::standardUserDefaults()->observe(
      kSetting, rt::UserDefaults::Notify::kOnChange, [&] { changes.release(); });
  const auto inShell = [](const std::string& script) {
    const ProcessResult result = runProcess({"sh", "-ec", script, "sh", privateDefaults.file().string()});
    ASSERT_EQ(result.exitStatus, 0) << result.standardError;
  };
  inShell(R"(echo 'ZEBVerboseLogging = YES' > "$1.new"; mv "$1.new" "$1")");
  changes.acquire();
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  inShell(R"(rm "$1")");
  changes.acquire();
  EXPECT_FALSE(filter->verboseLoggingEnabled());
}

// Attaching, detaching, changing and asking at once: at the end the filter knows the last value.
TEST_F(ZEBLogLevelFilterTest, MayBeUsedByManyThreads) {
  SettingsFile settings(privateDefaults.file());
  const auto filter = ZEBLogLevelFilter::init();
  std::vector<std::thread> threads;
  threads.reserve(2);
  for (int thread = 0; thread < 2; ++thread) {
    threads.emplace_back([&] {
      for (int i = 0; i < 100; ++i) {
        filter->didAttachToLogger();
        allows(*filter, 2);
        filter->willDetachFromLogger();
      }
    });
  }
  for (int i = 0; i < 20; ++i) settings.set(kSetting, i % 2 == 0 ? "YES" : "NO");
  for (std::thread& thread : threads) thread.join();
  filter->didAttachToLogger();
  EXPECT_FALSE(filter->verboseLoggingEnabled());
  privateDefaults.change(kSetting, "YES");
  EXPECT_TRUE(filter->verboseLoggingEnabled());
  filter->willDetachFromLogger();
}

struct Failure {
  rt::String function, file, description;
  std::uint64_t lineNumber = 0;
};

class FailureRecorder final : public rt::Implements<FailureRecorder, rt::AssertionHandler> {
 public:
  void handleFailureInFunction(const rt::String& function, const rt::String& file, std::uint64_t lineNumber,
                               const rt::String& description) override {
    failures.push_back({function, file, description, lineNumber});
  }
  std::vector<Failure> failures;
};

constexpr rt::String kDescription =
    "The user defaults instance is still retained, which means there was a missing `willDetachFromLogger` call. It is important to balance the `didAttachToLogger` call with a `willDetachFromLogger` call because those methods register/unregister the `ZEBLogLevelFilter` instance as an observer of the user defaults instance."_s;

TEST_F(ZEBLogLevelFilterTest, FailsAnAssertionIfDestroyedWhileAttached) {
  const auto recorder = rt::make<FailureRecorder>();
  rt::AssertionHandler::setCurrentHandler(recorder);
  auto filter = ZEBLogLevelFilter::init();
  filter->didAttachToLogger();
  filter = nullptr;
  rt::AssertionHandler::setCurrentHandler(nullptr);
  ASSERT_EQ(recorder->failures.size(), 1U);
  const Failure& failure = recorder->failures.front();
  EXPECT_EQ(failure.function, "-[ZEBLogLevelFilter dealloc]"_s);
  EXPECT_EQ(failure.file, "Foundation/ZEBLogger"_s);
  EXPECT_EQ(failure.lineNumber, 544U);
  EXPECT_EQ(failure.description, kDescription);
  // Where the handler returns, the filter watches nothing any more all the same.
  privateDefaults.change(kSetting, "YES");
}

TEST_F(ZEBLogLevelFilterTest, FailsNoAssertionIfDetachedOrNeverAttached) {
  const auto recorder = rt::make<FailureRecorder>();
  rt::AssertionHandler::setCurrentHandler(recorder);
  auto filter = ZEBLogLevelFilter::init();
  filter = ZEBLogLevelFilter::init();
  filter->didAttachToLogger();
  filter->willDetachFromLogger();
  filter = nullptr;
  {
    const auto logger = ZEBLogger::loggerWithWriter(nullptr, nullptr, ZEBLogLevelFilter::init());
    logger->setFilter(ZEBLogLevelFilter::init());
    logger->setFilter(nullptr);
    logger->setFilter(ZEBLogLevelFilter::init());
  }
  rt::AssertionHandler::setCurrentHandler(nullptr);
  EXPECT_TRUE(recorder->failures.empty());
}

// The default handler throws, and no exception can leave a destructor.
TEST(ZEBLogLevelFilterDeathTest, TheDefaultAssertionHandlerEndsTheProgram) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  const auto destroyAttached = [] {
    auto filter = ZEBLogLevelFilter::init();
    filter->didAttachToLogger();
    filter = nullptr;
  };
  EXPECT_DEATH(
      destroyAttached(),
      "Assertion failed in -\\[ZEBLogLevelFilter dealloc\\], Foundation/ZEBLogger:544: The user defaults "
      "instance is still retained");
}

}  // namespace
