// All loggers together, when much goes wrong. The invariant: each message is in a file, or it is counted.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Text/Format.h"
#include "Shared/Logging/Loggers/Loggers.h"
#include "tests/support/Sanitizers.h"

namespace {

using namespace rt::literals;
using rt::Ref;

class LoggersFaultsTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string name = testing::TempDir() + "loggers.XXXXXX";
    ASSERT_NE(mkdtemp(name.data()), nullptr);
    folder_ = name;
  }
  void TearDown() override {
    for (const Ref<LUMSyncLogger>& logger : added_) multiplexer_->removeSyncLogger(logger);
    std::filesystem::remove_all(folder_);
  }

  rt::String path(const char* name) const { return rt::String::fromUTF8((folder_ / name).string()); }

  Ref<LUMBoundedLogger> addBounded(const char* name, LUMBoundedLoggerOptions options,
                                   const Ref<LUMLogFormatter>& formatter) {
    const Ref<LUMBoundedLogger> logger =
        LUMBoundedLogger::initWithLogger(LUMFileLogger::initWithPath(path(name), formatter), options);
    multiplexer_->addSyncLogger(logger);
    added_.emplace_back(logger);
    return logger;
  }

  // How often each line with the field `n` is in a file.
  std::map<int, int> numbersIn(const char* name, const std::string& before) const {
    std::map<int, int> numbers;
    std::ifstream file(folder_ / name);
    for (std::string line; std::getline(file, line);) {
      const std::size_t at = line.find(before);
      if (at != std::string::npos) ++numbers[std::stoi(line.substr(at + before.size()))];
    }
    return numbers;
  }

  std::filesystem::path folder_;
  const Ref<LUMLogMultiplexer>& multiplexer_ = LUMLogMultiplexer::sharedInstance();
  std::vector<Ref<LUMSyncLogger>> added_;
};

// The threads of a batch run at the same time. Each logs once and ends, which also frees what it keeps.
TEST_F(LoggersFaultsTest, LosesNothingOfTenThousandShortLivedThreads) {
  constexpr int kThreads = 10'000;
  constexpr int kBatch = 20;
  const Ref<LUMBoundedLogger> whole =
      addBounded("whole.log", {}, LUMLogPattern::initWithPattern("{time} {thread} {text} {fields}"_s));
  const Ref<LUMBoundedLogger> json = addBounded("all.json", {}, LUMLogJSON::init());
  const Ref<LUMBoundedLogger> small =
      addBounded("small.log", {.capacity = 2, .whenFull = LUMLogWhenFull::kDropOldest}, nullptr);
  for (int batch = 0; batch < kThreads / kBatch; ++batch) {
    std::vector<std::thread> threads;
    for (int i = 0; i < kBatch; ++i) {
      threads.emplace_back([n = batch * kBatch + i] {
        const LUMLogScope scope(LUMLogField("batch", n / kBatch));
        LUMLogAt(LUMLogLevelInfo, "thread"_s, LUMLogField("n", n));
      });
    }
    for (std::thread& thread : threads) thread.join();
  }
  for (const Ref<LUMBoundedLogger>& logger : {whole, json, small}) EXPECT_TRUE(logger->flush(60'000));
  for (const auto& [name, before] : {std::pair("whole.log", " n="), std::pair("all.json", "\"n\":")}) {
    const std::map<int, int> numbers = numbersIn(name, before);
    EXPECT_EQ(numbers.size(), std::size_t{kThreads}) << name;
    EXPECT_TRUE(std::ranges::all_of(numbers, [](const auto& number) { return number.second == 1; })) << name;
  }
  EXPECT_EQ(whole->droppedCount() + json->droppedCount(), 0U);
  EXPECT_EQ(numbersIn("small.log", " n=").size() + small->droppedCount(), std::uint64_t{kThreads});
}

// The parent's lines wait while it forks. The child must neither write nor lose them, and logs for itself.
TEST_F(LoggersFaultsTest, LosesNothingAndRepeatsNothingAtForks) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer allows no new threads after a fork";
  constexpr int kForks = 20;
  constexpr int kLines = 50;
  const Ref<LUMBoundedLogger> logger =
      addBounded("forks.log", {}, LUMLogPattern::initWithPattern("{text} {fields}"_s));
  for (int round = 0; round < kForks; ++round) {
    for (int i = 0; i < kLines; ++i) LUMLogAt(LUMLogLevelInfo, "line"_s, LUMLogField("n", round * 100 + i));
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
      LUMLogAt(LUMLogLevelInfo, "line"_s, LUMLogField("n", round * 100 + kLines));
      _exit(logger->flush(60'000) ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_EQ(status, 0);
  }
  EXPECT_TRUE(logger->flush(60'000));
  const std::map<int, int> numbers = numbersIn("forks.log", " n=");
  EXPECT_EQ(numbers.size(), std::size_t{kForks} * (kLines + 1));
  EXPECT_TRUE(std::ranges::all_of(numbers, [](const auto& number) { return number.second == 1; }));
}

// The file goes away again and again while threads log. Each line is in one of the files, or counted.
TEST_F(LoggersFaultsTest, AccountsForEachLineWhileTheFileIsMoved) {
  constexpr int kThreads = 4;
  constexpr int kLines = 2000;
  constexpr int kMoves = 20;
  LUMFileLoggerOptions options;
  options.formatter = LUMLogPattern::initWithPattern("{text} {fields}"_s);
  options.pathCheckIntervalInMilliseconds = 0;
  const Ref<LUMFileLogger> file = LUMFileLogger::initWithPath(path("moved.log"), options);
  const Ref<LUMBoundedLogger> logger = LUMBoundedLogger::initWithLogger(file);
  multiplexer_->addSyncLogger(logger);
  added_.emplace_back(logger);
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([thread] {
      for (int i = 0; i < kLines; ++i)
        LUMLogAt(LUMLogLevelInfo, "line"_s, LUMLogField("n", thread * kLines + i));
    });
  }
  for (int move = 0; move < kMoves; ++move) {
    std::error_code absent;
    std::filesystem::rename(folder_ / "moved.log", folder_ / ("moved.log." + std::to_string(move)), absent);
    std::this_thread::yield();
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_TRUE(logger->flush(60'000));
  std::map<int, int> all;
  for (const auto& entry : std::filesystem::directory_iterator(folder_)) {
    for (const auto& [number, count] : numbersIn(entry.path().filename().c_str(), " n="))
      all[number] += count;
  }
  EXPECT_EQ(all.size() + file->droppedCount() + logger->droppedCount(), std::size_t{kThreads} * kLines);
  EXPECT_TRUE(std::ranges::all_of(all, [](const auto& number) { return number.second == 1; }));
}

}  // namespace
