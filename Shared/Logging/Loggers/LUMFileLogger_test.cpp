#include "Shared/Logging/Loggers/LUMFileLogger.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <stdexcept>
#include <string>
#include <system_error>
#include <vector>

#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "tests/support/LUMFileLoggerTest.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

using Names = std::vector<std::string>;

TEST_F(LUMFileLoggerTest, WritesEachLineAtOnce) {
  const rt::Ref<LUMFileLogger> file = logger();
  EXPECT_EQ(content(), "");
  log(file, "a");
  EXPECT_EQ(content(), "a\n");
  log(file, "b");
  EXPECT_EQ(content(), "a\nb\n");
  EXPECT_EQ(file->droppedCount(), 0U);
}

TEST_F(LUMFileLoggerTest, AppendsToAFile) {
  std::ofstream(path()) << "before\n";
  log(logger(), "a");
  EXPECT_EQ(content(), "before\na\n");
}

TEST_F(LUMFileLoggerTest, HasAFormatterAndAFilter) {
  const rt::String where = rt::String::fromUTF8(path().string());
  const rt::Ref<LUMLogFilter> filter = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError);
  const rt::Ref<LUMFileLogger> file =
      LUMFileLogger::initWithPath(where, LUMLogPattern::initWithPattern("<{text}>"_s), filter);
  EXPECT_EQ(file->filter(), filter);
  EXPECT_EQ(file->lowestLevel(nullptr), LUMLogLevelError);
  log(file, "a");
  EXPECT_EQ(content(), "<a>\n");
  const rt::Ref<LUMLogMessage> given = message("b");
  LUMFileLogger::initWithPath(where)->logWithMessage(given);
  EXPECT_EQ(content(),
            "<a>\n" + std::string(LUMLogPattern::init()->formattedLogMessage(*given).view()) + "\n");
}

TEST_F(LUMFileLoggerTest, WritesNothingForAFormatterThatReturnsNull) {
  options_.formatter = rt::make<TestFormatter>([](const LUMLogMessage& given) {
    return given.level() == LUMLogLevelDebug ? rt::String() : given.formattedString();
  });
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "a", LUMLogLevelDebug);
  log(file, "b");
  EXPECT_EQ(content(), "b\n");
}

TEST_F(LUMFileLoggerTest, MakesTheFileWithTheMode) {
  const mode_t mask = umask(0);
  const auto modeOf = [&](const std::string& name) {
    struct stat status{};
    stat(path(name).c_str(), &status);
    return status.st_mode & 07777U;
  };
  logger("usual");
  EXPECT_EQ(modeOf("usual"), 0640U);
  options_.mode = 0600;
  options_.keptFileCount = 1;
  const rt::Ref<LUMFileLogger> file = logger("private");
  log(file, "a");
  file->rotate();
  EXPECT_EQ(modeOf("private"), 0600U);
  EXPECT_EQ(modeOf("private.1"), 0600U);
  umask(mask);
}

TEST_F(LUMFileLoggerTest, NamesThePathThatCannotBeOpened) {
  try {
    logger("no/log");
    FAIL();
  } catch (const std::system_error& error) {
    EXPECT_EQ(error.code().value(), ENOENT);
    EXPECT_NE(std::string(error.what()).find("cannot open the log file " + path("no/log").string()),
              std::string::npos);
  }
  EXPECT_EQ(names(), Names());
}

TEST_F(LUMFileLoggerTest, ChecksItsOptions) {
  const auto errorOf = [&](const std::function<void(LUMFileLoggerOptions&)>& change,
                           const rt::String& where) {
    LUMFileLoggerOptions options;
    change(options);
    try {
      LUMFileLogger::initWithPath(where, options);
    } catch (const std::invalid_argument& error) {
      return std::string(error.what());
    }
    return std::string("no error");
  };
  const rt::String where = rt::String::fromUTF8(path().string());
  using Options = LUMFileLoggerOptions;
  EXPECT_EQ(errorOf([](Options& options) { options.keptFileCount = 1001; }, where),
            "keptFileCount is at most 1000");
  EXPECT_EQ(errorOf([](Options& options) { options.longestDelayInMilliseconds = 0; }, where),
            "longestDelayInMilliseconds is at least 1");
  EXPECT_EQ(errorOf([](Options& options) { options.mode = 01000; }, where), "mode is at most 0777");
  EXPECT_EQ(errorOf([](Options&) {}, nullptr), "the path of a log file is empty");
  EXPECT_EQ(errorOf([](Options&) {}, rt::String::fromUTF8(std::string_view("a\0b", 3))),
            "the path of a log file has a NUL in it");
  EXPECT_EQ(names(), Names());
}

TEST_F(LUMFileLoggerTest, KeepsARelativePath) {
  const fs::path before = fs::current_path();
  fs::current_path(folder_);
  fs::create_directory("other");
  const rt::Ref<LUMFileLogger> file = LUMFileLogger::initWithPath("log"_s, options_.formatter);
  fs::current_path("other");
  log(file, "a");
  file->rotate();
  fs::current_path(before);
  EXPECT_EQ(names(), (Names{"log", "log.1", "other"}));
}

TEST_F(LUMFileLoggerTest, RotatesBeforeTheFileGetsTooLarge) {
  for (const std::size_t bufferSize : {0U, 3U, 5U, 1000U}) {
    options_.bufferSize = bufferSize;
    options_.rotationSize = 6;
    options_.keptFileCount = 3;
    const std::string name = "log" + std::to_string(bufferSize) + "-";
    {
      const rt::Ref<LUMFileLogger> file = logger(name);
      for (const char* const text : {"aa", "bb", "cc", "dd", "ee", "too long", "f", "g", "h", "i"})
        log(file, text);
      EXPECT_EQ(file->droppedCount(), 0U);
    }
    EXPECT_EQ(content(name), "i\n");
    EXPECT_EQ(content(name + ".1"), "f\ng\nh\n");
    EXPECT_EQ(content(name + ".2"), "too long\n");
    EXPECT_EQ(content(name + ".3"), "ee\n");
    EXPECT_FALSE(fs::exists(path(name + ".4")));
  }
}

TEST_F(LUMFileLoggerTest, CountsWhatIsInTheFileAlready) {
  std::ofstream(path()) << "12345\n";
  options_.rotationSize = 8;
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "a");
  EXPECT_EQ(content(), "12345\na\n");
  log(file, "b");
  EXPECT_EQ(content(), "b\n");
  EXPECT_EQ(content("log.1"), "12345\na\n");
}

TEST_F(LUMFileLoggerTest, MayKeepNoFiles) {
  options_.rotationSize = 2;
  options_.keptFileCount = 0;
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "a");
  log(file, "b");
  EXPECT_EQ(content(), "b\n");
  EXPECT_EQ(names(), Names{"log"});
}

TEST_F(LUMFileLoggerTest, RotatesOnDemand) {
  options_.bufferSize = 1000;
  options_.keptFileCount = 2;
  const rt::Ref<LUMFileLogger> file = logger();
  for (const char* const text : {"a", "b", "c"}) {
    log(file, text);
    file->rotate();
  }
  log(file, "d");
  EXPECT_TRUE(file->flush(0));
  EXPECT_EQ(content() + content("log.1") + content("log.2"), "d\nc\nb\n");
  EXPECT_EQ(names(), (Names{"log", "log.1", "log.2"}));
}

// A directory cannot be replaced by a file.
TEST_F(LUMFileLoggerTest, GoesOnWithTheFileIfItCannotBeRenamed) {
  fs::create_directories(path("log.1/x"));
  options_.rotationSize = 4;
  options_.keptFileCount = 1;
  const rt::Ref<LUMFileLogger> file = logger();
  std::string expected;
  for (const char* const text : {"a", "b", "c", "d"}) {
    log(file, text);
    expected += std::string(text) + "\n";
  }
  EXPECT_EQ(content(), expected);
  fs::remove_all(path("log.1"));
  file->rotate();
  EXPECT_EQ(content("log.1"), expected);
}

TEST_F(LUMFileLoggerTest, RotatesAtLocalMidnight) {
  setenv("TZ", "NST3:30", 1);
  constexpr std::int64_t kLocalMidnight = kMidnight + 12'600;
  options_.rotatesDaily = true;
  const rt::Ref<LUMFileLogger> file = logger();
  file->logWithMessage(messageAt(kLocalMidnight - 86'400, "first of a day"));
  file->logWithMessage(messageAt(kLocalMidnight - 1, "last of the day"));
  file->logWithMessage(messageAt(kLocalMidnight, "first of the next day"));
  file->logWithMessage(messageAt(kLocalMidnight - 1, "late"));
  file->logWithMessage(messageAt(kLocalMidnight + 1, "second"));
  EXPECT_EQ(content("log.1"), "first of a day\nlast of the day\n");
  EXPECT_EQ(content(), "first of the next day\nlate\nsecond\n");
  file->logWithMessage(messageAt(kLocalMidnight + (3L * 86'400), "days later"));
  EXPECT_EQ(content(), "days later\n");
  EXPECT_EQ(names(), (Names{"log", "log.1", "log.2"}));
  unsetenv("TZ");
}

TEST_F(LUMFileLoggerTest, RotatesAFileOfAnEarlierDay) {
  setenv("TZ", "UTC0", 1);
  options_.rotatesDaily = true;
  for (const bool isSameDay : {true, false}) {
    const std::string name = isSameDay ? "same" : "earlier";
    std::ofstream(path(name)) << "before\n";
    const std::array<timespec, 2> times{timespec{kMidnight + (isSameDay ? 0 : -1), 0},
                                        timespec{kMidnight + (isSameDay ? 0 : -1), 0}};
    utimensat(AT_FDCWD, path(name).c_str(), times.data(), 0);
    logger(name)->logWithMessage(messageAt(kMidnight + 7200, "a"));
    EXPECT_EQ(content(name), isSameDay ? "before\na\n" : "a\n");
    EXPECT_EQ(content(name + ".1"), isSameDay ? "" : "before\n");
  }
  unsetenv("TZ");
}

}  // namespace
