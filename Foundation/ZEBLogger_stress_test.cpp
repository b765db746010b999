// Tests many threads and processes that log at once, and a system that refuses to write.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <filesystem>
#include <map>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "Foundation/ZEBLogAllowedLevelFilter.h"
#include "Foundation/ZEBLogStandardFormatter.h"
#include "Foundation/ZEBLogger.h"
#include "tests/support/ZEBLoggerTest.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

// Many threads and processes at once.

// Invariant: each line of each writer is in the file once and whole. The lines of one writer are in order.
void expectWholeLines(const std::string& text, int writers, int lines) {
  std::istringstream stream(text);
  std::map<int, int> next;
  int count = 0;
  for (std::string line; std::getline(stream, line); ++count) {
    const std::size_t start = line.find("] [lvl=3] log() ");
    ASSERT_NE(start, std::string::npos) << line;
    std::istringstream words(line.substr(start + 16));
    int writer = -1;
    int number = -1;
    std::string filling;
    ASSERT_TRUE(words >> writer >> number >> filling) << line;
    ASSERT_EQ(next[writer]++, number) << line;
    ASSERT_EQ(filling,
              std::string(static_cast<std::size_t>(number % 1500) + 1, static_cast<char>('a' + writer)));
  }
  EXPECT_EQ(count, writers * lines);
}

void logLines(ZEBLogger& logger, int writer, int lines) {
  for (int number = 0; number < lines; ++number) {
    const std::string filling(static_cast<std::size_t>(number % 1500) + 1, static_cast<char>('a' + writer));
    logger.logFuncError("log", "%d %d %s"_s, writer, number, filling.c_str());
  }
}

TEST_F(ZEBLoggerTest, KeepsLinesOfThreadsWhole) {
  const auto logger = ZEBLogger::standardLoggerWithPath(pathText());
  ASSERT_TRUE(logger);
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int writer = 0; writer < 8; ++writer) {
    threads.emplace_back([&, writer] { logLines(*logger, writer, 2000); });
  }
  for (std::thread& thread : threads) thread.join();
  expectWholeLines(contents(), 8, 2000);
}

TEST_F(ZEBLoggerTest, KeepsLinesOfProcessesWhole) {
  std::vector<pid_t> children;
  children.reserve(2);
  for (int writer = 0; writer < 2; ++writer) {
    children.push_back(fork());
    if (children.back() == 0) {
      // Without the default filter, which would start a thread. The thread sanitizer allows no new thread in
      // the child of a process that has several.
      const auto file = ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(pathText(), 0644);
      logLines(*ZEBLogger::loggerWithWriter(file, ZEBLogStandardFormatter::init(), nullptr), writer, 2000);
      _exit(0);
    }
  }
  for (const pid_t child : children) {
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_EQ(status, 0);
  }
  expectWholeLines(contents(), 2, 2000);
}

// Invariant: whatever pieces are set meanwhile, each line reaches one of the two writers.
TEST_F(ZEBLoggerTest, LosesNoLineWhilePiecesAreReplaced) {
  constexpr int kThreads = 4;
  constexpr int kLines = 2000;
  const auto other = rt::make<Recorder>();
  const auto logger = recordingLogger();
  std::atomic<int> running = kThreads;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&] {
      for (int i = 0; i < kLines; ++i) logger->logInfo("line"_s);
      --running;
    });
  }
  while (running > 0) {
    logger->setWriter(other);
    logger->setFormatter(nullptr);
    logger->setFilter(ZEBLogAllowedLevelFilter::init());
    logger->setWriter(recorder_);
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(recorder_->lines().size() + other->lines().size(), std::size_t{kThreads} * kLines);
}

// Invariant: each line reaches the logger that was shared when the line was logged. These loggers stay
// usable.
TEST_F(ZEBLoggerTest, LosesNoLineWhileTheSharedLoggerIsReplaced) {
  constexpr int kThreads = 4;
  constexpr int kLines = 2000;
  ZEBLogger::setSharedLogger(recordingLogger());
  std::atomic<int> running = kThreads;
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&] {
      for (int i = 0; i < kLines; ++i) ZEBLogger::sharedLogger()->logInfo("line"_s);
      --running;
    });
  }
  while (running > 0) ZEBLogger::setSharedLogger(recordingLogger());
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(recorder_->lines().size(), std::size_t{kThreads} * kLines);
}

// Two threads set filters at once. Each filter that is told of its attachment is told of its detachment,
// once.
TEST_F(ZEBLoggerTest, AttachesAndDetachesEachFilterOnceWhenSettersCompete) {
  std::atomic<int> attached = 0;
  std::atomic<int> wrong = 0;
  rt::Ref<ZEBLogger> logger = recordingLogger();
  const auto setMany = [&] {
    for (int i = 0; i < 500; ++i) {
      const auto filter = rt::make<FunctionFilter>();
      filter->attached = [&] { wrong += attached++ == 0 ? 0 : 1; };
      filter->detaching = [&] {
        wrong += attached-- == 1 ? 0 : 1;
        std::this_thread::yield();
      };
      logger->setFilter(filter);
    }
  };
  std::thread other(setMany);
  setMany();
  other.join();
  EXPECT_EQ(attached, 1);
  logger = nullptr;
  EXPECT_EQ(attached, 0);
  EXPECT_EQ(wrong, 0);
}

// A system that refuses to write.

TEST_F(ZEBLoggerTest, RecoversFromAFullDiskAClosedDescriptorAndARemovedFile) {
  if (!fs::exists("/dev/full")) GTEST_SKIP() << "no /dev/full here";
  const auto logger = ZEBLogger::standardLoggerWithPath("/dev/full"_s);
  ASSERT_TRUE(logger);
  logger->logError("lost"_s);
  logger->logError("lost"_s);

  const auto writer = ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(pathText(), 0644);
  const int descriptor = writer->fileHandle()->descriptor();
  logger->setWriter(writer);
  logger->setFormatter(nullptr);
  const int kept = dup(descriptor);
  ASSERT_GE(kept, 0);
  close(descriptor);
  logger->logError("lost"_s);
  ASSERT_EQ(dup2(kept, descriptor), descriptor);
  close(kept);
  logger->logError("next"_s);
  EXPECT_EQ(contents(), "next\n");

  fs::rename(path(), path("removed"));
  fs::remove(path("removed"));
  logger->logError("to nobody"_s);
  logger->setWriter(ZEBFileHandleLogWriter::fileHandleForLoggingAtPath(pathText(), 0644));
  logger->logError("again"_s);
  EXPECT_EQ(contents(), "again\n");
}

}  // namespace
