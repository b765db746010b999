// Tests the executable of the mount-point command, which may be installed with raised privileges. The tests
// show what it links, how it is hardened, and what it does besides its work.

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
      GTEST_SKIP() << "instrumented builds (" << kInstrumentation << ") are never installed";
    }
  }

  // Returns the object files of the command's own code.
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

  // A run of the command with a name that contains a slash, which the command rejects without touching a
  // file. Has the result and the names of the system calls, in order.
  struct Run {
    ProcessResult result;
    std::vector<std::string> systemCalls;
  };
  // Runs the command with strace. Its environment contains only PATH and `variable`, a name with or without a
  // value.
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

TEST_F(MountPointBinaryTest, LoadsNoLibraries) {
  EXPECT_THAT(outputOf({"readelf", "--wide", "--dynamic", MOUNT_POINT}), Not(HasSubstr("(NEEDED)")));
  EXPECT_THAT(outputOf({"readelf", "--wide", "--program-headers", MOUNT_POINT}), Not(HasSubstr("INTERP")));
}

// The executable contains the libraries, including the load hook that sets up the registry.
TEST_F(MountPointBinaryTest, ContainsTheLibraries) {
  const std::string symbols = outputOf({"nm", "--demangle", "--defined-only", MOUNT_POINT_SYMBOLS});
  for (const char* const name :
       {"SRLRegistry::load()", "LUMLogMultiplexer::logWithMessage(", "PECErrorHandler::register_()",
        "ZEBLogger::sharedLogger()", "LUMLoggingReroutingZEBLogger::", "AVOProvider::get() const"}) {
    EXPECT_THAT(symbols, HasSubstr(name));
  }
}

// A local static variable that another thread initialises during a fork is never initialised in the child.
// The default assertion handler used to be one: the child waited for ever.
TEST_F(MountPointBinaryTest, LibrariesHaveNoStaticVariablesThatInitialiseThemselvesOnFirstUse) {
  std::istringstream libraries(LIBRARY_FILES);
  std::size_t count = 0;
  for (std::string library; libraries >> library; ++count) {
    EXPECT_THAT(outputOf({"nm", "-C", library}), Not(HasSubstr("guard variable"))) << library;
  }
  EXPECT_EQ(count, 7U);
}

TEST_F(MountPointBinaryTest, IsPositionIndependent) {
  EXPECT_THAT(outputOf({"readelf", "--file-header", MOUNT_POINT}), HasSubstr("DYN"));
  const std::string dynamic = outputOf({"readelf", "--wide", "--dynamic", MOUNT_POINT});
  EXPECT_THAT(dynamic, HasSubstr("PIE"));
  EXPECT_THAT(dynamic, Not(HasSubstr("TEXTREL")));
}

TEST_F(MountPointBinaryTest, BindsAllRelocationsAtStartUpAndMakesThemReadOnly) {
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

TEST_F(MountPointBinaryTest, UsesStackProtectionAndFortification) {
  const std::string command = outputOf({"nm", commandObject("/MountPointCommand.")});
  EXPECT_THAT(command, HasSubstr("__stack_chk_fail"));
#if defined(__OPTIMIZE__) && !defined(__clang__)  // clang cannot check calls with variable arguments
  EXPECT_THAT(command, HasSubstr("__fprintf_chk"));
#endif
}

// A debugger finds the executable's symbols in the file beside it.
TEST_F(MountPointBinaryTest, IsStrippedAndRefersToItsSymbolFile) {
  const std::string sections = outputOf({"readelf", "--wide", "--sections", MOUNT_POINT});
  EXPECT_THAT(sections, HasSubstr(".gnu_debuglink"));
  EXPECT_THAT(sections, Not(HasSubstr(".symtab")));
  EXPECT_THAT(sections, Not(HasSubstr(".debug_")));
  EXPECT_THAT(outputOf({"readelf", "--wide", "--sections", MOUNT_POINT_SYMBOLS}), HasSubstr(".debug_info"));
}

// There are two marks of control-flow enforcement. SHSTK (shadow stacks) only needs calls that return
// normally. IBT needs every object to be compiled for it. The command's objects are, but the C library's are
// not.
TEST_F(MountPointBinaryTest, IsMarkedForShadowStacks) {
  EXPECT_THAT(outputOf({"readelf", "--notes", MOUNT_POINT}), HasSubstr("SHSTK"));
  for (const std::string& object : commandObjects()) {
    EXPECT_THAT(outputOf({"readelf", "--notes", object}), HasSubstr("IBT, SHSTK")) << object;
  }
}

// Initialisers run before `main`. One belongs to profiling, one announces all classes of the libraries, and
// the others belong to the C and C++ libraries. There used to be one for each class in each source file, 487
// in all.
TEST_F(MountPointBinaryTest, HasFewInitialisers) {
#if defined(__clang__)
  GTEST_SKIP() << "clang keeps an initialiser for each source file";
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

TEST_F(MountPointBinaryTest, IsBuiltWithoutSetIdBits) {
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

// Besides the one write, these calls are expected:
//
// - the C library's start-up: thread-local data, random bytes, the program's path, read-only relocations
// - the libraries' start-up: recognising the main thread (gettid, getpid)
// - the registration of fork handlers, during which signals are blocked (rt_sigprocmask)
// - adopting the caller's identity (capget to capset); an ordinary user only checks its capabilities
// - ignoring SIGXFSZ, the signal of the limit on the size of files (rt_sigaction)
//
// The command opens no file and starts no thread or process.
TEST_F(MountPointTracedTest, MakesOnlyExpectedSystemCalls) {
  const std::vector<std::string> calls = runTraced("NOTHING").systemCalls;
  const std::set<std::string> accounted = {
      "execve",     "brk",      "arch_prctl", "set_tid_address", "set_robust_list", "rseq",
      "prlimit64",  "readlink", "readlinkat", "getrandom",       "mprotect",        "write",
      "exit_group", "gettid",   "getpid",     "rt_sigaction",    "capget",          "getgid",
      "getuid",     "setfsgid", "setfsuid",   "capset",          "rt_sigprocmask"};
  EXPECT_THAT(calls, testing::Contains("write"));
  EXPECT_THAT(std::set<std::string>(calls.begin(), calls.end()), IsSubsetOf(accounted));
}

// The statically linked C library reads the variables of its dynamic loader. They have no effect, because the
// command loads nothing. Each addition to this list needs an equally good reason.
TEST_F(MountPointTracedTest, ReadsOnlyExpectedEnvironmentVariables) {
  const std::set<std::string> accounted = {"LD_LIBRARY_PATH", "LD_WARN",         "LD_BIND_NOW",
                                           "LD_BIND_NOT",     "LD_DYNAMIC_WEAK", "LD_PROFILE_OUTPUT"};
  for (const std::vector<std::string>& arguments :
       {std::vector<std::string>{MOUNT_POINT}, {MOUNT_POINT, "a/b"}}) {
    const std::set<std::string> names = environmentVariablesReadBy(arguments, MOUNT_POINT_SYMBOLS);
    EXPECT_THAT(names, testing::Contains("LD_LIBRARY_PATH")) << "the trace is blind";
    EXPECT_THAT(names, IsSubsetOf(accounted));
  }
}

// The traced runs make no directory, so they do not cover all code. Therefore this test shows that the
// command's own code does not refer to the environment at all.
TEST_F(MountPointBinaryTest, DoesNotReferToTheEnvironment) {
  for (const std::string& object : commandObjects()) {
    const std::string symbols = outputOf({"nm", "--undefined-only", object});
    EXPECT_THAT(symbols, HasSubstr(" U "));
    for (const char* const name : {"getenv", "environ", "pthread_", "setlocale"}) {
      EXPECT_THAT(symbols, Not(HasSubstr(name))) << object;
    }
  }
}

// Some values of MALLOC_TOP_PAD_ and GLIBC_TUNABLES used to end the command before `main`.
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
    // The C library copies this variable into the rest of the program's last page, or into a new page if
    // there is no room.
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
