// Tests files, user defaults, the system's log and call stacks when a system call fails or is interrupted.
//
// There is a small program for each of them. The test runs it once for each of its system calls, and strace
// makes that call fail. After an interruption, the program must finish its work. After an error, it must do
// what is documented, lose no data and leave no descriptor open. Only the calls of the program's thread fail;
// those of the thread that watches user defaults do not.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <map>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>
#include <vector>

#include "Runtime/Base/Private/StandardError.h"
#include "Runtime/Defaults/UserDefaults.h"
#include "Runtime/Process/FileHandle.h"
#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/SystemLog/SystemLog.h"
#include "tests/support/PrivateJournal.h"
#include "tests/support/Process.h"
#include "tests/support/Sanitizers.h"

namespace {

using namespace rt::literals;
using rt::Ref;
namespace fs = std::filesystem;

// The reason why there is no private journal. Empty if there is one.
std::string journalRefusal;

// The exit status of a program that finds a mistake.
constexpr int kIsWrong = 3;
constexpr unsigned kPatience = 60;

// `begin` and `end` mark the system calls to test. The programs do not call getppid elsewhere.
void begin() {
  static_cast<void>(getppid());
}
void end() {
  static_cast<void>(getppid());
}

void require(bool isRight, const char* what) {
  if (isRight) return;
  std::fprintf(stderr, "wrong: %s\n", what);
  std::_Exit(kIsWrong);
}

std::size_t countOfDescriptors() {
  return static_cast<std::size_t>(std::distance(fs::directory_iterator("/proc/self/fd"), {}));
}

std::string contentOf(const fs::path& path) {
  std::ifstream stream(path);
  return {std::istreambuf_iterator<char>(stream), {}};
}

// Appends two lines to a file. The file must contain both, unless an error was reported.
void writeFile(const fs::path& folder, bool isInterrupted) {
  const fs::path path = folder / "log";
  begin();
  bool isWhole = true;
  {
    const Ref<rt::FileHandle> handle =
        rt::FileHandle::openForAppending(rt::String::fromUTF8(path.string()), 0600);
    isWhole = handle != nullptr;
    try {
      if (handle) handle->writeLine("first");
    } catch (const std::system_error&) {
      isWhole = false;
    }
    try {
      if (handle) handle->writeLine(std::string(5000, 'x'));
    } catch (const std::system_error&) {
      isWhole = false;
    }
  }
  end();
  require(isWhole || !isInterrupted, "a line was not written");
  if (isWhole) require(contentOf(path) == "first\n" + std::string(5000, 'x') + "\n", "the lines");
}

// Reads a setting and observes it. What cannot be read is reported and counts as missing.
void observeDefaults(const fs::path& folder, bool isInterrupted) {
  const fs::path path = folder / "defaults.conf";
  std::ofstream(path) << "key = value\n";
  int reports = 0;
  rt::UserDefaults::setReportHandler([&](const rt::String&) { ++reports; });
  const std::string text = path.string();
  begin();
  int calls = 0;
  {
    const Ref<rt::UserDefaults> defaults = rt::UserDefaults::initWithPath(rt::String::fromUTF8(text));
    const rt::UserDefaults::Observation observation =
        defaults->observe("key", rt::UserDefaults::Notify::kAlsoNow, [&] { ++calls; });
    const rt::String value = defaults->stringForKey("key");
    require(value == "value" || (value.isNull() && !isInterrupted), "what was there is not found");
  }
  end();
  require(calls >= 1 && calls <= 2, "the observer");
  if (isInterrupted) require(calls == 1 && reports == 0, "the observer, or a report");
}

void logToSystem(const fs::path& /*folder*/, bool isInterrupted) {
  const rt::SystemLog log("com.example.test"_s, "calls"_s);
  // This text is larger than a datagram.
  const std::string large(1000000, 'x');
  begin();
  errno = EXDEV;
  log.write(rt::SystemLog::Type::error, "short");
  log.write(rt::SystemLog::Type::info, large);
  log.write(rt::SystemLog::Type::info, "last");
  const int error = errno;
  end();
  require(error == EXDEV, "errno");
  require(rt::SystemLog::droppedCount() <= 1, "more was dropped than failed");
  if (isInterrupted) require(rt::SystemLog::droppedCount() == 0, "something was dropped");
}

void writeError(const fs::path& /*folder*/, bool isInterrupted) {
  begin();
  const bool isWritten = rt::StandardError::write("a line\n", std::chrono::seconds(1));
  end();
  require(isWritten || !isInterrupted, "it was not written");
}

void describeCallStack(const fs::path& /*folder*/, bool /*isInterrupted*/) {
  std::array<std::uint64_t, 16> addresses{};
  const std::size_t count = rt::CallStack::capture(addresses);
  begin();
  const std::vector<rt::String> lines = rt::CallStack::symbols(std::span(addresses).first(count));
  end();
  require(lines.size() == count, "the lines");
}

using Program = void (*)(const fs::path& folder, bool isInterrupted);
const std::map<std::string_view, Program> kPrograms = {{"file", writeFile},
                                                       {"defaults", observeDefaults},
                                                       {"log", logToSystem},
                                                       {"error", writeError},
                                                       {"stack", describeCallStack}};

int runProgram(std::string_view name, const fs::path& folder, std::string_view call, std::string_view error) {
  // SIGALRM ends a program that hangs.
  alarm(kPatience);
  const std::size_t before = countOfDescriptors();
  kPrograms.at(name)(folder, error == "EINTR");
  // The log keeps a socket open for each daemon. A call of `close` that strace makes fail closes no
  // descriptor.
  if (call == "close" || name == "log") return 0;
  // The thread that watches user defaults closes its descriptors when it ends.
  while (name == "defaults" && countOfDescriptors() > before) std::this_thread::yield();
  require(countOfDescriptors() == before, "a file is open");
  return 0;
}

// A system call: its name, and its number among the calls of that name, counted from 1.
struct Call {
  std::string name;
  int number = 0;
  bool mayFail = true;
};

class FailingCalls : public testing::Test {
 protected:
  void SetUp() override {
    if (RT_TEST_ADDRESS_SANITIZER || RT_TEST_THREAD_SANITIZER)
      GTEST_SKIP() << "the sanitizer's own system calls would fail too";
    const std::string refused = tracingRefusal();
    if (!refused.empty()) GTEST_SKIP() << refused;
  }

  void TearDown() override { forgetTrace(); }

  // Runs the program `name` once for each of its calls and makes that call fail.
  void tryEachCall(const std::string& name) {
    static const std::set<std::string> kInterruptible = {
        "open",  "openat", "read",   "pread64",  "write",   "writev", "pwritev2",
        "close", "poll",   "select", "pselect6", "connect", "sendmsg"};
    static const std::set<std::string> kOthers = {"access",
                                                  "dup",
                                                  "eventfd2",
                                                  "fcntl",
                                                  "fstat",
                                                  "ioctl",
                                                  "inotify_init1",
                                                  "inotify_add_watch",
                                                  "inotify_rm_watch",
                                                  "lseek",
                                                  "memfd_create",
                                                  "newfstatat",
                                                  "readlink",
                                                  "setsockopt",
                                                  "socket",
                                                  "stat"};
    // These calls never fail here. Some cannot fail. The others concern memory, threads and signals, and fail
    // in the tests of allocations.
    static const std::set<std::string> kLeftAlone = {
        "brk",       "clone3",       "exit_group",    "futex",          "getpid",          "getppid",
        "getrandom", "gettid",       "madvise",       "mmap",           "mprotect",        "munmap",
        "rseq",      "rt_sigaction", "rt_sigpending", "rt_sigprocmask", "rt_sigtimedwait", "set_robust_list",
        "umask"};
    run(name, {}, "");
    const std::vector<Call> calls = callsInTrace();
    int interrupted = 0;
    int failed = 0;
    for (const Call& call : calls) {
      const bool isInterruptible = kInterruptible.contains(call.name);
      if (!isInterruptible && !kOthers.contains(call.name)) {
        EXPECT_TRUE(kLeftAlone.contains(call.name))
            << "the lists above lack " << call.name << ", which the program calls";
        continue;
      }
      if (isInterruptible) {
        runWith(name, call, "EINTR");
        ++interrupted;
      }
      if (call.mayFail) {
        runWith(name, call, "EIO");
        ++failed;
      }
      if (HasFailure()) return;
    }
    std::printf("%d calls interrupted, %d failed\n", interrupted, failed);
    EXPECT_GT(failed, 0);
  }

 private:
  void forgetTrace() const {
    std::error_code error;
    fs::remove(trace_, error);
  }

  void runWith(const std::string& name, const Call& call, const std::string& error) {
    run(name, call, error);
    const std::string what = call.name + " " + std::to_string(call.number) + " with " + error;
    EXPECT_NE(contentOf(trace_).find("(INJECTED)"), std::string::npos) << what << " was not made";
    if (HasFailure()) FAIL() << what;
  }

  void run(const std::string& name, const Call& call, const std::string& error) {
    std::string folder = testing::TempDir() + "failing-calls.XXXXXX";
    ASSERT_NE(mkdtemp(folder.data()), nullptr);
    forgetTrace();
    trace_ = folder + ".trace";
    std::vector<std::string> whole = {"strace", "-y", "-qq", "-o", trace_};
    if (!error.empty()) {
      whole.insert(whole.end(), {"-e", "inject=" + call.name + ":error=" + error +
                                           ":when=" + std::to_string(call.number)});
    }
    whole.insert(whole.end(),
                 {fs::read_symlink("/proc/self/exe"), "--program", name, folder, call.name, error});
    const ProcessResult result = runProcess(whole);
    fs::remove_all(folder);
    EXPECT_EQ(result.signal, 0) << result.standardError;
    EXPECT_EQ(result.exitStatus, 0) << result.standardError;
    if (error == "EINTR") {
      EXPECT_EQ(result.standardError, name == "error" ? "a line\n" : "");
    }
  }

  std::vector<Call> callsInTrace() const {
    std::ifstream stream(trace_);
    std::map<std::string, int> counts;
    std::vector<Call> calls;
    int marks = 0;
    for (std::string line; std::getline(stream, line);) {
      const std::string name = line.substr(0, line.find('('));
      const int number = ++counts[name];
      if (name == "getppid") {
        ++marks;
      } else if (marks == 1) {
        // This wakes a thread through an eventfd. Adding 1 to its counter cannot fail.
        const bool wakes = name == "write" && line.find("[eventfd]") != std::string::npos;
        // The thread that watches defaults closes its watch, or the main thread does if it is the last to
        // have it.
        const bool isOfEither = name == "close" && line.find("anon_inode:") != std::string::npos;
        if (!isOfEither) calls.push_back({name, number, !wakes});
      }
    }
    EXPECT_EQ(marks, 2);
    return calls;
  }

  std::string trace_;
};

TEST_F(FailingCalls, AreHandledByFiles) {
  tryEachCall("file");
}

TEST_F(FailingCalls, AreHandledByUserDefaults) {
  tryEachCall("defaults");
}

TEST_F(FailingCalls, AreHandledByStandardError) {
  tryEachCall("error");
}

TEST_F(FailingCalls, AreHandledByCallStacks) {
  tryEachCall("stack");
}

TEST_F(FailingCalls, AreHandledByTheSystemLog) {
  if (!PrivateJournal::entered()) GTEST_SKIP() << journalRefusal;
  PrivateJournal journal;
  journal.start();
  tryEachCall("log");
}

}  // namespace

int main(int argumentCount, char** arguments) {
  if (argumentCount == 6 && std::string_view(arguments[1]) == "--program")
    return runProgram(arguments[2], arguments[3], arguments[4], arguments[5]);
  testing::InitGoogleTest(&argumentCount, arguments);
  if (testing::GTEST_FLAG(list_tests)) return RUN_ALL_TESTS();
  try {
    PrivateJournal::enter();
  } catch (const std::exception& problem) {
    journalRefusal = std::string("no private journal: ") + problem.what();
  }
  return RUN_ALL_TESTS();
}
