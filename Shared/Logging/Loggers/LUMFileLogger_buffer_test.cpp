#include <gtest/gtest.h>

#include <array>
#include <filesystem>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/LUMFileLoggerTest.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

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

}  // namespace
