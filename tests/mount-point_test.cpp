// The mount-point command as its callers meet it: the built program, run in a private root on a real
// /Volumes. The suite runs as root and as an ordinary user; what one of them cannot do is skipped.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <csignal>
#include <cstring>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <regex>
#include <sstream>
#include <system_error>

#include "PrivateRoot.h"
#include "Process.h"

namespace {

namespace fs = std::filesystem;
using testing::IsEmpty;

// What the compiler added to the command under test: nothing, or the name of a sanitizer or "coverage".
constexpr std::string_view kInstrumentation = INSTRUMENTATION;

using PrivateRoot::kOrdinaryGroup;
using PrivateRoot::kOrdinaryUser;

// The command under test: a copy in the private root, where an ordinary user may run it whoever built it.
constexpr const char* kCommand = "/mount-point";
// Where a trace of it goes.
constexpr const char* kTrace = "/trace";

// Why no private root could be made; empty when there is one.
std::string refusal;
// Whether the suite runs as the machine's root, with all identifiers at hand, and not as the root of
// a user namespace in which only one is mapped.
bool isMachineRoot = false;

void require(bool succeeded) {
  if (!succeeded) throw std::system_error(errno, std::generic_category());
}

class MountPointTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!PrivateRoot::entered()) GTEST_SKIP() << refusal;
    PrivateRoot::removeVolumes();
    PrivateRoot::mountVolumes();
  }

  static ProcessResult run(std::vector<std::string> arguments, const std::function<void()>& beforeExec = {}) {
    arguments.insert(arguments.begin(), kCommand);
    return runProcess(arguments, beforeExec);
  }

  // Runs the command with the system calls of `calls` (comma-separated) failing with `error`. strace says
  // more of `error`, as in "EINTR:when=1".
  static ProcessResult runInjected(const std::string& calls, const std::string& error,
                                   std::vector<std::string> arguments,
                                   const std::function<void()>& beforeExec = {}) {
    std::vector<std::string> whole = {"strace",
                                      "-f",
                                      "-qq",
                                      "-o",
                                      "/dev/null",
                                      "-e",
                                      "trace=" + calls,
                                      "-e",
                                      "inject=" + calls + ":error=" + error,
                                      kCommand};
    whole.insert(whole.end(), arguments.begin(), arguments.end());
    return runProcess(whole, [&] {
      leaveLeaksAlone();
      if (beforeExec) beforeExec();
    });
  }

  // The leak checker of an instrumented build cannot work below a tracer.
  static void leaveLeaksAlone() { setenv("ASAN_OPTIONS", "detect_leaks=0", 1); }

  // What the command, once it has started, asks the system for, a line each as strace writes it.
  static std::vector<std::string> systemCalls(const std::vector<std::string>& arguments) {
    std::vector<std::string> whole = {"strace", "-f", "-qq", "-s", "200", "-o", kTrace, kCommand};
    whole.insert(whole.end(), arguments.begin(), arguments.end());
    runProcess(whole, leaveLeaksAlone);
    std::ifstream file(kTrace);
    std::vector<std::string> calls;
    for (std::string line; std::getline(file, line);) {
      line.erase(0, line.find_first_not_of("0123456789 "));
      // The C library's start ends with making the relocations read-only, that of the libraries with asking
      // which thread this is.
      if (line.starts_with("mprotect(") || line.starts_with("gettid(") || line.starts_with("getpid(")) {
        calls.clear();
      } else if (line.find('(') != std::string::npos) {
        calls.push_back(std::regex_replace(line, std::regex(R"( +=)"), " ="));
      }
    }
    return calls;
  }

  // Runs the command with none of root's capabilities.
  static ProcessResult runPowerless(std::vector<std::string> arguments) {
    std::vector<std::string> whole = {"setpriv", "--bounding-set", "-all", "--inh-caps", "-all", kCommand};
    whole.insert(whole.end(), arguments.begin(), arguments.end());
    return runProcess(whole);
  }

  static void expectResult(const ProcessResult& result, int exitStatus, const std::string& standardError,
                           const std::string& standardOutput = "") {
    EXPECT_EQ(result.signal, 0);
    EXPECT_EQ(result.exitStatus, exitStatus);
    EXPECT_EQ(result.standardError, standardError);
    EXPECT_EQ(result.standardOutput, standardOutput);
  }

  static void expectSuccess(const ProcessResult& result) { expectResult(result, 0, ""); }

  static void makeFile(const fs::path& path) {
    const std::ofstream file(path);
    EXPECT_TRUE(file.is_open()) << path;
  }

  static struct stat statusOf(const fs::path& path) {
    struct stat status{};
    EXPECT_EQ(lstat(path.c_str(), &status), 0) << path << ": " << std::strerror(errno);
    return status;
  }

  static std::vector<std::string> volumes() {
    std::vector<std::string> names;
    for (const fs::directory_entry& entry : fs::directory_iterator("/Volumes")) {
      names.push_back(entry.path().filename());
    }
    return names;
  }
};

// ---- Arguments ----

TEST_F(MountPointTest, WithoutArgumentsReportsThatThereIsNoSubdirectory) {
  expectResult(run({}), 22, "No subdirectory specified.\n");
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, SurvivesAnArgumentVectorWithoutTheProgramsName) {
  expectResult(runProcess({}, {}, kCommand), 22, "No subdirectory specified.\n");
}

TEST_F(MountPointTest, RefusesANameWithASlashWithoutANewline) {
  for (const std::string name : {"a/b", "/x", "x/", "/", "//", "../etc", "\xff/\n"}) {
    expectResult(run({name}), 22, "The specified subdirectory is not valid: " + name);
    expectResult(run({name, "--remove"}), 22, "The specified subdirectory is not valid: " + name);
  }
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, RefusesANameWithASlashEvenWhereTheDirectoryIsThere) {
  fs::create_directories("/Volumes/a/b");
  expectResult(run({"a/b", "--remove"}), 22, "The specified subdirectory is not valid: a/b");
  EXPECT_TRUE(fs::exists("/Volumes/a/b"));
}

TEST_F(MountPointTest, RemovesOnlyWhenTheSecondOfExactlyTwoArgumentsIsExactlyTheFlag) {
  const std::vector<std::vector<std::string>> creating = {
      {"a", "--REMOVE"},  {"a", "--remove2"},        {"a", "--remov"},       {"a", ""},
      {"a", "-remove"},   {"a", "--remove", "more"}, {"a", "x", "--remove"}, {"a", "--remove", "--remove"},
      {"a", " --remove"}, {"a", "--remove "},        {"a", "--remove", ""},  {"a", "x", "y", "--remove"}};
  for (const std::vector<std::string>& arguments : creating) {
    SCOPED_TRACE(testing::PrintToString(arguments));
    expectSuccess(run(arguments));
    EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
    expectResult(run(arguments), 17, "Failed to create [/Volumes/a], errno: 17\n");
    expectSuccess(run({"a", "--remove"}));
    EXPECT_THAT(volumes(), IsEmpty());
  }
}

TEST_F(MountPointTest, TakesWhatLooksLikeAnOptionForAName) {
  for (const std::string name : {"--help", "--version", "-h", "--", "--remove"}) {
    expectSuccess(run({name}));
    EXPECT_EQ(volumes(), std::vector<std::string>{name});
    expectSuccess(run({name, "--remove"}));
    EXPECT_THAT(volumes(), IsEmpty());
  }
}

// ---- Making a directory ----

TEST_F(MountPointTest, MakesADirectoryThatOnlyItsOwnerMayUse) {
  expectSuccess(run({"Backup"}));
  const struct stat status = statusOf("/Volumes/Backup");
  EXPECT_TRUE(S_ISDIR(status.st_mode));
  EXPECT_EQ(status.st_mode & 07777U, 0700U);
  EXPECT_EQ(status.st_uid, getuid());
  EXPECT_EQ(status.st_gid, getgid());
}

TEST_F(MountPointTest, HandsTheDirectoryOverWhereItsGroupWouldBeInherited) {
  if (!isMachineRoot) GTEST_SKIP() << "another group than one's own needs root: only one is mapped here";
  ASSERT_EQ(chmod("/Volumes", 02755), 0);
  ASSERT_EQ(chown("/Volumes", 0, kOrdinaryGroup), 0);
  expectSuccess(run({"a"}));
  EXPECT_EQ(statusOf("/Volumes/a").st_gid, getgid());
}

TEST_F(MountPointTest, FailsToMakeADirectoryThatIsThere) {
  expectSuccess(run({"a"}));
  expectResult(run({"a"}), 17, "Failed to create [/Volumes/a], errno: 17\n");
}

TEST_F(MountPointTest, TakesTheEmptyNameForVolumesItself) {
  expectResult(run({""}), 17, "Failed to create [/Volumes/], errno: 17\n");
}

TEST_F(MountPointTest, MakesVolumesItselfByTheEmptyNameWhereItIsMissing) {
  PrivateRoot::removeVolumes();
  expectSuccess(run({""}));
  EXPECT_EQ(statusOf("/Volumes").st_mode & 07777U, 0700U);
}

TEST_F(MountPointTest, TakesDotsForWhatTheyAre) {
  expectResult(run({"."}), 17, "Failed to create [/Volumes/.], errno: 17\n");
  expectResult(run({".."}), 17, "Failed to create [/Volumes/..], errno: 17\n");
  expectSuccess(run({"..."}));
}

TEST_F(MountPointTest, NarrowsTheModeByTheUmaskLikeEveryProgram) {
  expectSuccess(run({"nothing"}, [] { umask(0777); }));
  expectSuccess(run({"nothing-written"}, [] { umask(0277); }));
  expectSuccess(run({"all"}, [] { umask(0); }));
  EXPECT_EQ(statusOf("/Volumes/nothing").st_mode & 07777U, 0000U);
  EXPECT_EQ(statusOf("/Volumes/nothing-written").st_mode & 07777U, 0500U);
  EXPECT_EQ(statusOf("/Volumes/all").st_mode & 07777U, 0700U);
}

TEST_F(MountPointTest, KeepsEveryByteOfTheName) {
  std::string control;
  for (char byte = 1; byte < 32; ++byte) control.push_back(byte);
  std::string high;
  for (int byte = 127; byte < 256; ++byte) high.push_back(static_cast<char>(byte));
  for (const std::string& name :
       {std::string(" a "), std::string("a\nb\n"), control, high, std::string("\xc3\x28"),
        std::string("e\xcc\x81"), std::string("%s%n"), std::string(255, 'x')}) {
    SCOPED_TRACE(testing::PrintToString(name));
    expectSuccess(run({name}));
    EXPECT_EQ(volumes(), std::vector<std::string>{name});
    expectResult(run({name}), 17, "Failed to create [/Volumes/" + name + "], errno: 17\n");
    expectSuccess(run({name, "--remove"}));
    expectResult(run({name, "--remove"}), 0, "", "Path already does not exist: [/Volumes/" + name + "]\n");
  }
}

TEST_F(MountPointTest, ReportsANameThatIsTooLongWhole) {
  // The limit counts bytes: 128 characters of two bytes are one too many as well.
  std::string accents;
  for (int count = 0; count < 128; ++count) accents += "\xc3\xa9";
  for (const std::string& name :
       {std::string(256, 'x'), accents, std::string(5000, 'x'), std::string(100000, 'x')}) {
    expectResult(run({name}), 36, "Failed to create [/Volumes/" + name + "], errno: 36\n");
    expectResult(run({name, "--remove"}), 36, "Failed to remove [/Volumes/" + name + "], errno: 36\n");
  }
}

TEST_F(MountPointTest, FailsToMakeADirectoryWhereVolumesIsMissing) {
  PrivateRoot::removeVolumes();
  expectResult(run({"a"}), 2, "Failed to create [/Volumes/a], errno: 2\n");
  EXPECT_FALSE(fs::exists("/Volumes"));
}

TEST_F(MountPointTest, FailsToMakeADirectoryOnAReadOnlyFileSystem) {
  ASSERT_EQ(mount(nullptr, "/Volumes", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
  expectResult(run({"a"}), 30, "Failed to create [/Volumes/a], errno: 30\n");
}

TEST_F(MountPointTest, FailsToMakeADirectoryOnAFullFileSystem) {
  PrivateRoot::mountVolumes("nr_inodes=2");
  expectSuccess(run({"a"}));
  expectResult(run({"b"}), 28, "Failed to create [/Volumes/b], errno: 28\n");
}

TEST_F(MountPointTest, FailsToMakeADirectoryWithoutPermission) {
  ASSERT_EQ(chmod("/Volumes", 0555), 0);
  expectResult(runPowerless({"a"}), 13, "Failed to create [/Volumes/a], errno: 13\n");
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, FailsToMakeADirectoryWhereAFileOrALinkIsInTheWay) {
  makeFile("/Volumes/file");
  fs::create_symlink("nowhere", "/Volumes/dangling");
  fs::create_directory("/Volumes/directory");
  fs::create_symlink("directory", "/Volumes/link");
  for (const std::string name : {"file", "dangling", "link"}) {
    expectResult(run({name}), 17, "Failed to create [/Volumes/" + name + "], errno: 17\n");
  }
  EXPECT_FALSE(fs::exists("/Volumes/nowhere"));
}

struct Injection {
  const char* error;
  int number;
};
constexpr std::array kInjections = {Injection{"EDQUOT", 122}, Injection{"EIO", 5}, Injection{"EPERM", 1},
                                    Injection{"EMLINK", 31}, Injection{"EINTR:when=1", 4}};

TEST_F(MountPointTest, ReportsWhateverTheSystemSaysToMakingADirectory) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  for (const auto& [error, number] : kInjections) {
    expectResult(runInjected("mkdir,mkdirat", error, {"a"}), number,
                 "Failed to create [/Volumes/a], errno: " + std::to_string(number) + "\n");
    EXPECT_THAT(volumes(), IsEmpty());
  }
}

TEST_F(MountPointTest, LeavesTheDirectoryWhereItCouldNotBeHandedOver) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  for (const auto& [error, number] : kInjections) {
    expectResult(runInjected("chown,fchown,lchown,fchownat", error, {"a"}), number,
                 "Failed to chown [/Volumes/a], errno: " + std::to_string(number) + "\n");
    EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
    expectSuccess(run({"a", "--remove"}));
  }
}

// ---- Raised privileges ----

TEST_F(MountPointTest, HandsTheDirectoryToTheRealUserAndGroup) {
  if (!isMachineRoot)
    GTEST_SKIP() << "a real user other than the effective one needs root: only one is mapped here";
  expectSuccess(runProcess({"setpriv", "--ruid", std::to_string(kOrdinaryUser), "--euid", "0", "--rgid",
                            std::to_string(kOrdinaryGroup), "--egid", "0", "--clear-groups", kCommand, "a"}));
  EXPECT_EQ(statusOf("/Volumes/a").st_uid, kOrdinaryUser);
  EXPECT_EQ(statusOf("/Volumes/a").st_gid, kOrdinaryGroup);
  EXPECT_EQ(statusOf("/Volumes/a").st_mode & 07777U, 0700U);
}

TEST_F(MountPointTest, WorksForAnOrdinaryUserWhenInstalledSetUserIdentifier) {
  if (!isMachineRoot) GTEST_SKIP() << "a program owned by another user needs root: only one is mapped here";
  ASSERT_EQ(chmod(kCommand, 04755), 0);
  const auto runAsOrdinaryUser = [&](std::vector<std::string> arguments) {
    std::vector<std::string> whole = {
        "setpriv",        "--reuid", std::to_string(kOrdinaryUser), "--regid", std::to_string(kOrdinaryGroup),
        "--clear-groups", kCommand};
    whole.insert(whole.end(), arguments.begin(), arguments.end());
    return runProcess(whole);
  };
  expectSuccess(runAsOrdinaryUser({"a"}));
  EXPECT_EQ(statusOf("/Volumes/a").st_uid, kOrdinaryUser);
  EXPECT_EQ(statusOf("/Volumes/a").st_gid, kOrdinaryGroup);
  expectSuccess(runAsOrdinaryUser({"a", "--remove"}));
  EXPECT_THAT(volumes(), IsEmpty());

  // As the manual asks of whoever installs it so: an entry of root's keeps /Volumes in its place.
  PrivateRoot::removeVolumes();
  fs::create_directories("/Volumes/.keep");
  expectResult(runAsOrdinaryUser({"", "--remove"}), 39, "Failed to remove [/Volumes/], errno: 39\n");
  expectResult(runAsOrdinaryUser({""}), 17, "Failed to create [/Volumes/], errno: 17\n");
  ASSERT_EQ(chmod(kCommand, 0755), 0);
}

TEST_F(MountPointTest, FailsToHandTheDirectoryOverWithoutTheRight) {
  if (!isMachineRoot)
    GTEST_SKIP() << "a real user other than the effective one needs root: only one is mapped here";
  expectResult(runProcess({"setpriv", "--ruid", std::to_string(kOrdinaryUser), "--euid", "0",
                           "--bounding-set", "-chown", "--inh-caps", "-chown", kCommand, "a"}),
               1, "Failed to chown [/Volumes/a], errno: 1\n");
  EXPECT_EQ(statusOf("/Volumes/a").st_uid, 0U);
}

// ---- What it asks of the system, and nothing else ----

// Expects the calls that `arguments` lead to, in their order; the identifiers may be asked for in any.
void expectSystemCalls(std::vector<std::string> calls, const std::vector<std::string>& expected) {
  const auto identifiers = std::ranges::find_if(calls, [](const std::string& call) {
    return call.starts_with("getuid") || call.starts_with("getgid");
  });
  if (calls.end() - identifiers >= 2) std::sort(identifiers, identifiers + 2);
  EXPECT_EQ(calls, expected);
}

TEST_F(MountPointTest, AsksTheSystemForItsWorkAndNothingElse) {
  if (!kInstrumentation.empty()) GTEST_SKIP() << "built with instrumentation, which asks for more";
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  expectSystemCalls(systemCalls({"a"}), {"mkdir(\"/Volumes/a\", 0700) = 0", "getgid() = 0", "getuid() = 0",
                                         "chown(\"/Volumes/a\", 0, 0) = 0", "exit_group(0) = ?"});
  expectSystemCalls(systemCalls({"a"}), {"mkdir(\"/Volumes/a\", 0700) = -1 EEXIST (File exists)",
                                         "write(2, \"Failed to create [/Volumes/a], errno: 17\\n\", 41) = 41",
                                         "exit_group(17) = ?"});
  expectSystemCalls(systemCalls({"a", "--remove"}), {"rmdir(\"/Volumes/a\") = 0", "exit_group(0) = ?"});
  const std::vector<std::string> missing = systemCalls({"a", "--remove"});
  ASSERT_EQ(missing.size(), 4U) << testing::PrintToString(missing);
  EXPECT_EQ(missing[0], "rmdir(\"/Volumes/a\") = -1 ENOENT (No such file or directory)");
  // Standard output is buffered; the C library looks at what it is first.
  EXPECT_THAT(missing[1], testing::ContainsRegex("^(new)?fstat"));
  EXPECT_EQ(missing[2], "write(1, \"Path already does not exist: [/Volumes/a]\\n\", 42) = 42");
}

// ---- Removing a directory ----

TEST_F(MountPointTest, RemovesADirectorySilently) {
  expectSuccess(run({"a"}));
  expectSuccess(run({"a", "--remove"}));
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, TakesAMissingDirectoryForRemoved) {
  expectResult(run({"a", "--remove"}), 0, "", "Path already does not exist: [/Volumes/a]\n");
  PrivateRoot::removeVolumes();
  expectResult(run({"a", "--remove"}), 0, "", "Path already does not exist: [/Volumes/a]\n");
}

TEST_F(MountPointTest, FailsToRemoveADirectoryThatIsNotEmpty) {
  fs::create_directories("/Volumes/a/b");
  expectResult(run({"a", "--remove"}), 39, "Failed to remove [/Volumes/a], errno: 39\n");
  EXPECT_TRUE(fs::exists("/Volumes/a/b"));
}

TEST_F(MountPointTest, FailsToRemoveADirectoryThatIsInUseAsAMountPoint) {
  fs::create_directory("/Volumes/a");
  ASSERT_EQ(mount("tmpfs", "/Volumes/a", "tmpfs", 0, nullptr), 0);
  expectResult(run({"a", "--remove"}), 16, "Failed to remove [/Volumes/a], errno: 16\n");
  ASSERT_EQ(umount("/Volumes/a"), 0);
}

TEST_F(MountPointTest, FailsToRemoveWhatIsNoDirectory) {
  makeFile("/Volumes/file");
  fs::create_directory("/Volumes/directory");
  fs::create_symlink("directory", "/Volumes/link");
  fs::create_symlink("nowhere", "/Volumes/dangling");
  for (const std::string name : {"file", "link", "dangling"}) {
    expectResult(run({name, "--remove"}), 20, "Failed to remove [/Volumes/" + name + "], errno: 20\n");
  }
  EXPECT_EQ(volumes().size(), 4U);
}

TEST_F(MountPointTest, FailsToRemoveDots) {
  expectResult(run({".", "--remove"}), 22, "Failed to remove [/Volumes/.], errno: 22\n");
  const ProcessResult result = run({"..", "--remove"});
  expectResult(result, 39, "Failed to remove [/Volumes/..], errno: 39\n");
}

TEST_F(MountPointTest, TakesTheEmptyNameForVolumesItselfWhenRemoving) {
  expectResult(run({"", "--remove"}), 16, "Failed to remove [/Volumes/], errno: 16\n");
  PrivateRoot::removeVolumes();
  fs::create_directory("/Volumes");
  expectSuccess(run({"", "--remove"}));
  EXPECT_FALSE(fs::exists("/Volumes"));
}

TEST_F(MountPointTest, FailsToRemoveADirectoryOnAReadOnlyFileSystem) {
  fs::create_directory("/Volumes/a");
  ASSERT_EQ(mount(nullptr, "/Volumes", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
  expectResult(run({"a", "--remove"}), 30, "Failed to remove [/Volumes/a], errno: 30\n");
}

TEST_F(MountPointTest, FailsToRemoveADirectoryWithoutPermission) {
  fs::create_directory("/Volumes/a");
  ASSERT_EQ(chmod("/Volumes", 0555), 0);
  expectResult(runPowerless({"a", "--remove"}), 13, "Failed to remove [/Volumes/a], errno: 13\n");
}

TEST_F(MountPointTest, ReportsWhateverTheSystemSaysToRemovingADirectory) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  fs::create_directory("/Volumes/a");
  for (const auto& [error, number] : kInjections) {
    expectResult(runInjected("rmdir", error, {"a", "--remove"}), number,
                 "Failed to remove [/Volumes/a], errno: " + std::to_string(number) + "\n");
  }
  EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
}

// ---- Standard streams ----

void replaceStream(int stream, const char* path) {
  const int file = open(path, O_WRONLY);
  require(file >= 0);
  require(dup2(file, stream) == stream);
}

TEST_F(MountPointTest, WorksWithoutStandardStreams) {
  const auto closeAll = [] {
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(stream);
  };
  expectSuccess(run({"a"}, closeAll));
  EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
  expectSuccess(run({"a", "--remove"}, closeAll));
  expectSuccess(run({"a", "--remove"}, closeAll));
  expectResult(run({}, closeAll), 22, "");
  expectResult(run({"a/b"}, closeAll), 22, "");
}

// The status is errno as it stands after the message was written: where the message itself fails, the
// status tells that failure and not the one of the directory.
TEST_F(MountPointTest, TellsTheFailureOfItsMessageWhereThatFails) {
  expectSuccess(run({"a"}));
  expectResult(run({"a"}, [] { close(STDERR_FILENO); }), EBADF, "");
  expectResult(run({"a"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }), ENOSPC, "");
  expectResult(run({"a", "--remove", "x"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }), ENOSPC, "");
  fs::create_directory("/Volumes/a/b");
  expectResult(run({"a", "--remove"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }), ENOSPC, "");
}

TEST_F(MountPointTest, TellsTheFailureOfItsMessageWhereThatFailsAfterChown) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  expectResult(runInjected("chown", "EPERM", {"a"}, [] { replaceStream(STDERR_FILENO, "/dev/full"); }),
               ENOSPC, "");
  expectResult(runInjected("chown", "EPERM", {"b"}, [] { close(STDERR_FILENO); }), EBADF, "");
}

// A pipe that holds all it can.
struct FullPipe {
  std::array<int, 2> ends{};
  std::size_t size = 0;

  FullPipe() {
    require(pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK) == 0);
    const std::string block(4096, '.');
    for (ssize_t count = 1; count > 0;) {
      count = write(ends[1], block.data(), block.size());
      if (count > 0) size += static_cast<std::size_t>(count);
    }
    require(errno == EAGAIN);
  }
};

TEST_F(MountPointTest, TakesAMissingDirectoryForRemovedEvenWhereTheNoticeIsLost) {
  expectSuccess(run({"a", "--remove"}, [] { close(STDOUT_FILENO); }));
  expectSuccess(run({"a", "--remove"}, [] { replaceStream(STDOUT_FILENO, "/dev/full"); }));
  const FullPipe pipe;
  expectSuccess(run({"a", "--remove"}, [&] { dup2(pipe.ends[1], STDOUT_FILENO); }));
}

TEST_F(MountPointTest, DoesItsWorkBeforeAReaderThatIsGoneEndsIt) {
  const auto withoutReader = [](int stream, bool ignored) {
    return [stream, ignored] {
      std::array<int, 2> ends{};
      require(pipe(ends.data()) == 0 && close(ends[0]) == 0 && dup2(ends[1], stream) == stream);
      close(ends[1]);
      require(std::signal(SIGPIPE, ignored ? SIG_IGN : SIG_DFL) != SIG_ERR);
    };
  };
  expectSuccess(run({"a"}, withoutReader(STDERR_FILENO, false)));
  EXPECT_EQ(run({"a"}, withoutReader(STDERR_FILENO, false)).signal, SIGPIPE);
  expectResult(run({"a"}, withoutReader(STDERR_FILENO, true)), EPIPE, "");
  EXPECT_EQ(run({"b", "--remove"}, withoutReader(STDOUT_FILENO, false)).signal, SIGPIPE);
  expectSuccess(run({"b", "--remove"}, withoutReader(STDOUT_FILENO, true)));
}

TEST_F(MountPointTest, DoesNotWaitForAFullPipeThatDoesNotBlock) {
  FullPipe pipe;
  expectSuccess(run({"a"}));
  expectResult(run({"a"}, [&] { dup2(pipe.ends[1], STDERR_FILENO); }), EAGAIN, "");
}

TEST_F(MountPointTest, WaitsForAFullPipeWithOneThreadAndLosesNothing) {
  FullPipe pipe;
  ASSERT_EQ(fcntl(pipe.ends[1], F_SETFL, 0), 0);
  ASSERT_EQ(fcntl(pipe.ends[0], F_SETFL, 0), 0);
  expectSuccess(run({"a"}));
  const pid_t child = fork();
  if (child == 0) {
    dup2(pipe.ends[1], STDERR_FILENO);
    execl(kCommand, kCommand, "a", nullptr);
    _exit(127);
  }
  close(pipe.ends[1]);

  // It sleeps in its write: system call 1 with descriptor 2 as its first argument.
  const std::string process = "/proc/" + std::to_string(child);
  int status = 0;
  for (std::string call; !call.starts_with("1 0x2 ");) {
    ASSERT_EQ(waitpid(child, &status, WNOHANG), 0) << "it ended without waiting";
    std::ifstream file(process + "/syscall");
    if (!file.is_open()) break;  // kernels may be built without it; the thread count stands all the same
    std::getline(file, call);
    usleep(1000);
  }
  const auto threads = std::distance(fs::directory_iterator(process + "/task"), fs::directory_iterator());
  EXPECT_TRUE(threads == 1 || kInstrumentation == "thread") << threads;  // which may start one of its own

  std::string text;
  std::array<char, 65536> buffer{};
  for (ssize_t count; (count = read(pipe.ends[0], buffer.data(), buffer.size())) > 0;) {
    text.append(buffer.data(), static_cast<std::size_t>(count));
  }
  EXPECT_EQ(text.substr(pipe.size), "Failed to create [/Volumes/a], errno: 17\n");
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 17);
}

// Lines of commands that run at once do not mix: each line of up to 8 KiB is handed to the kernel in one
// piece.
TEST_F(MountPointTest, WritesEachLineInOnePiece) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  expectSuccess(run({"a"}));
  for (const std::string& name : {std::string("a"), std::string(8000, 'x')}) {
    int pieces = 0;
    for (const std::string& call : systemCalls({name}))
      pieces += call.find("(2, ") != std::string::npos ? 1 : 0;
    EXPECT_EQ(pieces, 1) << name.size();
  }
}

// The README shows what script/run shows.
TEST_F(MountPointTest, DoesWhatTheReadmeShows) {
  const ProcessResult result =
      runProcess({"bash", SOURCE_DIRECTORY "/examples/mount-point/demonstration.sh", kCommand});
  EXPECT_EQ(result.exitStatus, 0);
  EXPECT_EQ(result.standardError, "");
  std::ostringstream readme;
  readme << std::ifstream(SOURCE_DIRECTORY "/README.md").rdbuf();
  EXPECT_THAT(readme.str(), testing::HasSubstr("```\n" + result.standardOutput + "```\n"));
}

// Enters a private root, as an ordinary user if asked, and puts the command there. Throws where the
// machine does not allow it.
void enterPrivateRoot(bool asOrdinaryUser) {
  if (asOrdinaryUser && kInstrumentation == "coverage") {
    throw std::runtime_error("a coverage build writes its counts where only its builder may");
  }
  std::ifstream built(MOUNT_POINT, std::ios::binary);
  if (asOrdinaryUser) PrivateRoot::becomeOrdinaryUser();
  isMachineRoot = geteuid() == 0;
  PrivateRoot::enter();
  std::ofstream copy(kCommand, std::ios::binary);
  copy << built.rdbuf() << std::flush;
  require(copy.good() && chmod(kCommand, 0755) == 0);
}

}  // namespace

int main(int argumentCount, char** arguments) {
  testing::InitGoogleTest(&argumentCount, arguments);
  if (testing::GTEST_FLAG(list_tests)) return RUN_ALL_TESTS();

  const bool asOrdinaryUser = argumentCount > 1 && std::string(arguments[1]) == "--as-ordinary-user";
  try {
    enterPrivateRoot(asOrdinaryUser);
  } catch (const std::exception& problem) {
    refusal = problem.what();
  }
  return RUN_ALL_TESTS();
}
