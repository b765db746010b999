// The mount-point executable as it is installed, perhaps with raised privileges: what it is linked
// from, how it is hardened, and what it does besides its work.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>
#include <fstream>
#include <set>
#include <sstream>

#include "EnvironmentTrace.h"
#include "Process.h"

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

  static std::string outputOf(const std::vector<std::string>& arguments) {
    const ProcessResult result = runProcess(arguments);
    EXPECT_EQ(result.exitStatus, 0) << result.standardError;
    return result.standardOutput;
  }

  // The system calls, by name and in order, of the command asked to make a directory with a slash in
  // its name, which it does without touching a file.
  static std::vector<std::string> systemCalls(const std::function<void()>& beforeExec) {
    const std::string trace =
        testing::TempDir() + "/mount-point_binary_test.trace." + std::to_string(getpid());
    runProcess({"strace", "-f", "-qq", "-o", trace, MOUNT_POINT, "a/b"}, beforeExec);
    std::ifstream file(trace);
    std::vector<std::string> names;
    for (std::string line; std::getline(file, line);) {
      // Each line is a process identifier and a call with its arguments.
      const std::size_t begin = line.find_first_not_of("0123456789 ");
      const std::size_t end = line.find('(', begin);
      if (end != std::string::npos) names.push_back(line.substr(begin, end - begin));
    }
    file.close();
    remove(trace.c_str());
    return names;
  }
};

TEST_F(MountPointBinaryTest, LoadsNothing) {
  EXPECT_THAT(outputOf({"readelf", "--wide", "--dynamic", MOUNT_POINT}), Not(HasSubstr("(NEEDED)")));
  EXPECT_THAT(outputOf({"readelf", "--wide", "--program-headers", MOUNT_POINT}), Not(HasSubstr("INTERP")));
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
  const std::string command = outputOf({"nm", COMMAND_OBJECT});
  EXPECT_THAT(command, HasSubstr("__stack_chk_fail"));
#if defined(__OPTIMIZE__) && !defined(__clang__)  // clang cannot check calls with variable arguments
  EXPECT_THAT(command, HasSubstr("__fprintf_chk"));
#endif
}

TEST_F(MountPointBinaryTest, CarriesNoPrivilegeByItself) {
  struct stat status{};
  ASSERT_EQ(stat(MOUNT_POINT, &status), 0);
  EXPECT_EQ(status.st_mode & (S_ISUID | S_ISGID), 0U);
}

// All that happens beside the one write: the C library's start (memory, the thread's own data, random
// bytes for the stack guard, where the program lies, read-only relocations). No file is opened, no
// thread or process is started.
TEST_F(MountPointBinaryTest, AsksTheSystemForNothingThatIsNotAccountedFor) {
  const std::vector<std::string> calls = systemCalls({});
  const std::set<std::string> accounted = {
      "execve",   "brk",        "arch_prctl", "set_tid_address", "set_robust_list", "rseq",      "prlimit64",
      "readlink", "readlinkat", "getrandom",  "mprotect",        "write",           "exit_group"};
  EXPECT_THAT(calls, testing::Contains("write"));
  EXPECT_THAT(std::set<std::string>(calls.begin(), calls.end()), IsSubsetOf(accounted));
}

// The C library, being linked in, asks for what its dynamic loader would; nothing in this program loads
// anything, so the answers have no effect. Whatever comes to this list needs as good a reason.
TEST_F(MountPointBinaryTest, ReadsNoEnvironmentVariableThatIsNotAccountedFor) {
  const std::set<std::string> accounted = {"LD_LIBRARY_PATH", "LD_WARN",         "LD_BIND_NOW",
                                           "LD_BIND_NOT",     "LD_DYNAMIC_WEAK", "LD_PROFILE_OUTPUT",
                                           "LD_ASSUME_KERNEL"};
  const std::set<std::string> names = environmentVariablesReadBy(MOUNT_POINT);
  EXPECT_THAT(names, testing::Contains("LD_LIBRARY_PATH")) << "the trace is blind";
  EXPECT_THAT(names, IsSubsetOf(accounted));
}

TEST_F(MountPointBinaryTest, DoesTheSameInAnyEnvironment) {
  const std::vector<std::string> calls = systemCalls([] {
    clearenv();
    setenv("PATH", "/usr/bin:/bin", 1);
  });
  const std::vector<std::string> hostile = systemCalls([] {
    for (const char* const name : {"LD_PRELOAD",
                                   "LD_LIBRARY_PATH",
                                   "LD_AUDIT",
                                   "LD_BIND_NOW",
                                   "LD_SHOW_AUXV",
                                   "GLIBC_TUNABLES",
                                   "MALLOC_ARENA_MAX",
                                   "MALLOC_CHECK_",
                                   "MALLOC_TRACE",
                                   "LOCPATH",
                                   "NLSPATH",
                                   "LANG",
                                   "LC_ALL",
                                   "LANGUAGE",
                                   "GCONV_PATH",
                                   "TZ",
                                   "TZDIR",
                                   "HOME",
                                   "TMPDIR",
                                   "IFS",
                                   "HOSTALIASES",
                                   "RES_OPTIONS",
                                   "GETCONF_DIR",
                                   "OS_ACTIVITY_MODE",
                                   "ZEBVerboseLogging"}) {
      setenv(name, "/hostile", 1);
    }
  });
  EXPECT_THAT(calls, Not(IsEmpty()));
  EXPECT_EQ(hostile, calls);
}

}  // namespace
