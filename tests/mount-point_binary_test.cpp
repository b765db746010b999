// The mount-point executable as it is installed, perhaps with raised privileges: what it is linked
// from, how it is hardened, and what it does besides its work.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>
#include <fstream>
#include <iterator>
#include <set>
#include <sstream>

#include "tests/support/EnvironmentTrace.h"
#include "tests/support/Process.h"

namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::IsSubsetOf;
using testing::Not;

constexpr std::string_view kInstrumentation = INSTRUMENTATION;

class MountPointBinaryTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!kInstrumentation.empty()) {
      GTEST_SKIP() << "built with instrumentation (" << kInstrumentation << "), which is never installed";
    }
  }

  // The files that our own code was compiled to.
  static std::vector<std::string> commandObjects() {
    std::istringstream list(COMMAND_OBJECTS " " MAIN_OBJECT);
    return {std::istream_iterator<std::string>(list), {}};
  }
  static std::string commandObject(const std::string& name) {
    for (const std::string& object : commandObjects()) {
      if (object.find(name) != std::string::npos) return object;
    }
    ADD_FAILURE() << name;
    return "";
  }

  static std::string outputOf(const std::vector<std::string>& arguments) {
    const ProcessResult result = runProcess(arguments);
    EXPECT_EQ(result.exitStatus, 0) << result.standardError;
    return result.standardOutput;
  }

  // What the command did when asked to make a directory with a slash in its name, which it does without
  // touching a file: how it ended, what it said, and its system calls by name and in order.
  struct Run {
    ProcessResult result;
    std::vector<std::string> systemCalls;
  };
  // All that its environment has is PATH and `variable`, which is a name with or without a value.
  static Run runTraced(const std::string& variable) {
    const std::string trace =
        testing::TempDir() + "/mount-point_binary_test.trace." + std::to_string(getpid());
    Run run;
    run.result = runProcess({"env", "-i", "PATH=/usr/bin:/bin", "strace", "-f", "-qq", "-o", trace, "-E",
                             variable, MOUNT_POINT, "a/b"});
    std::ifstream file(trace);
    for (std::string line; std::getline(file, line);) {
      // Each line is a process identifier and a call with its arguments.
      const std::size_t begin = line.find_first_not_of("0123456789 ");
      const std::size_t end = line.find('(', begin);
      if (end != std::string::npos) run.systemCalls.push_back(line.substr(begin, end - begin));
    }
    file.close();
    remove(trace.c_str());
    return run;
  }
};

TEST_F(MountPointBinaryTest, LoadsNothing) {
  EXPECT_THAT(outputOf({"readelf", "--wide", "--dynamic", MOUNT_POINT}), Not(HasSubstr("(NEEDED)")));
  EXPECT_THAT(outputOf({"readelf", "--wide", "--program-headers", MOUNT_POINT}), Not(HasSubstr("INTERP")));
}

// The libraries are there, with what sets the registry up when the program is loaded.
TEST_F(MountPointBinaryTest, CarriesTheLibraries) {
  const std::string symbols = outputOf({"nm", "--demangle", "--defined-only", MOUNT_POINT_SYMBOLS});
  for (const char* const name :
       {"SRLRegistry::load()", "LUMLogMultiplexer::logWithMessage(", "PECErrorHandler::register_()",
        "ZEBLogger::sharedLogger()", "LUMLoggingReroutingZEBLogger::", "AVOProvider::get() const"}) {
    EXPECT_THAT(symbols, HasSubstr(name));
  }
}

TEST_F(MountPointBinaryTest, IsPositionIndependent) {
  EXPECT_THAT(outputOf({"readelf", "--file-header", MOUNT_POINT}), HasSubstr("DYN"));
  const std::string dynamic = outputOf({"readelf", "--wide", "--dynamic", MOUNT_POINT});
  EXPECT_THAT(dynamic, HasSubstr("PIE"));
  EXPECT_THAT(dynamic, Not(HasSubstr("TEXTREL")));
}

TEST_F(MountPointBinaryTest, HasReadOnlyRelocationsAllBoundAtItsStart) {
  EXPECT_THAT(outputOf({"readelf", "--wide", "--program-headers", MOUNT_POINT}), HasSubstr("GNU_RELRO"));
  EXPECT_THAT(outputOf({"readelf", "--wide", "--dynamic", MOUNT_POINT}), HasSubstr("BIND_NOW"));
}

TEST_F(MountPointBinaryTest, HasNoMemoryThatIsBothWritableAndExecutable) {
  std::istringstream headers(outputOf({"readelf", "--wide", "--program-headers", MOUNT_POINT}));
  int segments = 0;
  bool hasStack = false;
  for (std::string line; std::getline(headers, line);) {
    if (line.find("LOAD") == std::string::npos && line.find("GNU_STACK") == std::string::npos) continue;
    EXPECT_THAT(line, Not(HasSubstr("RWE")));
    ++segments;
    hasStack = hasStack || line.find("GNU_STACK") != std::string::npos;
  }
  EXPECT_GT(segments, 1);
  EXPECT_TRUE(hasStack);
}

TEST_F(MountPointBinaryTest, ProtectsItsStackAndChecksItsCallsOfTheStandardLibrary) {
  const std::string command = outputOf({"nm", commandObject("/MountPointCommand.")});
  EXPECT_THAT(command, HasSubstr("__stack_chk_fail"));
#if defined(__OPTIMIZE__) && !defined(__clang__)  // clang cannot check calls with variable arguments
  EXPECT_THAT(command, HasSubstr("__fprintf_chk"));
#endif
}

// A debugger that is given the executable finds its symbols in the file beside it.
TEST_F(MountPointBinaryTest, IsStrippedAndLeadsToItsSymbols) {
  const std::string sections = outputOf({"readelf", "--wide", "--sections", MOUNT_POINT});
  EXPECT_THAT(sections, HasSubstr(".gnu_debuglink"));
  EXPECT_THAT(sections, Not(HasSubstr(".symtab")));
  EXPECT_THAT(sections, Not(HasSubstr(".debug_")));
  EXPECT_THAT(outputOf({"readelf", "--wide", "--sections", MOUNT_POINT_SYMBOLS}), HasSubstr(".debug_info"));
}

// Of the two marks of control-flow enforcement, one needs nothing but calls that return. The other needs
// every object to be compiled for it; ours are, the C library is not.
TEST_F(MountPointBinaryTest, BearsTheMarkOfShadowStacks) {
  EXPECT_THAT(outputOf({"readelf", "--notes", MOUNT_POINT}), HasSubstr("SHSTK"));
  for (const std::string& object : commandObjects()) {
    EXPECT_THAT(outputOf({"readelf", "--notes", object}), HasSubstr("IBT, SHSTK")) << object;
  }
}

// They run before the command. One is the profiling's, one announces all classes of the libraries, and the
// others are those of the C and C++ libraries. There used to be one for each class in each source file, 487
// in all.
TEST_F(MountPointBinaryTest, HasFewInitialisers) {
#if defined(__clang__)
  GTEST_SKIP() << "clang leaves one call for each source file";
#endif
  const std::string sections = outputOf({"readelf", "--wide", "--sections", MOUNT_POINT});
  std::istringstream words(sections.substr(sections.find(".init_array")));
  std::string name;
  std::string type;
  std::string address;
  std::string offset;
  std::string size;
  ASSERT_TRUE(words >> name >> type >> address >> offset >> size);
  EXPECT_LE(std::stoul(size, nullptr, 16) / sizeof(void*), 10U);
}

TEST_F(MountPointBinaryTest, CarriesNoPrivilegeByItself) {
  struct stat status{};
  ASSERT_EQ(stat(MOUNT_POINT, &status), 0);
  EXPECT_EQ(status.st_mode & (S_ISUID | S_ISGID), 0U);
}

class MountPointTracedTest : public MountPointBinaryTest {
 protected:
  void SetUp() override {
    MountPointBinaryTest::SetUp();
    if (IsSkipped()) return;
    if (const std::string refusal = tracingRefusal(); !refusal.empty()) GTEST_SKIP() << refusal;
  }
};

// All that happens beside the one write: the C library's start (the thread's own data, random bytes,
// where the program lies, read-only relocations), and that of the libraries. The main thread learns that it
// is that, and signals are blocked while the handlers of forks are registered. The command itself takes on
// the identity of its caller (capget to capset; as an ordinary user it only looks whether there is anything
// to give up), and has the signal ignored that a limit on the size of files would send (rt_sigaction). No
// file is opened, no thread or process is started.
TEST_F(MountPointTracedTest, AsksTheSystemForNothingThatIsNotAccountedFor) {
  const std::vector<std::string> calls = runTraced("NOTHING").systemCalls;
  const std::set<std::string> accounted = {
      "execve",     "brk",      "arch_prctl", "set_tid_address", "set_robust_list", "rseq",
      "prlimit64",  "readlink", "readlinkat", "getrandom",       "mprotect",        "write",
      "exit_group", "gettid",   "getpid",     "rt_sigaction",    "capget",          "getgid",
      "getuid",     "setfsgid", "setfsuid",   "capset",          "rt_sigprocmask"};
  EXPECT_THAT(calls, testing::Contains("write"));
  EXPECT_THAT(std::set<std::string>(calls.begin(), calls.end()), IsSubsetOf(accounted));
}

// The C library, being linked in, asks for what its dynamic loader would; nothing in this program loads
// anything, so the answers have no effect. Whatever comes to this list needs as good a reason.
TEST_F(MountPointTracedTest, ReadsNoEnvironmentVariableThatIsNotAccountedFor) {
  const std::set<std::string> accounted = {"LD_LIBRARY_PATH", "LD_WARN",         "LD_BIND_NOW",
                                           "LD_BIND_NOT",     "LD_DYNAMIC_WEAK", "LD_PROFILE_OUTPUT"};
  for (const std::vector<std::string>& arguments :
       {std::vector<std::string>{MOUNT_POINT}, {MOUNT_POINT, "a/b"}}) {
    const std::set<std::string> names = environmentVariablesReadBy(arguments, MOUNT_POINT_SYMBOLS);
    EXPECT_THAT(names, testing::Contains("LD_LIBRARY_PATH")) << "the trace is blind";
    EXPECT_THAT(names, IsSubsetOf(accounted));
  }
}

// What the trace cannot show, for want of a directory to make: our own code refers to no environment.
TEST_F(MountPointBinaryTest, RefersToNoEnvironment) {
  for (const std::string& object : commandObjects()) {
    const std::string symbols = outputOf({"nm", "--undefined-only", object});
    EXPECT_THAT(symbols, HasSubstr(" U "));
    for (const char* const name : {"getenv", "environ", "pthread_", "setlocale"}) {
      EXPECT_THAT(symbols, Not(HasSubstr(name))) << object;
    }
  }
}

// A value of MALLOC_TOP_PAD_ or of GLIBC_TUNABLES used to end the command before its main.
TEST_F(MountPointTracedTest, DoesTheSameInAnyEnvironment) {
  const Run expected = runTraced("NOTHING");
  EXPECT_EQ(expected.result.exitStatus, 22);
  EXPECT_THAT(expected.systemCalls, Not(IsEmpty()));
  for (const char* const variable :
       {"GLIBC_TUNABLES=glibc.malloc.top_pad=1099511627776:glibc.malloc.mmap_threshold=0",
        "GLIBC_TUNABLES=glibc.malloc.perturb=255:glibc.malloc.check=3:glibc.rtld.optional_static_tls=0",
        "GLIBC_TUNABLES=glibc.malloc.arena_max=1:glibc.malloc.mxfast=0:glibc.malloc.tcache_count=0",
        "MALLOC_TOP_PAD_=1099511627776",
        "MALLOC_MMAP_THRESHOLD_=0",
        "MALLOC_PERTURB_=255",
        "MALLOC_CHECK_=3",
        "MALLOC_ARENA_MAX=1",
        "MALLOC_TRACE=/tmp/trace",
        "LD_PRELOAD=/hostile.so",
        "LD_AUDIT=/hostile.so",
        "LD_LIBRARY_PATH=/hostile:/tmp",
        "LD_BIND_NOT=1",
        "LD_SHOW_AUXV=1",
        "LD_DEBUG=all",
        "LANG=de_DE.UTF-8",
        "LC_ALL=zh_CN.GB18030",
        "LANGUAGE=de",
        "LOCPATH=/tmp",
        "NLSPATH=/tmp/%N",
        "GCONV_PATH=/tmp",
        "TZ=/etc/passwd",
        "HOME=/tmp",
        "TMPDIR=/tmp",
        "GETCONF_DIR=/tmp",
        "OS_ACTIVITY_MODE=debug",
        "ZEBVerboseLogging=YES"}) {
    SCOPED_TRACE(variable);
    Run run = runTraced(variable);
    // The C library copies this one into what is left of the program's last page, or else into a new one.
    if (std::string_view(variable).starts_with("GLIBC_TUNABLES=")) {
      const auto copied = run.systemCalls.begin() + 1;
      if (*copied == "mmap") run.systemCalls.erase(copied);
    }
    EXPECT_EQ(run.result.exitStatus, expected.result.exitStatus);
    EXPECT_EQ(run.result.signal, 0);
    EXPECT_EQ(run.result.standardOutput, expected.result.standardOutput);
    EXPECT_EQ(run.result.standardError, expected.result.standardError);
    EXPECT_EQ(run.systemCalls, expected.systemCalls);
  }
}

}  // namespace
