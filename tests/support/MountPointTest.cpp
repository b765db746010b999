#include "tests/support/MountPointTest.h"

#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <fstream>
#include <regex>
#include <stdexcept>
#include <system_error>

#ifdef COMMAND_IS_FOR_MACOS
#include "tests/macos/runner/NotShown.h"
#endif

namespace fs = std::filesystem;

namespace {

// The file for a trace of the command.
constexpr const char* kTrace = "/trace";

// The reason why there is no private root. Empty if there is one.
std::string refusal;
bool asMachineRoot = false;

}  // namespace

void MountPointTest::SetUp() {
  if (!PrivateRoot::entered()) GTEST_SKIP() << refusal;
  PrivateRoot::removeVolumes();
  PrivateRoot::mountVolumes();
}

int MountPointTest::numberOf(int error) {
  if (!kIsForMacOS) return error;
  switch (error) {
    case EAGAIN:
      return 35;
    case ENAMETOOLONG:
      return 63;
    case ENOTEMPTY:
      return 66;
    case EDQUOT:
      return 69;
    default:
      return error;
  }
}

bool MountPointTest::isMachineRoot() {
  return asMachineRoot;
}

ProcessResult MountPointTest::run(std::vector<std::string> arguments,
                                  const std::function<void()>& beforeExec) {
  arguments.insert(arguments.begin(), kCommand);
  return runProcess(arguments, beforeExec);
}

ProcessResult MountPointTest::runInjected(const std::string& calls, const std::string& error,
                                          const std::vector<std::string>& arguments,
                                          const std::function<void()>& beforeExec) {
  std::vector<std::string> whole = {"strace",
                                    "-f",
                                    "-qq",
                                    "-o",
                                    "/dev/null",
                                    "-e",
                                    "trace=" + calls,
                                    "-e",
                                    "inject=" + calls + ":error=" + error};
  whole.emplace_back(kCommand);
  whole.insert(whole.end(), arguments.begin(), arguments.end());
  return runProcess(whole, [&] {
    leaveLeaksAlone();
    if (beforeExec) beforeExec();
  });
}

std::vector<std::string> MountPointTest::systemCalls(const std::vector<std::string>& arguments,
                                                     const std::function<void()>& beforeExec) {
  std::vector<std::string> whole = {"strace", "-f", "-qq", "-s", "200", "-o", kTrace, kCommand};
  whole.insert(whole.end(), arguments.begin(), arguments.end());
  // The file is empty and writable for all users, because strace opens it as its real user.
  std::ofstream(kTrace).close();
  chmod(kTrace, 0666);
  runProcess(whole, beforeExec);
  std::ifstream file(kTrace);
  std::vector<std::string> calls;
  for (std::string line; std::getline(file, line);) {
    line.erase(0, line.find_first_not_of("0123456789 "));
    // This drops the calls of the start-up. The C library's start-up ends when it makes the relocations
    // read-only. The libraries' start-up ends when they ask for the thread's identifier.
    if (line.starts_with("mprotect(") || line.starts_with("gettid(") || line.starts_with("getpid(")) {
      calls.clear();
    } else if (line.find('(') != std::string::npos) {
      calls.push_back(std::regex_replace(line, std::regex(R"( +=)"), " ="));
    }
  }
  return calls;
}

ProcessResult MountPointTest::runPowerless(const std::vector<std::string>& arguments) {
  std::vector<std::string> whole = {"setpriv", "--bounding-set", "-all", "--inh-caps", "-all", kCommand};
  whole.insert(whole.end(), arguments.begin(), arguments.end());
  return runProcess(whole);
}

void MountPointTest::leaveLeaksAlone() {
  setenv("ASAN_OPTIONS", "detect_leaks=0", 1);
}

void MountPointTest::expectResult(const ProcessResult& result, int exitStatus,
                                  const std::string& standardError, const std::string& standardOutput) {
  EXPECT_EQ(result.signal, 0);
  EXPECT_EQ(result.exitStatus, exitStatus);
  EXPECT_EQ(result.standardError, standardError);
  EXPECT_EQ(result.standardOutput, standardOutput);
}

void MountPointTest::expectSuccess(const ProcessResult& result) {
  expectResult(result, 0, "");
}

void MountPointTest::makeFile(const fs::path& path) {
  const std::ofstream file(path);
  EXPECT_TRUE(file.is_open()) << path;
}

struct stat MountPointTest::statusOf(const fs::path& path) {
  struct stat status{};
  EXPECT_EQ(lstat(path.c_str(), &status), 0) << path << ": " << std::strerror(errno);
  return status;
}

std::vector<std::string> MountPointTest::volumes() {
  std::vector<std::string> names;
  for (const fs::directory_entry& entry : fs::directory_iterator("/Volumes")) {
    names.push_back(entry.path().filename());
  }
  return names;
}

void require(bool succeeded) {
  if (!succeeded) throw std::system_error(errno, std::generic_category());
}

namespace {

// Enters a private root and copies the command into it. If `asOrdinaryUser` is true, becomes an ordinary user
// first. Throws if the machine does not allow this.
void enterPrivateRoot(const char* command, bool asOrdinaryUser) {
  if (asOrdinaryUser && std::string_view(INSTRUMENTATION) == "coverage") {
    throw std::runtime_error("only its builder may write the counts of a coverage build");
  }
  std::ifstream built(MOUNT_POINT, std::ios::binary);
  if (asOrdinaryUser) PrivateRoot::becomeOrdinaryUser();
  asMachineRoot = geteuid() == 0;
  PrivateRoot::enter();
  std::ofstream copy(command, std::ios::binary);
  copy << built.rdbuf() << std::flush;
  if (!copy.good() || chmod(command, 0755) != 0) throw std::runtime_error("the command cannot be copied");
}

}  // namespace

int main(int argumentCount, char** arguments) {
#ifdef COMMAND_IS_FOR_MACOS
  if (skipCasesNotShown(arguments[0], argumentCount, arguments)) return 0;
#endif
  testing::InitGoogleTest(&argumentCount, arguments);
  if (testing::GTEST_FLAG(list_tests)) return RUN_ALL_TESTS();

  const bool asOrdinaryUser = argumentCount > 1 && std::string(arguments[1]) == "--as-ordinary-user";
  try {
    enterPrivateRoot("/mount-point", asOrdinaryUser);
  } catch (const std::exception& problem) {
    refusal = problem.what();
  }
  return RUN_ALL_TESTS();
}
