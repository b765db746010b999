// Tests the mount-point command as its callers use it. Runs the built program in a private root with a real
// /Volumes.

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "tests/support/MountPointTest.h"

namespace {

namespace fs = std::filesystem;
using testing::IsEmpty;

using PrivateRoot::kOrdinaryGroup;

// ---- Arguments ----

TEST_F(MountPointTest, ReportsThatNoSubdirectoryIsGiven) {
  expectResult(run({}), 22, "No subdirectory specified.\n");
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, AcceptsAnEmptyArgumentVector) {
  expectResult(runProcess({}, {}, kCommand), 22, "No subdirectory specified.\n");
}

TEST_F(MountPointTest, RejectsANameWithASlashInAMessageWithoutANewline) {
  for (const std::string name : {"a/b", "/x", "x/", "/", "//", "../etc", "\xff/\n"}) {
    expectResult(run({name}), 22, "The specified subdirectory is not valid: " + name);
    expectResult(run({name, "--remove"}), 22, "The specified subdirectory is not valid: " + name);
  }
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, RejectsANameWithASlashEvenIfTheDirectoryExists) {
  fs::create_directories("/Volumes/a/b");
  expectResult(run({"a/b", "--remove"}), 22, "The specified subdirectory is not valid: a/b");
  EXPECT_TRUE(fs::exists("/Volumes/a/b"));
}

TEST_F(MountPointTest, RemovesOnlyIfTheSecondOfTwoArgumentsIsTheFlag) {
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

TEST_F(MountPointTest, TreatsOptionsAsNames) {
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

TEST_F(MountPointTest, SetsTheCallersGroupIfVolumesIsSetGroupId) {
  if (!isMachineRoot()) GTEST_SKIP() << "this needs root: a user namespace maps only one group";
  ASSERT_EQ(chmod("/Volumes", 02755), 0);
  ASSERT_EQ(chown("/Volumes", 0, kOrdinaryGroup), 0);
  expectSuccess(run({"a"}));
  EXPECT_EQ(statusOf("/Volumes/a").st_gid, getgid());
}

TEST_F(MountPointTest, FailsToMakeADirectoryThatExists) {
  expectSuccess(run({"a"}));
  expectResult(run({"a"}), 17, "Failed to create [/Volumes/a], errno: 17\n");
}

TEST_F(MountPointTest, TreatsTheEmptyNameAsVolumes) {
  expectResult(run({""}), 17, "Failed to create [/Volumes/], errno: 17\n");
}

TEST_F(MountPointTest, MakesMissingVolumesForTheEmptyName) {
  PrivateRoot::removeVolumes();
  expectSuccess(run({""}));
  EXPECT_EQ(statusOf("/Volumes").st_mode & 07777U, 0700U);
}

TEST_F(MountPointTest, TreatsDotNamesAsTheSystemDoes) {
  expectResult(run({"."}), 17, "Failed to create [/Volumes/.], errno: 17\n");
  expectResult(run({".."}), 17, "Failed to create [/Volumes/..], errno: 17\n");
  expectSuccess(run({"..."}));
}

TEST_F(MountPointTest, AppliesTheUmask) {
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

TEST_F(MountPointTest, ReportsATooLongNameInFull) {
  // The limit of 255 counts bytes, so 128 characters of two bytes each exceed it too. Linux accepts arguments
  // of up to 131,071 bytes.
  std::string accents;
  for (int count = 0; count < 128; ++count) accents += "\xc3\xa9";
  for (const std::string& name :
       {std::string(256, 'x'), accents, std::string(5000, 'x'), std::string(131071, 'x')}) {
    const int number = numberOf(ENAMETOOLONG);
    const std::string error = ", errno: " + std::to_string(number) + "\n";
    expectResult(run({name}), number, "Failed to create [/Volumes/" + name + "]" + error);
    expectResult(run({name, "--remove"}), number, "Failed to remove [/Volumes/" + name + "]" + error);
  }
}

TEST_F(MountPointTest, FailsToMakeADirectoryIfVolumesIsMissing) {
  PrivateRoot::removeVolumes();
  expectResult(run({"a"}), 2, "Failed to create [/Volumes/a], errno: 2\n");
  EXPECT_FALSE(fs::exists("/Volumes"));
}

TEST_F(MountPointTest, FailsToMakeADirectoryOnAReadOnlyFileSystem) {
  ASSERT_EQ(mount(nullptr, "/Volumes", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
  expectResult(run({"a"}), 30, "Failed to create [/Volumes/a], errno: 30\n");
}

TEST_F(MountPointTest, FailsToMakeADirectoryOnAFullFileSystem) {
  // The command for macOS makes two directories and removes one of them.
  PrivateRoot::mountVolumes(kIsForMacOS ? "nr_inodes=3" : "nr_inodes=2");
  expectSuccess(run({"a"}));
  expectResult(run({"b"}), 28, "Failed to create [/Volumes/b], errno: 28\n");
}

TEST_F(MountPointTest, FailsToMakeADirectoryWithoutPermission) {
  ASSERT_EQ(chmod("/Volumes", 0555), 0);
  expectResult(runPowerless({"a"}), 13, "Failed to create [/Volumes/a], errno: 13\n");
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, FailsToMakeADirectoryIfAFileOrALinkHasItsName) {
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
  const char* name;
  int error;
};
constexpr std::array kInjections = {Injection{"EDQUOT", EDQUOT}, Injection{"EIO", EIO},
                                    Injection{"EPERM", EPERM}, Injection{"EMLINK", EMLINK},
                                    Injection{"EINTR:when=1", EINTR}};

TEST_F(MountPointTest, ReportsEveryErrorOfMkdir) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  for (const auto& [name, error] : kInjections) {
    const int number = numberOf(error);
    expectResult(runInjected("mkdir,mkdirat", name, {"a"}), number,
                 "Failed to create [/Volumes/a], errno: " + std::to_string(number) + "\n");
    EXPECT_THAT(volumes(), IsEmpty());
  }
}

TEST_F(MountPointTest, LeavesTheDirectoryIfItsOwnerCannotBeChanged) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  for (const auto& [name, error] : kInjections) {
    const int number = numberOf(error);
    expectResult(runInjected("chown,fchown,lchown,fchownat", name, {"a"}), number,
                 "Failed to chown [/Volumes/a], errno: " + std::to_string(number) + "\n");
    EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
    expectSuccess(run({"a", "--remove"}));
  }
}

// ---- System calls ----

// The calls at the start of every run. At the end of their start-up, the libraries block signals for a
// moment. Then the command adopts its caller's identity and ignores SIGXFSZ, the signal of the limit on the
// size of files.
const std::vector<std::string> kPreparation = {"rt_sigprocmask", "rt_sigprocmask", "capget",      "getgid",
                                               "getuid",         "setfsgid",       "setfsuid",    "setfsgid",
                                               "setfsuid",       "capset",         "rt_sigaction"};

// Expects that `calls` begins with kPreparation, and returns the other calls.
std::vector<std::string> withoutPreparation(std::vector<std::string> calls) {
  std::vector<std::string> names;
  for (std::size_t index = 0; index < std::min(kPreparation.size(), calls.size()); ++index) {
    names.push_back(calls[index].substr(0, calls[index].find('(')));
  }
  EXPECT_EQ(names, kPreparation);
  calls.erase(calls.begin(), calls.begin() + static_cast<std::ptrdiff_t>(names.size()));
  return calls;
}

TEST_F(MountPointTest, MakesNoUnneededSystemCalls) {
  if (!kInstrumentation.empty()) GTEST_SKIP() << "instrumented builds make more system calls";
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  const auto callsOf = [](const std::vector<std::string>& arguments) {
    return withoutPreparation(systemCalls(arguments));
  };
  using Calls = std::vector<std::string>;
  // The command may ask for the two identifiers in any order.
  Calls making = callsOf({"a"});
  ASSERT_EQ(making.size(), 5U) << testing::PrintToString(making);
  std::sort(making.begin() + 1, making.begin() + 3);
  EXPECT_EQ(making, (Calls{"mkdir(\"/Volumes/a\", 0700) = 0", "getgid() = 0", "getuid() = 0",
                           "chown(\"/Volumes/a\", 0, 0) = 0", "exit_group(0) = ?"}));
  EXPECT_EQ(callsOf({"a"}), (Calls{"mkdir(\"/Volumes/a\", 0700) = -1 EEXIST (File exists)",
                                   "write(2, \"Failed to create [/Volumes/a], errno: 17\\n\", 41) = 41",
                                   "exit_group(17) = ?"}));
  EXPECT_EQ(callsOf({"a", "--remove"}), (Calls{"rmdir(\"/Volumes/a\") = 0", "exit_group(0) = ?"}));
  EXPECT_EQ(callsOf({}),
            (Calls{"write(2, \"No subdirectory specified.\\n\", 27) = 27", "exit_group(22) = ?"}));
  const std::vector<std::string> missing = callsOf({"a", "--remove"});
  ASSERT_EQ(missing.size(), 4U) << testing::PrintToString(missing);
  EXPECT_EQ(missing[0], "rmdir(\"/Volumes/a\") = -1 ENOENT (No such file or directory)");
  // Standard output is buffered, so the C library checks the kind of file first.
  EXPECT_THAT(missing[1], testing::ContainsRegex("^(new)?fstat"));
  EXPECT_EQ(missing[2], "write(1, \"Path already does not exist: [/Volumes/a]\\n\", 42) = 42");
}

// ---- Removing a directory ----

TEST_F(MountPointTest, RemovesADirectorySilently) {
  expectSuccess(run({"a"}));
  expectSuccess(run({"a", "--remove"}));
  EXPECT_THAT(volumes(), IsEmpty());
}

TEST_F(MountPointTest, TreatsAMissingDirectoryAsRemoved) {
  expectResult(run({"a", "--remove"}), 0, "", "Path already does not exist: [/Volumes/a]\n");
  PrivateRoot::removeVolumes();
  expectResult(run({"a", "--remove"}), 0, "", "Path already does not exist: [/Volumes/a]\n");
}

TEST_F(MountPointTest, FailsToRemoveADirectoryThatIsNotEmpty) {
  fs::create_directories("/Volumes/a/b");
  const int number = numberOf(ENOTEMPTY);
  expectResult(run({"a", "--remove"}), number,
               "Failed to remove [/Volumes/a], errno: " + std::to_string(number) + "\n");
  EXPECT_TRUE(fs::exists("/Volumes/a/b"));
}

TEST_F(MountPointTest, FailsToRemoveADirectoryThatIsInUseAsAMountPoint) {
  fs::create_directory("/Volumes/a");
  ASSERT_EQ(mount("tmpfs", "/Volumes/a", "tmpfs", 0, nullptr), 0);
  expectResult(run({"a", "--remove"}), 16, "Failed to remove [/Volumes/a], errno: 16\n");
  ASSERT_EQ(umount("/Volumes/a"), 0);
}

TEST_F(MountPointTest, FailsToRemoveAnythingButADirectory) {
  makeFile("/Volumes/file");
  fs::create_directory("/Volumes/directory");
  fs::create_symlink("directory", "/Volumes/link");
  fs::create_symlink("nowhere", "/Volumes/dangling");
  for (const std::string name : {"file", "link", "dangling"}) {
    expectResult(run({name, "--remove"}), 20, "Failed to remove [/Volumes/" + name + "], errno: 20\n");
  }
  EXPECT_EQ(volumes().size(), 4U);
}

TEST_F(MountPointTest, FailsToRemoveDotAndDotDot) {
  expectResult(run({".", "--remove"}), 22, "Failed to remove [/Volumes/.], errno: 22\n");
  const ProcessResult result = run({"..", "--remove"});
  const int number = numberOf(ENOTEMPTY);
  expectResult(result, number, "Failed to remove [/Volumes/..], errno: " + std::to_string(number) + "\n");
}

TEST_F(MountPointTest, TreatsTheEmptyNameAsVolumesWhenRemoving) {
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

TEST_F(MountPointTest, ReportsEveryErrorOfRmdir) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  fs::create_directory("/Volumes/a");
  for (const auto& [name, error] : kInjections) {
    const int number = numberOf(error);
    expectResult(runInjected("rmdir", name, {"a", "--remove"}), number,
                 "Failed to remove [/Volumes/a], errno: " + std::to_string(number) + "\n");
  }
  EXPECT_EQ(volumes(), std::vector<std::string>{"a"});
}

// The lines of commands that run at the same time do not mix. The command writes each line of up to 8 KiB in
// one call.
TEST_F(MountPointTest, WritesEachLineInOneCall) {
  if (kInstrumentation == "coverage")
    GTEST_SKIP() << "the calls that write the coverage counts hide the earlier ones";
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  expectSuccess(run({"a"}));
  for (const std::string& name : {std::string("a"), std::string(8000, 'x')}) {
    int pieces = 0;
    for (const std::string& call : systemCalls({name}))
      pieces += call.find("(2, ") != std::string::npos ? 1 : 0;
    EXPECT_EQ(pieces, 1) << name.size();
  }
}

// The README contains the output of script/run.
TEST_F(MountPointTest, BehavesAsTheReadmeShows) {
  const ProcessResult result =
      runProcess({"bash", SOURCE_DIRECTORY "/examples/mount-point/demonstration.sh", kCommand});
  EXPECT_EQ(result.exitStatus, 0);
  EXPECT_EQ(result.standardError, "");
  std::ostringstream readme;
  readme << std::ifstream(SOURCE_DIRECTORY "/README.md").rdbuf();
  EXPECT_THAT(readme.str(), testing::HasSubstr("```\n" + result.standardOutput + "```\n"));
}

}  // namespace
