#pragma once

/// A directory for the log files of a case, and messages for them. Link `clock-hook`.
///
///     TEST_F(LUMFileLoggerTest, WritesALine) {
///       log(logger(), "a");
///       EXPECT_EQ(content(), "a\n");
///     }
///
/// Not for: anything but tests.

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>
#include <system_error>
#include <vector>

#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "tests/support/ClockHook.h"
#include "tests/support/TestLoggers.h"

// A directory for the files of a case.
class LUMFileLoggerTest : public testing::Test {
 protected:
  LUMFileLoggerTest() {
    std::string pattern = testing::TempDir() + "LUMFileLogger_XXXXXX";
    folder_ = mkdtemp(pattern.data());
    options_.formatter = LUMLogPattern::initWithPattern(rt::String::fromUTF8("{text}"));
  }
  ~LUMFileLoggerTest() override {
    std::error_code error;
    std::filesystem::remove_all(folder_, error);
  }

  std::filesystem::path path(const std::string& name = "log") const { return folder_ / name; }

  rt::Ref<LUMFileLogger> logger(const std::string& name = "log") const {
    return LUMFileLogger::initWithPath(rt::String::fromUTF8(path(name).string()), options_);
  }

  std::string content(const std::string& name = "log") const {
    std::ifstream stream(path(name), std::ios::binary);
    std::ostringstream all;
    all << stream.rdbuf();
    return all.str();
  }

  std::vector<std::string> names() const {
    std::vector<std::string> all;
    for (const auto& entry : std::filesystem::directory_iterator(folder_))
      all.push_back(entry.path().filename());
    std::ranges::sort(all);
    return all;
  }

  std::filesystem::path folder_;
  LUMFileLoggerOptions options_;
};

inline rt::Ref<LUMLogMessage> message(const std::string& text, LUMLogLevel level = LUMLogLevelInfo) {
  return messageWith(level, rt::String::fromUTF8(text));
}

inline void log(const rt::Ref<LUMFileLogger>& logger, const std::string& text,
                LUMLogLevel level = LUMLogLevelInfo) {
  logger->logWithMessage(message(text, level));
}

// Makes lines of different lengths.
inline std::string filling(int number) {
  // NOLINTNEXTLINE(modernize-return-braced-init-list): braces would make a string of two characters
  return std::string(static_cast<std::size_t>(number % 60), 'x');
}

inline std::atomic<std::int64_t> fixedSecond;

// Returns a message of this second.
inline rt::Ref<LUMLogMessage> messageAt(std::int64_t second, const std::string& text) {
  fixedSecond = second;
  clockHook = [](clockid_t clock, timespec& time) {
    if (clock == CLOCK_REALTIME) time = {fixedSecond, 0};
  };
  rt::Ref<LUMLogMessage> made;
  // Messages see a change of the clock after a millisecond.
  do made = message(text);
  while (made->time() != second * 1'000'000'000);
  clockHook = nullptr;
  return made;
}

inline constexpr std::int64_t kMidnight = 1'800'057'600;  // in UTC
static_assert(kMidnight % 86'400 == 0);
