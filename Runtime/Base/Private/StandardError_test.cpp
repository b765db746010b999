#include "Runtime/Base/Private/StandardError.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <string>
#include <thread>

#include "tests/support/AllocationCount.h"
#include "tests/support/StandardErrorPipe.h"

namespace {

using std::chrono::milliseconds;
namespace StandardError = rt::StandardError;

// A limit for waits that end early, since the stream has a reader. It is long, since the machine may be busy.
constexpr std::chrono::minutes kLong{5};

TEST(StandardError, WritesEveryByte) {
  const std::string text("a\0b\n\xff", 5);
  StandardErrorPipe pipe;
  EXPECT_TRUE(StandardError::write(text, milliseconds(0)));
  EXPECT_TRUE(StandardError::write("", milliseconds(0)));
  EXPECT_EQ(pipe.text(), text);
}

TEST(StandardError, WaitsForAReaderEvenIfTheStreamIsNonBlocking) {
  for (const bool blocks : {true, false}) {
    StandardErrorPipe pipe;
    if (!blocks) pipe.makeNonBlocking();
    const std::string text(1'000'000, 't');
    bool isWritten = false;
    std::thread writer([&] { isWritten = StandardError::write(text, kLong); });
    std::string all;
    while (all.size() < text.size()) all += pipe.take(10'000);
    writer.join();
    EXPECT_TRUE(isWritten);
    EXPECT_TRUE(all == text);
  }
}

TEST(StandardError, GivesUpIfNobodyReads) {
  for (const bool blocks : {true, false}) {
    StandardErrorPipe pipe;
    pipe.fill();
    if (!blocks) pipe.makeNonBlocking();
    EXPECT_FALSE(StandardError::write("no room", milliseconds(0)));
    EXPECT_FALSE(StandardError::write("no room", milliseconds(5)));
  }
}

// A writer used to wait for ever if another writer took the room that it had been told of.
TEST(StandardError, GivesUpIfAnotherWriterTakesTheRoom) {
  for (int round = 0; round < 100; ++round) {
    StandardErrorPipe pipe;
    pipe.fill();
    EXPECT_EQ(pipe.take(4096).size(), 4096U);
    std::array<std::thread, 4> writers;
    for (std::thread& writer : writers) {
      writer = std::thread([] { StandardError::write(std::string(4096, 'w'), milliseconds(0)); });
    }
    for (std::thread& writer : writers) writer.join();
  }
}

TEST(StandardError, RaisesNoSignalIfTheReaderIsGone) {
  // A pipe tells that beforehand, a socket only when it is written to.
  for (const auto kind : {StandardErrorPipe::Kind::pipe, StandardErrorPipe::Kind::socket}) {
    StandardErrorPipe pipe(kind);
    pipe.closeReader();
    EXPECT_FALSE(StandardError::write("nobody", kLong));
    EXPECT_FALSE(StandardError::write("nobody", kLong));
  }
}

TEST(StandardError, RestoresTheSignalMaskOfTheThread) {
  const StandardErrorPipe pipe;
  for (const int how : {SIG_BLOCK, SIG_UNBLOCK}) {
    sigset_t brokenPipe;
    sigset_t previous;
    sigset_t afterwards;
    sigemptyset(&brokenPipe);
    sigaddset(&brokenPipe, SIGPIPE);
    pthread_sigmask(how, &brokenPipe, &previous);
    StandardError::write("text", kLong);
    pthread_sigmask(SIG_SETMASK, &previous, &afterwards);
    EXPECT_EQ(sigismember(&afterwards, SIGPIPE), how == SIG_BLOCK ? 1 : 0);
  }
}

TEST(StandardError, LeavesAForeignSignalPending) {
  sigset_t brokenPipe;
  sigset_t previous;
  sigemptyset(&brokenPipe);
  sigaddset(&brokenPipe, SIGPIPE);
  pthread_sigmask(SIG_BLOCK, &brokenPipe, &previous);
  const auto isPending = [] {
    sigset_t pending;
    sigpending(&pending);
    return sigismember(&pending, SIGPIPE) == 1;
  };
  StandardErrorPipe pipe(StandardErrorPipe::Kind::socket);
  pipe.closeReader();
  EXPECT_FALSE(StandardError::write("nobody", kLong));
  EXPECT_FALSE(isPending());
  pthread_kill(pthread_self(), SIGPIPE);
  EXPECT_FALSE(StandardError::write("nobody", kLong));
  EXPECT_TRUE(isPending());
  int taken = 0;
  if (isPending()) sigwait(&brokenPipe, &taken);
  pthread_sigmask(SIG_SETMASK, &previous, nullptr);
}

TEST(StandardError, GivesUpIfTheStreamIsClosedOrFull) {
  const StandardErrorPipe kept;
  close(STDERR_FILENO);
  EXPECT_FALSE(StandardError::write("closed", kLong));
  const int full = open("/dev/full", O_WRONLY | O_CLOEXEC);
  if (full < 0) GTEST_SKIP() << "no /dev/full";
  dup2(full, STDERR_FILENO);
  if (full != STDERR_FILENO) close(full);
  EXPECT_FALSE(StandardError::write("full", kLong));
}

TEST(StandardError, WritesToAFile) {
  const std::string text(1'000'000, 'f');
  std::FILE* const file = std::tmpfile();
  ASSERT_NE(file, nullptr);
  {
    const StandardErrorPipe kept;
    dup2(fileno(file), STDERR_FILENO);
    EXPECT_TRUE(StandardError::write(text, milliseconds(0)));
  }
  std::string all(text.size() + 1, '\0');
  all.resize(static_cast<std::size_t>(pread(fileno(file), all.data(), all.size(), 0)));
  EXPECT_TRUE(all == text);
  std::fclose(file);
}

TEST(StandardError, AllocatesNothing) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const StandardErrorPipe pipe;
  const AllocationCount count;
  StandardError::write("text", milliseconds(0));
  EXPECT_EQ(count.allocations(), 0);
}

}  // namespace
