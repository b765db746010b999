#include "Shared/Logging/Loggers/LUMFileLogger.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <sstream>
#include <stdexcept>
#include <string>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/ClockHook.h"
#include "tests/support/ForkTest.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

// A directory for the files of a case.
class LUMFileLoggerTest : public testing::Test {
 protected:
  LUMFileLoggerTest() {
    std::string pattern = testing::TempDir() + "LUMFileLogger_XXXXXX";
    folder_ = mkdtemp(pattern.data());
    options_.formatter = LUMLogPattern::initWithPattern("{text}"_s);
  }
  ~LUMFileLoggerTest() override {
    std::error_code error;
    fs::remove_all(folder_, error);
  }

  fs::path path(const std::string& name = "log") const { return folder_ / name; }

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
    for (const auto& entry : fs::directory_iterator(folder_)) all.push_back(entry.path().filename());
    std::ranges::sort(all);
    return all;
  }

  fs::path folder_;
  LUMFileLoggerOptions options_;
};

rt::Ref<LUMLogMessage> message(const std::string& text, LUMLogLevel level = LUMLogLevelInfo) {
  return messageWith(level, rt::String::fromUTF8(text));
}

void log(const rt::Ref<LUMFileLogger>& logger, const std::string& text, LUMLogLevel level = LUMLogLevelInfo) {
  logger->logWithMessage(message(text, level));
}

// Makes lines of different lengths.
std::string filling(int number) {
  return std::string(static_cast<std::size_t>(number % 60), 'x');
}

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

std::atomic<std::int64_t> fixedSecond;

// Returns a message of this second.
rt::Ref<LUMLogMessage> messageAt(std::int64_t second, const std::string& text) {
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

constexpr std::int64_t kMidnight = 1'800'057'600;  // in UTC
static_assert(kMidnight % 86'400 == 0);

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
  file->logWithMessage(messageAt(kLocalMidnight + (3 * 86'400), "days later"));
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

TEST_F(LUMFileLoggerTest, FollowsThePathIfTheFileIsMovedOrRemoved) {
  for (const std::size_t bufferSize : {0U, 1000U}) {
    options_.bufferSize = bufferSize;
    const rt::Ref<LUMFileLogger> file = logger();
    log(file, "a");
    EXPECT_TRUE(file->flush(0));
    fs::rename(path(), path("moved"));
    EXPECT_TRUE(file->flush(0));
    log(file, "b");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content("moved"), "a\n");
    EXPECT_EQ(content(), "b\n");
    fs::remove(path());
    EXPECT_TRUE(file->flush(0));
    log(file, "c");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content(), "c\n");
    EXPECT_EQ(file->droppedCount(), 0U);
    fs::remove(path());
  }
}

TEST_F(LUMFileLoggerTest, LooksAtThePathBeforeEachWriteOrAfterAnInterval) {
  options_.pathCheckIntervalInMilliseconds = 0;
  const rt::Ref<LUMFileLogger> often = logger("often");
  log(often, "a");
  fs::rename(path("often"), path("often moved"));
  log(often, "b");
  EXPECT_EQ(content("often"), "b\n");

  options_.pathCheckIntervalInMilliseconds = 1000;
  const rt::Ref<LUMFileLogger> seldom = logger("seldom");
  seldom->logWithMessage(messageAt(kMidnight, "a"));
  fs::rename(path("seldom"), path("seldom moved"));
  seldom->logWithMessage(messageAt(kMidnight, "b"));
  seldom->logWithMessage(messageAt(kMidnight + 1, "c"));
  EXPECT_EQ(content("seldom moved"), "a\nb\n");
  EXPECT_EQ(content("seldom"), "c\n");
}

TEST_F(LUMFileLoggerTest, DoesNotRotateAFileThatSomebodyElseHasRotated) {
  options_.pathCheckIntervalInMilliseconds = 1'000'000;
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "a");
  fs::rename(path(), path("log.1"));
  std::ofstream(path()) << "other\n";
  file->rotate();
  log(file, "b");
  EXPECT_EQ(content(), "other\nb\n");
  EXPECT_EQ(content("log.1"), "a\n");
  EXPECT_EQ(names(), (Names{"log", "log.1"}));
}

TEST_F(LUMFileLoggerTest, UsesTheMovedFileWhileNoneCanBeMade) {
  fs::create_directory(path("folder"));
  options_.pathCheckIntervalInMilliseconds = 0;
  const rt::Ref<LUMFileLogger> file = logger("folder/log");
  log(file, "a");
  fs::rename(path("folder"), path("moved"));
  log(file, "b");
  EXPECT_EQ(content("moved/log"), "a\nb\n");
  fs::create_directory(path("folder"));
  log(file, "c");
  EXPECT_EQ(content("folder/log"), "c\n");
  EXPECT_EQ(file->droppedCount(), 0U);
}

TEST_F(LUMFileLoggerTest, CountsLinesThatNobodyCouldRead) {
  for (const std::size_t bufferSize : {0U, 1000U}) {
    fs::create_directory(path("folder"));
    options_.bufferSize = bufferSize;
    const rt::Ref<LUMFileLogger> file = logger("folder/log");
    log(file, "a");
    EXPECT_TRUE(file->flush(0));
    fs::remove_all(path("folder"));
    EXPECT_TRUE(file->flush(0));
    log(file, "b");
    log(file, "c");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(file->droppedCount(), 2U);
    fs::create_directory(path("folder"));
    log(file, "d");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content("folder/log"), "2 lines were lost: No such file or directory\nd\n");
    EXPECT_EQ(file->droppedCount(), 2U);
    fs::remove_all(path("folder"));
  }
}

TEST_F(LUMFileLoggerTest, CountsLinesThatADeviceRefuses) {
  if (!fs::exists("/dev/full")) GTEST_SKIP() << "no /dev/full";
  for (const std::size_t bufferSize : {0U, 4U, 1000U}) {
    options_.bufferSize = bufferSize;
    options_.rotationSize = 1;
    options_.rotatesDaily = true;
    const rt::Ref<LUMFileLogger> file = LUMFileLogger::initWithPath("/dev/full"_s, options_);
    for (int i = 0; i < 10; ++i) log(file, "a");
    EXPECT_TRUE(file->flush(0));
    file->rotate();
    EXPECT_EQ(file->droppedCount(), 10U);
  }
  EXPECT_TRUE(fs::is_character_file("/dev/full"));
}

// Limits the size of files, which ends a write like a full disk does: after as many bytes as there is room
// for.
void limitSize(rlim_t size) {
  rlimit limit{};
  getrlimit(RLIMIT_FSIZE, &limit);
  limit.rlim_cur = size == 0 ? limit.rlim_max : size;
  setrlimit(RLIMIT_FSIZE, &limit);
}

TEST_F(LUMFileLoggerTest, TellsHowManyLinesWereLostOnceThereIsRoom) {
  signal(SIGXFSZ, SIG_IGN);
  for (const std::size_t bufferSize : {0U, 1000U}) {
    options_.bufferSize = bufferSize;
    const rt::Ref<LUMFileLogger> file = logger();
    limitSize(10);
    for (const char* const text : {"one", "two", "three", "four"}) log(file, text);
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content(), "one\ntwo\nth");
    EXPECT_EQ(file->droppedCount(), 2U);
    log(file, "five");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content(), "one\ntwo\nth");
    EXPECT_EQ(file->droppedCount(), 3U);
    // There is room for the end of the line, and for a part of the line about the lost ones.
    limitSize(14);
    log(file, "six");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content(), "one\ntwo\nth\n3 l");
    EXPECT_EQ(file->droppedCount(), 4U);
    limitSize(0);
    log(file, "seven");
    log(file, "eight");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content(), "one\ntwo\nth\n3 l\n4 lines were lost: File too large\nseven\neight\n");
    EXPECT_EQ(file->droppedCount(), 4U);
    fs::remove(path());
  }
}

TEST_F(LUMFileLoggerTest, TellsOfLostLinesAtFlush) {
  signal(SIGXFSZ, SIG_IGN);
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "a");
  limitSize(2);
  log(file, "b");
  limitSize(0);
  EXPECT_TRUE(file->flush(0));
  EXPECT_EQ(content(), "a\n1 line was lost: File too large\n");
}

TEST_F(LUMFileLoggerTest, EndsTheLineThatAnEarlierRunHasCut) {
  std::ofstream(path()) << "whole\nhal";
  log(logger(), "a");
  EXPECT_EQ(content(), "whole\nhal\na\n");
}

TEST_F(LUMFileLoggerTest, WritesABufferWhenItIsFull) {
  options_.bufferSize = 8;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "abc");
  log(file, "def");
  EXPECT_EQ(content(), "");
  log(file, "g");
  EXPECT_EQ(content(), "abc\ndef\n");
  log(file, "longer than all");
  EXPECT_EQ(content(), "abc\ndef\ng\nlonger than all\n");
}

TEST_F(LUMFileLoggerTest, WritesABufferAtAnErrorAndAFault) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  const rt::Ref<LUMFileLogger> file = logger();
  log(file, "a", LUMLogLevelDebug);
  log(file, "b", LUMLogLevelInfo);
  EXPECT_EQ(content(), "");
  log(file, "c", LUMLogLevelError);
  EXPECT_EQ(content(), "a\nb\nc\n");
  log(file, "d");
  log(file, "e", LUMLogLevelFault);
  EXPECT_EQ(content(), "a\nb\nc\nd\ne\n");
}

TEST_F(LUMFileLoggerTest, WritesABufferAtFlushAndWhenItIsDestroyed) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  rt::Ref<LUMFileLogger> file = logger();
  log(file, "a");
  EXPECT_TRUE(file->flush(0));
  EXPECT_EQ(content(), "a\n");
  log(file, "b");
  file = nullptr;
  EXPECT_EQ(content(), "a\nb\n");
}

// Waits until the file has these bytes; a case that fails waits until it is ended.
TEST_F(LUMFileLoggerTest, WritesABufferAfterADelay) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  const rt::Ref<LUMFileLogger> patient = logger("patient");
  log(patient, "kept");
  options_.longestDelayInMilliseconds = 1;
  const rt::Ref<LUMFileLogger> file = logger();
  std::string expected;
  for (int round = 0; round < 20; ++round) {
    log(file, "a");
    expected += "a\n";
    while (content() != expected) std::this_thread::yield();
  }
  EXPECT_EQ(content("patient"), "");
}

TEST_F(LUMFileLoggerTest, WritesABufferAtExit) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  EXPECT_EXIT(
      {
        // The multiplexer of a program keeps its loggers, too.
        LUMFileLogger* const file = logger().detach();
        log(file, "before");
        std::atexit([] {});
        std::exit(0);
      },
      testing::ExitedWithCode(0), "");
  EXPECT_EQ(content(), "before\n");
}

LUMFileLogger* exitLogger = nullptr;

TEST_F(LUMFileLoggerTest, WritesEachLineAtOnceFromTheExitOn) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  EXPECT_EXIT(
      {
        std::atexit([] { log(exitLogger, "after"); });  // Runs last.
        exitLogger = logger().detach();
        log(exitLogger, "before");
        std::exit(0);
      },
      testing::ExitedWithCode(0), "");
  EXPECT_EQ(content(), "before\nafter\n");
}

TEST_F(LUMFileLoggerTest, WritesLinesThatWaitAtAForkOnce) {
  for (const std::size_t bufferSize : {0U, 1000U}) {
    options_.bufferSize = bufferSize;
    options_.longestDelayInMilliseconds = ~std::uint32_t{0};
    const rt::Ref<LUMFileLogger> file = logger();
    log(file, "parent");
    EXPECT_EQ(statusOfChild([&] {
                log(file, "child");
                return file->flush(0) && file->droppedCount() == 0 ? 0 : 1;
              }),
              0);
    const pid_t child = startChild([&]() -> int {
      log(file, "exit");
      std::exit(3);
    });
    EXPECT_EQ(statusOf(child), 3);
    log(file, "after");
    EXPECT_TRUE(file->flush(0));
    EXPECT_EQ(content(), bufferSize == 0 ? "parent\nchild\nexit\nafter\n" : "child\nexit\nparent\nafter\n");
    fs::remove(path());
  }
}

TEST_F(LUMFileLoggerTest, WritesABufferAfterADelayInTheChildOfAFork) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = 1;
  const rt::Ref<LUMFileLogger> file = logger();
  EXPECT_EQ(statusOfChild([&] {
              log(file, "child");
              while (content() != "child\n") std::this_thread::yield();
              return 0;
            }),
            0);
}

// Invariant: the child gets the lock, and its line and each of the parent's lines are whole and there once.
TEST_F(LUMFileLoggerTest, MayForkWhileOtherThreadsLog) {
  options_.bufferSize = 64;
  const rt::Ref<LUMFileLogger> file = logger();
  std::atomic<bool> isOver = false;
  std::atomic<int> count = 0;
  std::thread other([&] {
    while (!isOver) log(file, "parent " + std::to_string(count++));
  });
  constexpr int kForks = 20;
  for (int i = 0; i < kForks; ++i) {
    EXPECT_EQ(statusOfChild([&] {
                log(file, "child " + std::to_string(i), LUMLogLevelError);
                return 0;
              }),
              0);
  }
  isOver = true;
  other.join();
  EXPECT_TRUE(file->flush(~0U));
  std::map<std::string, int> lines;
  std::istringstream all(content());
  for (std::string line; std::getline(all, line);) ++lines[line];
  for (int i = 0; i < kForks; ++i) EXPECT_EQ(lines["child " + std::to_string(i)], 1);
  for (int i = 0; i < count; ++i) EXPECT_EQ(lines["parent " + std::to_string(i)], 1);
  EXPECT_EQ(lines.size(), static_cast<std::size_t>(kForks + count));
}

// Invariant: each line is in one of the files, whole and once, and the lines of a thread are in order.
TEST_F(LUMFileLoggerTest, KeepsTheLinesOfThreadsWhole) {
  for (const std::size_t bufferSize : {0U, 300U}) {
    options_.bufferSize = bufferSize;
    options_.rotationSize = 4000;
    options_.keptFileCount = 1000;
    const std::string name = "log" + std::to_string(bufferSize) + "-";
    constexpr int kThreads = 4;
    constexpr int kLines = 500;
    {
      const rt::Ref<LUMFileLogger> file = logger(name);
      std::vector<std::thread> threads;
      for (int thread = 0; thread < kThreads; ++thread) {
        threads.emplace_back([&file, thread] {
          for (int i = 0; i < kLines; ++i) {
            log(file, std::to_string(thread) + " " + std::to_string(i) + " " + filling(i) + ".",
                i % 100 == 0 ? LUMLogLevelError : LUMLogLevelInfo);
            if (i % 200 == 0) file->flush(0);
          }
        });
      }
      for (std::thread& thread : threads) thread.join();
      EXPECT_EQ(file->droppedCount(), 0U);
    }
    std::string all;
    int number = 1;
    while (fs::exists(path(name + "." + std::to_string(number)))) ++number;
    while (--number > 0) {
      const std::string part = content(name + "." + std::to_string(number));
      EXPECT_LE(part.size(), options_.rotationSize);
      all += part;
    }
    all += content(name);
    std::array<int, kThreads> next{};
    std::istringstream lines(all);
    for (std::string line; std::getline(lines, line);) {
      const auto thread = static_cast<std::size_t>(line[0] - '0');
      ASSERT_LT(thread, next.size());
      const int i = next[thread]++;
      ASSERT_EQ(line, std::to_string(thread) + " " + std::to_string(i) + " " + filling(i) + ".");
    }
    for (const int count : next) EXPECT_EQ(count, kLines);
  }
}

// Invariant: each line of both processes is there, whole and once.
TEST_F(LUMFileLoggerTest, SharesAFileWithAnotherProcess) {
  for (const std::size_t bufferSize : {0U, 300U}) {
    options_.bufferSize = bufferSize;
    const auto writeLines = [&](const std::string& who) {
      const rt::Ref<LUMFileLogger> file = logger();
      for (int i = 0; i < 500; ++i) log(file, who + std::to_string(i) + filling(i) + ".");
      file->flush(~0U);
      return file->droppedCount() == 0 ? 0 : 1;
    };
    const pid_t child = startChild([&] { return writeLines("child "); });
    EXPECT_EQ(writeLines("parent "), 0);
    EXPECT_EQ(statusOf(child), 0);
    std::map<std::string, int> lines;
    std::istringstream all(content());
    for (std::string line; std::getline(all, line);) ++lines[line];
    EXPECT_EQ(lines.size(), 1000U);
    for (const char* const who : {"child ", "parent "}) {
      for (int i = 0; i < 500; ++i) EXPECT_EQ(lines[who + std::to_string(i) + filling(i) + "."], 1);
    }
    fs::remove(path());
  }
}

TEST_F(LUMFileLoggerTest, AllocatesNothingForALine) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  for (const std::size_t bufferSize : {0U, 100'000U}) {
    options_.bufferSize = bufferSize;
    options_.formatter = nullptr;
    const rt::Ref<LUMFileLogger> file = logger();
    const rt::Ref<LUMLogMessage> given = message("text");
    file->logWithMessage(given);
    const AllocationCount count;
    for (int i = 0; i < 10; ++i) file->logWithMessage(given);
    file->flush(0);
    file->logInSignalHandler(*given);
    EXPECT_EQ(count.allocations(), 0);
  }
}

rt::Ref<LUMLogMessage> crashMessage;

TEST_F(LUMFileLoggerTest, WritesWhatIsBufferedInASignalHandler) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  EXPECT_EXIT(
      {
        exitLogger = logger().detach();
        crashMessage = message("crash");
        log(exitLogger, "before");
        signal(SIGSEGV, [](int number) {
          exitLogger->logInSignalHandler(*crashMessage);
          signal(number, SIG_DFL);
          raise(number);
        });
        raise(SIGSEGV);
      },
      testing::KilledBySignal(SIGSEGV), "");
  EXPECT_EQ(content(), "before\ncrash\n");
}

TEST_F(LUMFileLoggerTest, CutsALongLineInASignalHandler) {
  const rt::Ref<LUMFileLogger> file = logger();
  file->logInSignalHandler(*message(std::string(10'000, 'x')));
  EXPECT_EQ(content(), std::string(4095, 'x') + "\n");
}

TEST_F(LUMFileLoggerTest, WritesTheTextInASignalHandlerIfTheFormatterMakesStrings) {
  options_.formatter =
      rt::make<TestFormatter>([](const LUMLogMessage& given) { return given.formattedString(); });
  const rt::Ref<LUMFileLogger> file = logger();
  file->logInSignalHandler(*message("a\nb"));
  EXPECT_EQ(content(), "a\\nb\n");
}

TEST_F(LUMFileLoggerTest, ClosesItsFileInProgramsThatAreExecuted) {
  const rt::Ref<LUMFileLogger> file = logger();
  const auto flags = [&] {
    struct stat wanted{};
    stat(path().c_str(), &wanted);
    for (int descriptor = 3; descriptor < 256; ++descriptor) {
      struct stat status{};
      if (fstat(descriptor, &status) == 0 && status.st_dev == wanted.st_dev &&
          status.st_ino == wanted.st_ino) {
        return fcntl(descriptor, F_GETFD);
      }
    }
    return -1;
  };
  EXPECT_EQ(flags(), FD_CLOEXEC);
  log(file, "a");
  file->rotate();
  EXPECT_EQ(flags(), FD_CLOEXEC);
}

}  // namespace
