#include <gtest/gtest.h>
#include <sys/resource.h>

#include <csignal>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "tests/support/LUMFileLoggerTest.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

using Names = std::vector<std::string>;

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
  // A logger that rotates a device by mistake renames the link, and not the machine's device.
  fs::create_symlink("/dev/full", path("full"));
  for (const std::size_t bufferSize : {0U, 4U, 1000U}) {
    options_.bufferSize = bufferSize;
    options_.rotationSize = 1;
    options_.rotatesDaily = true;
    const rt::Ref<LUMFileLogger> file = logger("full");
    for (int i = 0; i < 10; ++i) log(file, "a");
    EXPECT_TRUE(file->flush(0));
    file->rotate();
    EXPECT_EQ(file->droppedCount(), 10U);
  }
  EXPECT_EQ(names(), Names{"full"});
  EXPECT_TRUE(fs::is_symlink(path("full")));
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

}  // namespace
