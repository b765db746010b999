// Each case crashes a child of this process, and reads the file to which the child's loggers write. The cases
// are a way to crash and a state of the loggers. All messages that wait must be in the file, in order and
// once, before the line about the crash. The child must end by its signal.

#include "Shared/Logging/Loggers/LUMLogCrash.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pthread.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cassert>
#include <csetjmp>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fstream>
#include <memory>
#include <new>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "Shared/Logging/LUMAsyncLogger.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/Loggers/LUMBoundedLogger.h"
#include "Shared/Logging/Loggers/LUMLogCrashOutput.h"
#include "Shared/Logging/Loggers/LUMLogLine.h"
#include "Shared/Logging/Loggers/LUMRingLogger.h"
#include "tests/support/Sanitizers.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;
using testing::MatchesRegex;

constexpr bool kIsSanitized = RT_TEST_ADDRESS_SANITIZER != 0 || RT_TEST_THREAD_SANITIZER != 0;

// The child.

constinit int file = -1;
constinit volatile int zero = 0;
constinit volatile int* volatile nowhere = nullptr;

void writeLine(std::string_view text) noexcept {
  std::array<char, 512> line{};
  LUMLogLine whole(line, LUMLogLine::Caller::kSignalHandler);
  whole.append(text);
  whole.append('\n');
  [[maybe_unused]] const ssize_t count = write(file, whole.text().data(), whole.text().size());
}

// An output that writes lines to `file`. What it does besides depends on its members.
class Output final : public rt::Implements<Output, LUMLogOutput> {
 public:
  static constexpr std::string_view kClassName = "Output";
  Output() : Implements(nullptr) {}
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    writeLine(message->formattedString().view());
    if (inLog != nullptr) inLog();
  }
  void logInSignalHandler(const LUMLogMessage& message) noexcept override {
    if (message.logMetadata() && message.logMetadata()->component() == "LUMLogCrash") writeLine("crash:");
    writeLine(message.formattedString().view());
    if (inHandler != nullptr) inHandler();
  }
  void (*inLog)() = nullptr;
  void (*inHandler)() = nullptr;
};

// The same, on a queue that the test can hold. Its messages wait in the bounded logger.
class QueuedOutput final : public rt::Implements<QueuedOutput, LUMLogOutput, LUMAsyncLogger> {
 public:
  static constexpr std::string_view kClassName = "QueuedOutput";
  QueuedOutput() : Implements(nullptr) {}
  void logWithMessage(const rt::Ref<LUMLogMessage>& message) override {
    writeLine(message->formattedString().view());
  }
  void logInSignalHandler(const LUMLogMessage& message) noexcept override {
    output_.logInSignalHandler(message);
  }
  rt::Ref<LUMLogFilter> filter() const override { return nullptr; }
  rt::Ref<rt::Queue> operationQueue() const override { return queue; }
  LUMLogDispatchMode dispatchModeForMessage(const LUMLogMessage& /*message*/) const override { return 0; }

  const rt::Ref<rt::Queue> queue = rt::make<rt::Queue>("held"_s);

 private:
  Output output_;
};

constinit std::atomic<bool> never = false;

void stay() {
  never.wait(false);
}

void log(LUMSyncLogger& logger, int from, int count) {
  for (int i = from; i < from + count; ++i)
    logger.logWithMessage(messageWith(LUMLogLevelInfo, rt::String::fromUTF8Repaired(std::to_string(i))));
}

// The loggers of a child live until it ends.
template <class T>
T& keep(T value) {
  return *new T(std::move(value));
}

rt::Ref<LUMBoundedLogger>& heldLogger(LUMBoundedLoggerOptions options = {}) {
  const auto output = rt::make<QueuedOutput>();
  static std::atomic<bool> isHeld = false;
  output->queue->async([] {
    isHeld = true;
    isHeld.notify_all();
    stay();
  });
  isHeld.wait(false);
  return keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(output), options));
}

// Ways to crash.

[[gnu::noinline]] int overflow(int depth) {
  volatile char frame[4096];
  frame[0] = static_cast<char>(depth);
  if (depth < 0) return 0;
  return overflow(depth + 1) + frame[0];
}

struct Abstract {
  Abstract() { call(); }
  virtual ~Abstract() = default;
  void call() { virtualCall(); }
  virtual void virtualCall() = 0;
};
struct Concrete : Abstract {
  void virtualCall() override {}
};

void throwIn(const char* place) {
  if (place != nullptr) throw std::runtime_error(place);
}

void throwInNoexcept() noexcept {  // NOLINT(bugprone-exception-escape)
  throwIn("in noexcept");
}

void inThread(void (*body)()) {
  std::thread(body).join();
}

void nullWrite() {
  *nowhere = 1;
}

void onAllSides(void (*body)()) {
  static std::atomic<int> ready = 0;
  ready = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([body] {
      ++ready;
      while (ready < 4) std::this_thread::yield();
      body();
    });
  }
  for (std::thread& thread : threads) thread.join();
}

void busError() {
  char path[] = "/tmp/LUMLogCrash.XXXXXX";
  const int empty = mkstemp(path);
  unlink(path);
  auto* const page =
      static_cast<volatile char*>(mmap(nullptr, 4096, PROT_READ | PROT_WRITE, MAP_SHARED, empty, 0));
  *page = 1;
}

void doubleFree() {
  void* volatile memory = std::malloc(2000);
  void* volatile next = std::malloc(2000);
  std::free(memory);
  std::free(memory);  // NOLINT(clang-analyzer-unix.Malloc)
  std::free(next);
}

struct Crash {
  const char* name;
  int signal;
  void (*body)();
  // How the line about the crash begins.
  const char* line;
};

const Crash kCrashes[] = {
    {"NullWrite", SIGSEGV, nullWrite, "SIGSEGV at address 0x0 in thread"},
    {"NullRead", SIGSEGV, [] { static_cast<void>(*nowhere); }, "SIGSEGV at address 0x0 in"},
    {"NullCall", SIGSEGV, [] { reinterpret_cast<void (*)()>(const_cast<int*>(nowhere))(); },
     "SIGSEGV at address 0x0 in"},
    {"ReadOnlyWrite", SIGSEGV, [] { *const_cast<volatile char*>("constant") = 1; }, "SIGSEGV at address 0x"},
    {"WildWrite", SIGSEGV, [] { *reinterpret_cast<volatile int*>(0x123450) = 1; },
     "SIGSEGV at address 0x123450 in"},
    {"ImpossibleAddress", SIGSEGV,
     [] { *reinterpret_cast<volatile int*>(std::uintptr_t{0x1234567812345678}) = 1; },
     "SIGSEGV at address 0x"},
    {"NullWriteInThread", SIGSEGV, [] { inThread(nullWrite); }, "SIGSEGV at address 0x0 in thread"},
    {"NullWriteInTask", SIGSEGV, [] { rt::make<rt::Queue>("task"_s)->sync(nullWrite); },
     "SIGSEGV at address 0x0"},
    {"NullWriteInQueuedTask", SIGSEGV,
     [] {
       rt::make<rt::Queue>("task"_s)->async(nullWrite);
       stay();
     },
     "SIGSEGV at address 0x0"},
    {"NullWriteInManyThreads", SIGSEGV, [] { onAllSides(nullWrite); }, "SIGSEGV at address 0x0"},
    {"NullWriteInAtExit", SIGSEGV,
     [] {
       std::atexit(nullWrite);
       std::exit(0);
     },
     "SIGSEGV at address 0x0"},
    {"NullWriteInStaticDestructor", SIGSEGV,
     [] {
       static const struct Static {
         ~Static() { nullWrite(); }
       } object;
       std::exit(0);
     },
     "SIGSEGV at address 0x0"},
    {"StackOverflow", SIGSEGV, [] { overflow(0); }, "SIGSEGV at address 0x"},
    {"StackOverflowInThread", SIGSEGV,
     [] {
       inThread([] {
         LUMLogCrash::install();
         overflow(0);
       });
     },
     "SIGSEGV at address 0x"},
    {"BusError", SIGBUS, busError, "SIGBUS at address 0x"},
    {"Division", SIGFPE, [] { zero = 1000 / zero; }, "SIGFPE at address 0x"},
    {"IllegalInstruction", SIGILL, [] { __builtin_trap(); }, "SIGILL at address 0x"},
#if defined(__x86_64__)
    {"Breakpoint", SIGTRAP, [] { asm volatile("int3"); }, "SIGTRAP in thread"},
#endif
    {"Abort", SIGABRT, [] { std::abort(); }, "SIGABRT in thread"},
    {"AbortInThread", SIGABRT, [] { inThread([] { std::abort(); }); }, "SIGABRT in thread"},
    {"AbortInManyThreads", SIGABRT, [] { onAllSides([] { std::abort(); }); }, "SIGABRT in thread"},
    {"PureVirtualCall", SIGABRT, [] { Concrete(); }, "std::terminate in thread"},
    {"DoubleFree", SIGABRT, doubleFree, "SIGABRT in thread"},
    {"UncaughtException", SIGABRT, [] { throw std::runtime_error("no such\nfile \xC3\xA4"); },
     "std::terminate in thread [0-9]+: an exception of type St13runtime_error: no such\\\\nfile [?][?]"},
    {"UncaughtNumber", SIGABRT, [] { throw 1; }, "std::terminate in thread [0-9]+: an exception of type i$"},
    {"UncaughtInThread", SIGABRT, [] { inThread([] { throw std::bad_alloc(); }); },
     "std::terminate in thread [0-9]+: an exception of type St9bad_alloc: std::bad_alloc"},
    {"UncaughtInTask", SIGABRT,
     [] {
       rt::make<rt::Queue>("task"_s)->async([] { throw std::runtime_error("task"); });
       stay();
     },
     "std::terminate in thread [0-9]+: an exception of type St13runtime_error: task"},
    {"ThrowInNoexcept", SIGABRT, throwInNoexcept,
     "std::terminate in thread [0-9]+: an exception of type St13runtime_error: in noexcept"},
    {"RethrowNothing", SIGABRT, [] { throw; }, "std::terminate in thread"},
    {"Terminate", SIGABRT, [] { std::terminate(); }, "std::terminate in thread [0-9]+$"},
    {"ThreadNotJoined", SIGABRT, [] { const std::thread thread(stay); }, "std::terminate in thread"},
    {"RaiseSegv", SIGSEGV, [] { raise(SIGSEGV); }, "SIGSEGV in thread"},
    {"RaiseBus", SIGBUS, [] { raise(SIGBUS); }, "SIGBUS in thread"},
    {"RaiseIll", SIGILL, [] { raise(SIGILL); }, "SIGILL in thread"},
    {"RaiseFpe", SIGFPE, [] { raise(SIGFPE); }, "SIGFPE in thread"},
    {"RaiseAbrt", SIGABRT, [] { raise(SIGABRT); }, "SIGABRT in thread"},
    {"RaiseSys", SIGSYS, [] { raise(SIGSYS); }, "SIGSYS in thread"},
    {"RaiseTrap", SIGTRAP, [] { raise(SIGTRAP); }, "SIGTRAP in thread"},
    {"KilledBySegv", SIGSEGV,
     [] {
       if (fork() == 0) _exit(kill(getppid(), SIGSEGV));
       stay();
     },
     "SIGSEGV from process [0-9]+ in thread"},
    {"KilledBySys", SIGSYS,
     [] {
       if (fork() == 0) _exit(kill(getppid(), SIGSYS));
       stay();
     },
     "SIGSYS from process [0-9]+ in thread"},
    {"InstalledTwice", SIGABRT,
     [] {
       LUMLogCrash::install();
       std::abort();
     },
     "SIGABRT in thread"},
};

// States of the loggers. Each returns how many messages must be in the file, and may log more.

struct State {
  const char* name;
  int (*prepare)();
};

int waiting(int count) {
  log(*heldLogger(), 0, count);
  return count;
}

const State kStates[] = {
    {"NothingWaits", [] { return waiting(0); }},
    {"OneWaits", [] { return waiting(1); }},
    {"ThousandWait", [] { return waiting(1000); }},
    {"FullDroppingNewest",
     [] {
       log(*heldLogger({.capacity = 64, .whenFull = LUMLogWhenFull::kDropNewest}), 0, 100);
       return 64;
     }},
    {"FullDroppingOldest",
     [] {
       const auto& logger = heldLogger({.capacity = 64, .whenFull = LUMLogWhenFull::kDropOldest});
       log(*logger, -36, 100);
       return 64;
     }},
    {"FullBlocking",
     [] {
       auto& logger = heldLogger({.capacity = 64});
       log(*logger, 0, 64);
       std::thread([&logger] { logger->logWithMessage(messageWith(LUMLogLevelInfo, "blocked"_s)); }).detach();
       return 64;
     }},
    {"AllWritten",
     [] {
       auto& logger = keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(rt::make<Output>())));
       log(*logger, 0, 100);
       logger->flush(60'000);
       return 100;
     }},
    {"RunningTask",
     [] {
       log(*keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(rt::make<Output>()))), 0, 1000);
       return 1000;
     }},
    {"RingKeeps",
     [] {
       log(*keep(LUMRingLogger::initWithLogger(rt::make<Output>())), 0, 100);
       return 100;
     }},
    {"RingBeforeBounded",
     [] {
       auto& ring = keep(LUMRingLogger::initWithLogger(heldLogger()));
       log(*ring, 0, 10);
       ring->handOn();
       log(*ring, 10, 10);
       return 20;
     }},
    {"BoundedBeforeRing",
     [] {
       auto& ring = keep(LUMRingLogger::initWithLogger(rt::make<Output>()));
       log(*keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(ring))), 0, 10);
       return 10;
     }},
};

// The parent.

std::vector<std::string> linesOf(const std::string& path) {
  std::ifstream stream(path);
  std::vector<std::string> lines;
  for (std::string line; std::getline(stream, line);) lines.push_back(line);
  return lines;
}

// Runs `body` in a child whose loggers write to `file`, and returns how the child ended.
template <class Body>
int crashChild(Body body, std::vector<std::string>& lines) {
  const std::string path = testing::TempDir() + "/LUMLogCrash." + std::to_string(getpid());
  file = open(path.c_str(), O_CREAT | O_TRUNC | O_WRONLY | O_APPEND | O_CLOEXEC, 0600);
  const pid_t child = fork();
  if (child == 0) {
    alarm(300);
    const rlimit none{};
    setrlimit(RLIMIT_CORE, &none);
    dup2(open("/dev/null", O_WRONLY | O_CLOEXEC), STDERR_FILENO);
    // An exception must not reach GoogleTest.
    [&]() noexcept { body(); }();  // NOLINT(bugprone-exception-escape)
    _exit(99);
  }
  int status = 0;
  waitpid(child, &status, 0);
  close(file);
  lines = linesOf(path);
  unlink(path.c_str());
  return status;
}

bool isSanitizersSignal(int signal) {
  return kIsSanitized && (signal == SIGSEGV || signal == SIGBUS || signal == SIGILL || signal == SIGFPE);
}

void expectWritten(std::vector<std::string> lines, int count, const std::string& line) {
  // A thread that waits for room gets it when the handler has written.
  std::erase(lines, "blocked");
  std::vector<std::string> expected;
  for (int i = 0; i < count; ++i) expected.push_back(std::to_string(i));
  const auto end = std::ranges::find(lines, "crash:");
  EXPECT_EQ(std::vector(lines.begin(), end), expected);
  ASSERT_GE(lines.end() - end, 2) << "no line about the crash";
  EXPECT_THAT(end[1], testing::ContainsRegex("^" + line));
}

using Case = std::pair<Crash, State>;

std::vector<Case> cases() {
  std::vector<Case> all;
  for (const Crash& crash : kCrashes) all.emplace_back(crash, kStates[2]);
  for (const State& state : kStates) {
    for (const Crash& crash : kCrashes) {
      const std::string_view name = crash.name;
      if (&state != &kStates[2] &&
          (name == "NullWrite" || name == "AbortInThread" || name == "UncaughtException"))
        all.emplace_back(crash, state);
    }
  }
  return all;
}

class LUMLogCrashCases : public testing::TestWithParam<Case> {};

TEST_P(LUMLogCrashCases, WriteWhatWaitsAndEndBySignal) {
  const auto& [crash, state] = GetParam();
  if (isSanitizersSignal(crash.signal)) GTEST_SKIP() << "the sanitizer handles this signal and exits";
  if (kIsSanitized && std::string_view(crash.name) == "DoubleFree")
    GTEST_SKIP() << "the sanitizer finds the second free itself";
  int* const count = static_cast<int*>(
      mmap(nullptr, sizeof(int), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
  std::vector<std::string> lines;
  const int status = crashChild(
      [&] {
        LUMLogCrash::install();
        *count = state.prepare();
        crash.body();
      },
      lines);
  EXPECT_TRUE(WIFSIGNALED(status)) << status;
  EXPECT_EQ(WTERMSIG(status), crash.signal);
  expectWritten(lines, *count, crash.line);
  munmap(count, sizeof(int));
}

INSTANTIATE_TEST_SUITE_P(All, LUMLogCrashCases, testing::ValuesIn(cases()),
                         [](const testing::TestParamInfo<Case>& given) {
                           return std::string(given.param.first.name) + "_" + given.param.second.name;
                         });

// Runs `prepare` and `body` in a child and returns its status.
int statusAndLines(void (*body)(), std::vector<std::string>& lines) {
  return crashChild(
      [&] {
        LUMLogCrash::install();
        body();
      },
      lines);
}

// The message in the middle may be written twice: by the task and by the handler.
TEST(LUMLogCrash, WritesTheMessageInTheMiddleAtLeastOnce) {
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        const auto output = rt::make<Output>();
        static std::atomic<bool> isWriting = false;
        output->inLog = [] {
          isWriting = true;
          isWriting.notify_all();
          stay();
        };
        log(*keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(output))), 0, 3);
        isWriting.wait(false);
        std::abort();
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  EXPECT_THAT(lines, ElementsAre("0", "0", "1", "2", "crash:", MatchesRegex("SIGABRT.*")));
}

TEST(LUMLogCrash, MayHappenInTheTarget) {
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        const auto output = rt::make<Output>();
        static std::atomic<bool> mayCrash = false;
        output->inLog = [] {
          mayCrash.wait(false);
          std::abort();
        };
        log(*keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(output))), 0, 3);
        mayCrash = true;
        mayCrash.notify_all();
        stay();
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  EXPECT_THAT(lines, ElementsAre("0", "0", "1", "2", "crash:", MatchesRegex("SIGABRT.*")));
}

TEST(LUMLogCrash, WritesOnceWhatTheTaskStillFinishes) {
  std::vector<std::string> lines;
  statusAndLines(
      [] {
        const auto output = rt::make<Output>();
        static std::atomic<bool> isWriting = false;
        output->inLog = [] {
          isWriting = true;
          isWriting.notify_all();
          while (!LUMLogCrashEntry::isCrashing()) std::this_thread::yield();
        };
        log(*keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(output))), 0, 3);
        isWriting.wait(false);
        std::abort();
      },
      lines);
  EXPECT_THAT(lines, ElementsAre("0", "1", "2", "crash:", MatchesRegex("SIGABRT.*")));
}

// Other threads log meanwhile, so some of their messages come after the crash or not at all. Those that were
// logged before are there once.
TEST(LUMLogCrash, WhileOtherThreadsLog) {
  auto* const logged = static_cast<std::atomic<int>*>(
      mmap(nullptr, sizeof(std::atomic<int>), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
  std::vector<std::string> lines;
  const int status = crashChild(
      [&] {
        LUMLogCrash::install();
        auto& logger = keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(rt::make<Output>())));
        std::thread([&] {
          for (;;) {
            log(*logger, *logged, 1);
            ++*logged;
          }
        }).detach();
        while (*logged < 2000) std::this_thread::yield();
        std::abort();
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  std::vector<int> numbers;
  for (const std::string& line : lines) {
    if (!line.empty() && line.find_first_not_of("0123456789") == std::string::npos)
      numbers.push_back(std::stoi(line));
  }
  ASSERT_GE(numbers.size(), 2000U);
  for (std::size_t i = 0; i < numbers.size(); ++i) ASSERT_EQ(numbers[i], static_cast<int>(i));
  munmap(logged, sizeof(std::atomic<int>));
}

TEST(LUMLogCrash, SaysWhatCouldNotBeWritten) {
  std::vector<std::string> lines;
  statusAndLines(
      [] {
        const auto queue = rt::make<rt::Queue>("held"_s);
        queue->async(stay);
        // It is no LUMLogOutput.
        const auto target = rt::make<TestAsyncLogger>(queue, [](const auto&) {});
        log(*keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMAsyncLogger>(target))), 0, 3);
        log(*heldLogger({.capacity = 2, .whenFull = LUMLogWhenFull::kDropNewest}), 0, 6);
        std::abort();
      },
      lines);
  EXPECT_THAT(lines,
              ElementsAre("0", "1", "crash:",
                          MatchesRegex("SIGABRT in thread [0-9]+; messages that could not be written: 3; "
                                       "messages that full queues had dropped: 4")));
}

TEST(LUMLogCrash, WritesToStandardErrorWithoutOutputs) {
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        dup2(file, STDERR_FILENO);
        std::abort();
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  EXPECT_THAT(lines, ElementsAre(MatchesRegex("SIGABRT in thread [0-9]+")));
}

// One output behind two loggers gets one line about the crash.
TEST(LUMLogCrash, IsReportedOnceToEachOutput) {
  std::vector<std::string> lines;
  statusAndLines(
      [] {
        const auto output = rt::make<Output>();
        for (int i = 0; i < 2; ++i) keep(LUMRingLogger::initWithLogger(output));
        keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(output)));
        std::abort();
      },
      lines);
  EXPECT_THAT(lines, ElementsAre("crash:", MatchesRegex("SIGABRT.*")));
}

// An output that nobody else writes to, and one that a ring writes to, get one line each.
TEST(LUMLogCrash, IsReportedToOutputsThatAskForIt) {
  std::vector<std::string> lines;
  statusAndLines(
      [] {
        class Asking final : public rt::Implements<Asking, LUMLogOutput> {
         public:
          Asking() : Implements(nullptr) {}
          void logWithMessage(const rt::Ref<LUMLogMessage>& /*message*/) override {}
          void logInSignalHandler(const LUMLogMessage& message) noexcept override {
            writeLine("buffered");
            writeLine(message.formattedString().view().substr(0, 7));
          }

         private:
          const LUMLogCrashOutput crashOutput_{*this};
        };
        static_cast<void>(rt::make<Asking>());
        keep(LUMRingLogger::initWithLogger(keep(rt::make<Asking>())));
        keep(rt::make<Asking>());
        std::abort();
      },
      lines);
  EXPECT_THAT(lines, ElementsAre("buffered", "SIGABRT", "buffered", "SIGABRT"));
}

TEST(LUMLogCrash, LeavesOutLoggersThatAreGone) {
  std::vector<std::string> lines;
  statusAndLines(
      [] {
        auto& last = keep(LUMRingLogger::initWithLogger(rt::make<Output>()));
        for (int i = 0; i < 3; ++i) {
          const auto ring = LUMRingLogger::initWithLogger(rt::make<Output>());
          log(*ring, i, 1);
        }
        log(*last, 7, 1);
        std::abort();
      },
      lines);
  EXPECT_THAT(lines, ElementsAre("7", "crash:", MatchesRegex("SIGABRT.*")));
}

// Without a stack of its own, the handler does not run.
TEST(LUMLogCrash, EndsTheProgramAfterAnOverflowOnAThreadWithoutAStack) {
  if (kIsSanitized) GTEST_SKIP() << "the sanitizer handles this signal and exits";
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        waiting(3);
        inThread([] { overflow(0); });
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGSEGV);
  EXPECT_TRUE(lines.empty());
}

// The signal may interrupt the thread anywhere: in the lock of the ring, in a queue, in `malloc`. What it was
// logging may then be lost, but the program ends and says why.
TEST(LUMLogCrash, MayInterruptAThreadThatLogs) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the sanitizer does not interrupt a thread anywhere";
  for (int round = 0; round < 30; ++round) {
    std::vector<std::string> lines;
    const int status = crashChild(
        [round] {
          LUMLogCrash::install();
          auto& ring = keep(LUMRingLogger::initWithLogger(rt::make<Output>(), {.capacity = 4}));
          auto& bounded = keep(LUMBoundedLogger::initWithLogger(
              rt::Ref<LUMSyncLogger>(rt::make<Output>()),
              {.capacity = 4, .whenFull = static_cast<LUMLogWhenFull>(round % 3)}));
          const pthread_t self = pthread_self();
          std::thread([self, round] {
            for (int i = 0; i < round; ++i) std::this_thread::yield();
            pthread_kill(self, SIGABRT);
          }).detach();
          for (;;) {
            log(*ring, 0, 1);
            log(*bounded, 0, 1);
          }
        },
        lines);
    ASSERT_EQ(WTERMSIG(status), SIGABRT);
    ASSERT_EQ(std::ranges::count(lines, "crash:"), 2);
  }
}

// A crash in the handler.

TEST(LUMLogCrash, EndsTheProgramIfAnOutputAborts) {
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        const auto output = rt::make<Output>();
        output->inHandler = [] { std::abort(); };
        log(*keep(LUMRingLogger::initWithLogger(output)), 0, 3);
        raise(SIGSYS);
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  EXPECT_THAT(lines, ElementsAre("0"));
}

TEST(LUMLogCrash, EndsTheProgramIfAnOutputFails) {
  if (kIsSanitized) GTEST_SKIP() << "the sanitizer handles this signal and exits";
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        const auto output = rt::make<Output>();
        output->inHandler = nullWrite;
        log(*keep(LUMRingLogger::initWithLogger(output)), 0, 3);
        std::abort();
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGSEGV);
  EXPECT_THAT(lines, ElementsAre("0"));
}

// Forks, and before `main`.

TEST(LUMLogCrash, InTheChildOfAFork) {
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        auto& logger = heldLogger();
        log(*logger, 100, 5);
        const pid_t child = fork();
        if (child == 0) {
          auto& ring = keep(LUMRingLogger::initWithLogger(rt::make<Output>()));
          log(*ring, 0, 3);
          std::abort();
        }
        int ended = 0;
        waitpid(child, &ended, 0);
        _exit(WIFSIGNALED(ended) ? WTERMSIG(ended) : 0);
      },
      lines);
  EXPECT_EQ(WEXITSTATUS(status), SIGABRT);
  // The child's copy of the bounded logger is empty, but has an output, too.
  EXPECT_THAT(lines, ElementsAre("0", "1", "2", "crash:", MatchesRegex("SIGABRT.*"),
                                 "crash:", MatchesRegex("SIGABRT.*")));
}

// Before `main`, and before GoogleTest: a constructor of this program crashes if the variable is set.
[[gnu::constructor]] void crashBeforeMain() {
  const char* const descriptor = std::getenv("LUM_LOG_CRASH_TEST_FILE");
  if (descriptor == nullptr) return;
  file = std::stoi(descriptor);
  LUMLogCrash::install();
  log(*keep(LUMRingLogger::initWithLogger(rt::make<Output>())), 0, 3);
  std::abort();
}

TEST(LUMLogCrash, BeforeMain) {
  if (access("/proc/self/exe", X_OK) != 0) GTEST_SKIP() << "no way to start this program again here";
  std::vector<std::string> lines;
  const int status = crashChild(
      [] {
        fcntl(file, F_SETFD, 0);
        setenv("LUM_LOG_CRASH_TEST_FILE", std::to_string(file).c_str(), 1);
        execl("/proc/self/exe", "LUMLogCrash_test", nullptr);
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGABRT);
  EXPECT_THAT(lines, ElementsAre("0", "1", "2", "crash:", MatchesRegex("SIGABRT.*")));
}

// Handlers that were there before.

TEST(LUMLogCrash, CallsAnEarlierHandler) {
  std::vector<std::string> lines;
  const int status = crashChild(
      [] {
        struct sigaction action{};
        action.sa_handler = [](int) {
          writeLine("earlier");
          _exit(7);
        };
        sigaction(SIGABRT, &action, nullptr);
        LUMLogCrash::install();
        waiting(2);
        std::abort();
      },
      lines);
  EXPECT_EQ(WEXITSTATUS(status), 7);
  EXPECT_THAT(lines, ElementsAre("0", "1", "crash:", MatchesRegex("SIGABRT.*"), "earlier"));
}

// Regression guard for programs that handle faults: they go on, and so does logging.
TEST(LUMLogCrash, LetsAnEarlierHandlerRecover) {
  std::vector<std::string> lines;
  const int status = crashChild(
      [] {
        struct sigaction action{};
        action.sa_handler = [](int) {};
        sigaction(SIGSYS, &action, nullptr);
        LUMLogCrash::install();
        auto& logger = keep(LUMBoundedLogger::initWithLogger(rt::Ref<LUMSyncLogger>(rt::make<Output>())));
        raise(SIGSYS);
        log(*logger, 0, 2);
        _exit(logger->flush(60'000) ? 7 : 8);
      },
      lines);
  EXPECT_EQ(WEXITSTATUS(status), 7);
  EXPECT_THAT(lines, ElementsAre("crash:", MatchesRegex("SIGSYS.*"), "0", "1"));
}

TEST(LUMLogCrash, LeavesAnIgnoredSignalIgnored) {
  std::vector<std::string> lines;
  const int status = crashChild(
      [] {
        signal(SIGSYS, SIG_IGN);
        LUMLogCrash::install();
        waiting(2);
        raise(SIGSYS);
        _exit(7);
      },
      lines);
  EXPECT_EQ(WEXITSTATUS(status), 7);
  EXPECT_TRUE(lines.empty());
}

TEST(LUMLogCrash, CallsAnEarlierTerminateHandler) {
  std::vector<std::string> lines;
  const int status = crashChild(
      [] {
        std::set_terminate([] {
          writeLine("earlier");
          _exit(7);
        });
        LUMLogCrash::install();
        waiting(2);
        std::terminate();
      },
      lines);
  EXPECT_EQ(WEXITSTATUS(status), 7);
  EXPECT_THAT(lines,
              ElementsAre("0", "1", "crash:", MatchesRegex("std::terminate in thread [0-9]+"), "earlier"));
}

TEST(LUMLogCrash, LeavesOtherSignalsAlone) {
  std::vector<std::string> lines;
  const int status = statusAndLines(
      [] {
        waiting(2);
        raise(SIGTERM);
      },
      lines);
  EXPECT_EQ(WTERMSIG(status), SIGTERM);
  EXPECT_TRUE(lines.empty());
}

}  // namespace
