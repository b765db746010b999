// Tests the mount-point command under resource limits that its caller sets. The command either does its work
// and reports the result, or ends before it has changed anything.

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "tests/support/MountPointTest.h"

namespace {

namespace fs = std::filesystem;

std::function<void()> limiting(__rlimit_resource resource, rlim_t limit) {
  return [resource, limit] {
    const rlimit both{limit, limit};
    require(setrlimit(resource, &both) == 0);
    // The environment would use a part of the stack.
    clearenv();
  };
}

// ---- The size of files ----

class MountPointFileLimitTest : public MountPointTest {
 protected:
  static constexpr const char* kFile = "/messages";

  void SetUp() override {
    MountPointTest::SetUp();
    if (IsSkipped()) return;
    if (kInstrumentation == "coverage") GTEST_SKIP() << "the limit would truncate the coverage counts";
    if (kInstrumentation == "thread") GTEST_SKIP() << "the sanitizer writes files before the command starts";
  }

  // Redirects `stream` to a file that may have at most `limit` bytes.
  static std::function<void()> intoFile(int stream, rlim_t limit) {
    return [stream, limit] {
      const int file = open(kFile, O_WRONLY | O_CREAT | O_TRUNC, 0600);
      require(file >= 0 && dup2(file, stream) == stream);
      limiting(RLIMIT_FSIZE, limit)();
      require(std::signal(SIGXFSZ, SIG_DFL) != SIG_ERR);
    };
  }
  static std::string written() {
    std::ostringstream text;
    text << std::ifstream(kFile).rdbuf();
    return text.str();
  }
  void TearDown() override {
    std::error_code none;
    fs::remove(kFile, none);
  }
};

// A signal used to end the command, so that it had no exit status.
TEST_F(MountPointFileLimitTest, ReportsThatItsMessageDoesNotFitTheFile) {
  expectSuccess(run({"a"}, intoFile(STDERR_FILENO, 0)));
  expectResult(run({"a"}, intoFile(STDERR_FILENO, 0)), EFBIG, "");
  EXPECT_EQ(written(), "");
  expectResult(run({"a"}, intoFile(STDERR_FILENO, 10)), EFBIG, "");
  EXPECT_EQ(written(), "Failed to ");
  expectResult(run({"a"}, intoFile(STDERR_FILENO, 41)), 17, "");
  EXPECT_EQ(written(), "Failed to create [/Volumes/a], errno: 17\n");
  fs::create_directory("/Volumes/a/b");
  expectResult(run({"a", "--remove"}, intoFile(STDERR_FILENO, 0)), EFBIG, "");
}

TEST_F(MountPointFileLimitTest, KeepsAStatusThatIsNotErrnoIfItsMessageDoesNotFit) {
  expectResult(run({}, intoFile(STDERR_FILENO, 0)), 22, "");
  expectResult(run({"a/b"}, intoFile(STDERR_FILENO, 0)), 22, "");
  expectSuccess(run({"a", "--remove"}, intoFile(STDOUT_FILENO, 0)));
  expectSuccess(run({"a", "--remove"}, intoFile(STDOUT_FILENO, 10)));
  EXPECT_EQ(written(), "Path alrea");
}

// ---- Memory ----

class MountPointMemoryLimitTest : public MountPointTest {
 protected:
  void SetUp() override {
    MountPointTest::SetUp();
    if (IsSkipped()) return;
    if (!kInstrumentation.empty()) GTEST_SKIP() << "instrumented builds need more memory";
  }

  static bool isWhole(const ProcessResult& result) { return result.exitStatus == 0 && result.signal == 0; }

  // Expects that the command itself printed nothing before it was ended.
  static void expectNoMessageOfItsOwn(const ProcessResult& result) {
    EXPECT_EQ(result.standardError.find("/Volumes"), std::string::npos) << result.standardError;
    EXPECT_EQ(result.standardOutput, "");
  }

  static void expectAllOrNothing(__rlimit_resource resource, rlim_t limit) {
    SCOPED_TRACE(limit);
    const ProcessResult made = run({"a"}, limiting(resource, limit));
    EXPECT_EQ(fs::exists("/Volumes/a"), isWhole(made));
    expectNoMessageOfItsOwn(made);
    fs::create_directories("/Volumes/a");
    const ProcessResult again = run({"a"}, limiting(resource, limit));
    if (again.exitStatus == 17) {
      expectResult(again, 17, "Failed to create [/Volumes/a], errno: 17\n");
    } else {
      EXPECT_TRUE(again.signal != 0 || again.exitStatus == 127) << again.exitStatus.value_or(-1);
      expectNoMessageOfItsOwn(again);
    }
    const ProcessResult removed = run({"a", "--remove"}, limiting(resource, limit));
    EXPECT_EQ(fs::exists("/Volumes/a"), !isWhole(removed));
    expectNoMessageOfItsOwn(removed);
    fs::remove("/Volumes/a");
  }

  static void expectToWork(__rlimit_resource resource, rlim_t limit) {
    SCOPED_TRACE(limit);
    const std::string name(131071, 'x');
    expectSuccess(run({"a"}, limiting(resource, limit)));
    expectResult(run({"a"}, limiting(resource, limit)), 17, "Failed to create [/Volumes/a], errno: 17\n");
    expectSuccess(run({"a", "--remove"}, limiting(resource, limit)));
    if (resource == RLIMIT_STACK) return;  // The stack holds the arguments.
    const int number = numberOf(ENAMETOOLONG);
    expectResult(run({name}, limiting(resource, limit)), number,
                 "Failed to create [/Volumes/" + name + "], errno: " + std::to_string(number) + "\n");
  }
};

TEST_F(MountPointMemoryLimitTest, DoesAllOfItsWorkOrNothing) {
  for (rlim_t limit = 0; limit < 32; limit += 4) expectAllOrNothing(RLIMIT_STACK, limit << 10);
  for (rlim_t limit = 0; limit < 1024; limit += 64) expectAllOrNothing(RLIMIT_DATA, limit << 10);
  for (rlim_t limit = 0; limit < 6144; limit += 512) expectAllOrNothing(RLIMIT_AS, limit << 10);
}

// The limits are those of the manual. The command used to need 1,284 KiB of data.
TEST_F(MountPointMemoryLimitTest, WorksWithinTheLimitsOfTheManual) {
  expectToWork(RLIMIT_STACK, rlim_t{32} << 10);
  expectToWork(RLIMIT_DATA, rlim_t{768} << 10);
  expectToWork(RLIMIT_AS, rlim_t{6} << 20);
}

// ---- Open files ----

TEST_F(MountPointTest, OpensNoFiles) {
  if (!kInstrumentation.empty()) GTEST_SKIP() << "instrumented builds open files";
  expectSuccess(run({"a"}, limiting(RLIMIT_NOFILE, 0)));
  expectResult(run({"a"}, limiting(RLIMIT_NOFILE, 0)), 17, "Failed to create [/Volumes/a], errno: 17\n");
  expectSuccess(run({"a", "--remove"}, limiting(RLIMIT_NOFILE, 0)));
}

}  // namespace
