#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <atomic>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <sstream>
#include <string>
#include <thread>

#include "Shared/Logging/Loggers/LUMFileLogger.h"
#include "tests/support/ForkTest.h"
#include "tests/support/LUMFileLoggerTest.h"
#include "tests/support/Sanitizers.h"

namespace {

using namespace rt::literals;
namespace fs = std::filesystem;

constexpr const char* kLeaksAfterFork =
    "to the address sanitizer, what the parent's threads hold has leaked when the child of a fork exits";
constexpr const char* kNoThreadsAfterFork = "the sanitizer allows no new threads in the child";

TEST_F(LUMFileLoggerTest, WritesABufferAtExit) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = ~std::uint32_t{0};
  EXPECT_EXIT(
      {
        // The multiplexer of a program keeps its loggers, too.
        LUMFileLogger* const file = logger().detach();
        log(file, "before");
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
  if (RT_TEST_ADDRESS_SANITIZER) GTEST_SKIP() << kLeaksAfterFork;
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
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
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
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
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
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

// Invariant: each line of both processes is there, whole and once.
TEST_F(LUMFileLoggerTest, SharesAFileWithAnotherProcess) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << kNoThreadsAfterFork;
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

TEST_F(LUMFileLoggerTest, WritesABufferAfterADelayAlsoAfterASignalHandler) {
  options_.bufferSize = 1000;
  options_.longestDelayInMilliseconds = 1;
  const rt::Ref<LUMFileLogger> file = logger();
  std::string expected;
  for (int round = 0; round < 20; ++round) {
    log(file, "before");
    file->logInSignalHandler(*message("handler"));
    log(file, "after");
    expected += "before\nhandler\nafter\n";
    while (content() != expected) std::this_thread::yield();
  }
}

TEST_F(LUMFileLoggerTest, CountsTheLinesThatEachProcessHasLost) {
  if (!fs::exists("/dev/full")) GTEST_SKIP() << "no /dev/full";
  fs::create_symlink("/dev/full", path("full"));
  const rt::Ref<LUMFileLogger> file = logger("full");
  log(file, "parent");
  EXPECT_EQ(statusOfChild([&] {
              log(file, "child");
              log(file, "child");
              return static_cast<int>(file->droppedCount());
            }),
            2);
  EXPECT_EQ(file->droppedCount(), 1U);
}

TEST_F(LUMFileLoggerTest, CutsALongLineInASignalHandler) {
  const rt::Ref<LUMFileLogger> file = logger();
  file->logInSignalHandler(*message(std::string(10'000, 'x')));
  std::string expected(4095, 'x');
  expected += '\n';
  EXPECT_EQ(content(), expected);
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
