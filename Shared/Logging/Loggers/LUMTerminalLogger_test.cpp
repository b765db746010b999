#include "Shared/Logging/Loggers/LUMTerminalLogger.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/socket.h>
#include <termios.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <sstream>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/Loggers/LUMLogPattern.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/ForkTest.h"
#include "tests/support/StandardErrorPipe.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;

// A terminal, or another pair of ends: the logger writes to one, the test reads from the other.
class Ends {
 public:
  static Ends terminal() {
    Ends ends;
    ends.reader_ = posix_openpt(O_RDWR | O_NOCTTY);
    EXPECT_EQ(grantpt(ends.reader_), 0);
    EXPECT_EQ(unlockpt(ends.reader_), 0);
    ends.writer_ = open(ptsname(ends.reader_), O_RDWR | O_NOCTTY);
    EXPECT_EQ(isatty(ends.writer_), 1);
    // Lets "\n" stay "\n".
    termios settings{};
    tcgetattr(ends.writer_, &settings);
    settings.c_oflag &= ~static_cast<tcflag_t>(OPOST);
    tcsetattr(ends.writer_, TCSANOW, &settings);
    return ends;
  }
  static Ends pipe() {
    Ends ends;
    std::array<int, 2> both{};
    EXPECT_EQ(::pipe(both.data()), 0);
    ends.reader_ = both[0];
    ends.writer_ = both[1];
    return ends;
  }
  // Each write is one packet.
  static Ends packets() {
    Ends ends;
    std::array<int, 2> both{};
    EXPECT_EQ(socketpair(AF_UNIX, SOCK_DGRAM, 0, both.data()), 0);
    ends.reader_ = both[0];
    ends.writer_ = both[1];
    return ends;
  }
  Ends(Ends&& other) noexcept
      : reader_(std::exchange(other.reader_, -1)), writer_(std::exchange(other.writer_, -1)) {}
  Ends& operator=(Ends&&) = delete;
  ~Ends() {
    closeReader();
    if (writer_ >= 0) close(writer_);
  }

  int writer() const { return writer_; }

  void closeReader() {
    if (reader_ >= 0) close(reader_);
    reader_ = -1;
  }

  // Waits until there is something, and returns what one `read` reads.
  std::string take() const {
    std::array<char, 65'536> bytes{};
    const ssize_t count = read(reader_, bytes.data(), bytes.size());
    return {bytes.data(), count > 0 ? static_cast<std::size_t>(count) : 0};
  }

  // Waits until `size` bytes are there, and returns them.
  std::string take(std::size_t size) const {
    std::string all;
    while (all.size() < size) all += take();
    return all;
  }

 private:
  Ends() = default;
  int reader_ = -1;
  int writer_ = -1;
};

void setVariable(const char* name, const char* value) {
  if (value != nullptr) {
    setenv(name, value, 1);
  } else {
    unsetenv(name);
  }
}

rt::Ref<LUMTerminalLogger> logger(const Ends& ends, LUMTerminalColours colours = LUMTerminalColours::kNever) {
  LUMTerminalLoggerOptions options;
  options.formatter = LUMLogPattern::initWithPattern("{text}"_s);
  options.descriptor = ends.writer();
  options.colours = colours;
  return LUMTerminalLogger::init(options);
}

rt::Ref<LUMLogMessage> message(const std::string& text, LUMLogLevel level = LUMLogLevelInfo) {
  return messageWith(level, rt::String::fromUTF8(text));
}

TEST(LUMTerminalLogger, WritesOnStandardErrorByTheUsualPattern) {
  const rt::Ref<LUMTerminalLogger> terminal = LUMTerminalLogger::init();
  const rt::Ref<LUMLogMessage> given = message("text");
  StandardErrorPipe standardError;
  terminal->logWithMessage(given);
  EXPECT_EQ(standardError.text(),
            std::string(LUMLogPattern::init()->formattedLogMessage(*given).view()) + "\n");
  EXPECT_EQ(terminal->filter(), nullptr);
  EXPECT_TRUE(terminal->flush(0));
}

TEST(LUMTerminalLogger, HasAFilter) {
  LUMTerminalLoggerOptions options;
  options.filter = LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelError);
  EXPECT_EQ(LUMTerminalLogger::init(options)->filter(), options.filter);
}

TEST(LUMTerminalLogger, HasColoursByLevelOnATerminal) {
  setVariable("TERM", "xterm");
  setVariable("NO_COLOR", nullptr);
  const Ends ends = Ends::terminal();
  const rt::Ref<LUMTerminalLogger> terminal = logger(ends, LUMTerminalColours::kAutomatic);
  std::string lines;
  for (LUMLogLevel level = 0; level <= 5; ++level) {
    terminal->logWithMessage(message("a", level));
    lines += ends.take();
  }
  EXPECT_EQ(
      lines,
      "\x1B[2ma\x1B[0m\n\x1B[2ma\x1B[0m\na\n\x1B[31ma\x1B[0m\n\x1B[1;31ma\x1B[0m\n\x1B[1;31ma\x1B[0m\n");
}

TEST(LUMTerminalLogger, HasNoColoursWhereTheyAreNotWanted) {
  struct Case {
    const char* terminal;
    const char* noColour;
    bool expected;
  };
  const Ends ends = Ends::terminal();
  const Ends pipe = Ends::pipe();
  for (const Case& each :
       {Case{"xterm", nullptr, true}, Case{"xterm", "", true}, Case{"xterm", "0", false},
        Case{"dumb", nullptr, false}, Case{"", nullptr, false}, Case{nullptr, nullptr, false}}) {
    setVariable("TERM", each.terminal);
    setVariable("NO_COLOR", each.noColour);
    EXPECT_EQ(logger(ends, LUMTerminalColours::kAutomatic)->usesColours(), each.expected);
    EXPECT_FALSE(logger(pipe, LUMTerminalColours::kAutomatic)->usesColours());
    EXPECT_TRUE(logger(pipe, LUMTerminalColours::kAlways)->usesColours());
    EXPECT_FALSE(logger(ends, LUMTerminalColours::kNever)->usesColours());
  }
}

TEST(LUMTerminalLogger, ChecksTheDescriptor) {
  for (const int descriptor : {-1, 1024}) {
    LUMTerminalLoggerOptions options;
    options.descriptor = descriptor;
    try {
      LUMTerminalLogger::init(options);
      FAIL();
    } catch (const std::invalid_argument& error) {
      EXPECT_EQ(std::string(error.what()),
                "the descriptor " + std::to_string(descriptor) + " is not between 0 and 1023");
    }
  }
}

TEST(LUMTerminalLogger, WritesALineAtOnce) {
  const Ends ends = Ends::packets();
  const rt::Ref<LUMTerminalLogger> terminal = logger(ends, LUMTerminalColours::kAlways);
  const std::string text(400, 'x');
  for (const LUMLogLevel level : {LUMLogLevelInfo, LUMLogLevelError}) {
    terminal->logWithMessage(message(text, level));
    EXPECT_EQ(ends.take(), level == LUMLogLevelInfo ? text + "\n" : "\x1B[31m" + text + "\x1B[0m\n");
  }
}

TEST(LUMTerminalLogger, WritesNothingForAFormatterThatReturnsNull) {
  const Ends ends = Ends::packets();
  LUMTerminalLoggerOptions options;
  options.descriptor = ends.writer();
  options.colours = LUMTerminalColours::kAlways;
  options.formatter = rt::make<TestFormatter>([](const LUMLogMessage& given) {
    return given.level() == LUMLogLevelDebug ? rt::String() : given.formattedString();
  });
  const rt::Ref<LUMTerminalLogger> terminal = LUMTerminalLogger::init(options);
  terminal->logWithMessage(message("a", LUMLogLevelDebug));
  terminal->logWithMessage(message("b"));
  EXPECT_EQ(ends.take(), "b\n");
  EXPECT_EQ(terminal->droppedCount(), 0U);
}

// The stream is non-blocking, as a shell may leave it behind. Nobody reads for a moment.
TEST(LUMTerminalLogger, CountsLinesThatFindNoRoomAndTellsOfThem) {
  for (const bool blocks : {true, false}) {
    const Ends ends = Ends::pipe();
    if (!blocks) fcntl(ends.writer(), F_SETFL, O_NONBLOCK);
    const rt::Ref<LUMTerminalLogger> terminal = logger(ends);
    const std::string text(9999, 'x');  // longer than what a pipe takes in one piece
    std::uint64_t count = 0;
    while (terminal->droppedCount() < 3) {
      terminal->logWithMessage(message(text));
      ++count;
    }
    std::string expected;
    for (std::uint64_t i = 0; i < count - 3; ++i) expected += text + "\n";
    // The first line that was lost may have begun.
    std::string all = ends.take(expected.size());
    EXPECT_EQ(all.substr(0, expected.size()), expected);
    terminal->logWithMessage(message("after"));
    const std::string end = "3 lines were lost: Resource temporarily unavailable\nafter\n";
    while (!all.ends_with(end)) all += ends.take();
    const std::string cut = all.substr(expected.size(), all.size() - expected.size() - end.size());
    EXPECT_TRUE(cut.empty() || cut.ends_with("x\n")) << cut;
    EXPECT_EQ(terminal->droppedCount(), 3U);
  }
}

TEST(LUMTerminalLogger, GoesOnIfNobodyReadsAnyMore) {
  for (const bool isTerminal : {true, false}) {
    Ends ends = isTerminal ? Ends::terminal() : Ends::pipe();
    const rt::Ref<LUMTerminalLogger> terminal = logger(ends);
    terminal->logWithMessage(message("a"));
    EXPECT_EQ(ends.take(), "a\n");
    ends.closeReader();
    for (int i = 0; i < 5; ++i) terminal->logWithMessage(message("b"));
    terminal->logInSignalHandler(*message("c"));
    EXPECT_EQ(terminal->droppedCount(), 5U);
  }
}

// Invariant: each line is there, whole, and those of a thread are in order.
TEST(LUMTerminalLogger, KeepsTheLinesOfThreadsWhole) {
  const Ends ends = Ends::pipe();
  const rt::Ref<LUMTerminalLogger> terminal = logger(ends);
  constexpr int kThreads = 4;
  constexpr int kLines = 100;
  // Some lines are longer than what a pipe takes in one piece. All of them fit into a pipe.
  const auto textOf = [](int thread, int i) {
    return std::to_string(thread) + " " + std::to_string(i) + std::string(i == kLines / 2 ? 5000 : 10, 'x');
  };
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      for (int i = 0; i < kLines; ++i) terminal->logWithMessage(message(textOf(thread, i)));
    });
  }
  std::size_t size = 0;
  for (int i = 0; i < kLines; ++i) size += kThreads * (textOf(0, i).size() + 1);
  std::istringstream all(ends.take(size));
  for (std::thread& thread : threads) thread.join();
  std::array<int, kThreads> next{};
  for (std::string line; std::getline(all, line);) {
    const auto thread = static_cast<std::size_t>(line[0] - '0');
    ASSERT_LT(thread, next.size());
    ASSERT_EQ(line, textOf(static_cast<int>(thread), next[thread]++));
  }
  for (const int count : next) EXPECT_EQ(count, kLines);
  EXPECT_EQ(terminal->droppedCount(), 0U);
}

TEST(LUMTerminalLogger, WritesInASignalHandler) {
  const Ends ends = Ends::packets();
  const rt::Ref<LUMTerminalLogger> coloured = logger(ends, LUMTerminalColours::kAlways);
  coloured->logInSignalHandler(*message("crash", LUMLogLevelFault));
  EXPECT_EQ(ends.take(), "\x1B[1;31mcrash\x1B[0m\n");
  coloured->logInSignalHandler(*message("info"));
  EXPECT_EQ(ends.take(), "info\n");
  coloured->logInSignalHandler(*message(std::string(10'000, 'x'), LUMLogLevelError));
  std::string longLine = ends.take();
  while (!longLine.ends_with('\n')) longLine += ends.take();
  EXPECT_EQ(longLine, "\x1B[31m" + std::string(4096 - 5 - 5, 'x') + "\x1B[0m\n");
}

// Invariant: the child gets the lock.
TEST(LUMTerminalLogger, WorksInTheChildOfAForkWhileAnotherThreadWrites) {
  const Ends ends = Ends::pipe();
  const rt::Ref<LUMTerminalLogger> terminal = logger(ends);
  std::atomic<bool> isOver = false;
  std::thread other([&] {
    while (!isOver) terminal->logWithMessage(message("parent"));
  });
  std::thread reader([&] {
    while (ends.take().find('!') == std::string::npos) {
    }
  });
  for (int i = 0; i < 20; ++i) {
    EXPECT_EQ(statusOfChild([&] {
                terminal->logWithMessage(message("child"));
                return 0;
              }),
              0);
  }
  isOver = true;
  other.join();
  terminal->logWithMessage(message("!"));
  reader.join();
}

TEST(LUMTerminalLogger, AllocatesNothingForALineWithoutColours) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const Ends ends = Ends::pipe();
  const rt::Ref<LUMTerminalLogger> terminal = logger(ends);
  const rt::Ref<LUMLogMessage> given = message("text");
  const AllocationCount count;
  terminal->logWithMessage(given);
  terminal->logInSignalHandler(*given);
  EXPECT_EQ(count.allocations(), 0);
}

}  // namespace
