// Tests how the set-user-ID command uses what only Linux has: file-system identities and capabilities. The
// caller stops the command between its system calls. docs/security.md names these cases.

#include <gmock/gmock.h>
#include <linux/capability.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/xattr.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <fstream>
#include <sstream>

#include "tests/support/MountPointPrivilegesTest.h"

namespace {

namespace fs = std::filesystem;

// ---- System calls ----

TEST_F(MountPointPrivilegesTest, MakesTheSameSystemCallsForACallerAsForRoot) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  if (!kInstrumentation.empty()) GTEST_SKIP() << "instrumented builds make more system calls";
  const auto namesOf = [](const std::vector<std::string>& calls) {
    std::vector<std::string> names;
    for (const std::string& call : calls) names.push_back(call.substr(0, call.find('(')));
    return names;
  };
  const std::vector<std::vector<std::string>> runs = {{}, {"a/b"}, {"a"}, {"a"}, {"a", "--remove"}};
  std::vector<std::vector<std::string>> asked;
  for (const std::vector<std::string>& arguments : runs) asked.push_back(namesOf(systemCalls(arguments)));
  for (std::size_t index = 0; index < runs.size(); ++index) {
    EXPECT_THAT(asked[index], testing::Contains("capset"));
    EXPECT_EQ(namesOf(systemCalls(runs[index], onBehalfOf(kCaller))), asked[index]) << index;
  }
}

// Without raised privileges, the C library parses LD_LIBRARY_PATH before `main`. The command has too little
// memory for the value of this test.
TEST_F(MountPointPrivilegesTest, WorksWithALongLibrarySearchPath) {
  const auto searching = [] {
    as(kCaller)();
    std::string path;
    for (int number = 0; number < 10000; ++number) path += "/" + std::to_string(number) + ":";
    require(setenv("LD_LIBRARY_PATH", path.c_str(), 1) == 0);
  };
  if (kInstrumentation.empty()) {
    EXPECT_NE(runProcess({kPlainCommand, "a"}, searching).exitStatus, EACCES) << "too short to show anything";
  }
  expectSuccess(run({"a"}, searching));
  expectResult(run({"a"}, searching), 17, "Failed to create [/Volumes/a], errno: 17\n");
  expectSuccess(run({"a", "--remove"}, searching));
}

// ---- The caller's identity ----

// Returns the value of `name` in the process's /proc/…/status, with tabs replaced by spaces.
std::string statusLine(pid_t process, const std::string& name) {
  std::ifstream file("/proc/" + std::to_string(process) + "/status");
  for (std::string line; std::getline(file, line);) {
    if (!line.starts_with(name + ":")) continue;
    std::ranges::replace(line, '\t', ' ');
    return line.substr(name.size() + 2);
  }
  return "";
}

std::string hexadecimal(unsigned long number) {
  std::ostringstream text;
  text.fill('0');
  text.width(16);
  text << std::hex << number;
  return text.str();
}

TEST_F(MountPointStoppedTest, HasItsCallersFileSystemIdentityAndOneCapability) {
  const StoppedProcess stopped(SYS_mkdir, {kCommand, "a"}, as(kCaller));
  expectOwner("/Volumes/a", kCaller);
  EXPECT_EQ(statusLine(stopped.identifier(), "Uid"), "1000 0 0 1000");
  EXPECT_EQ(statusLine(stopped.identifier(), "Gid"), "1001 1001 1001 1001");
  const std::string all = hexadecimal(1UL << CAP_DAC_OVERRIDE);
  EXPECT_EQ(statusLine(stopped.identifier(), "CapEff"), all);
  EXPECT_EQ(statusLine(stopped.identifier(), "CapPrm"), all);
  EXPECT_EQ(statusLine(stopped.identifier(), "CapInh"), hexadecimal(0));
  EXPECT_EQ(statusLine(stopped.identifier(), "CapAmb"), hexadecimal(0));
}

TEST_F(MountPointStoppedTest, HasItsCallersFileSystemIdentityIfSetGroupIdToo) {
  ASSERT_EQ(chmod(kCommand, 06755), 0);
  const StoppedProcess stopped(SYS_mkdir, {kCommand, "a"}, as(kCaller));
  EXPECT_EQ(statusLine(stopped.identifier(), "Gid"), "1001 0 0 1001");
}

// The caller can end the command half-way by a limit or a signal. No directory that root owns may remain
// then.
TEST_F(MountPointStoppedTest, LeavesTheCallersDirectoryIfItIsKilled) {
  {
    const StoppedProcess killed(SYS_mkdir, {kCommand, "a"}, as(kCaller));
  }
  expectOwner("/Volumes/a", kCaller);
}

TEST_F(MountPointStoppedTest, HasOneCapabilityWhenItRemoves) {
  expectSuccess(runAs(kCaller, {"a"}));
  const StoppedProcess stopped(SYS_rmdir, {kCommand, "a", "--remove"}, as(kCaller));
  EXPECT_EQ(statusLine(stopped.identifier(), "CapEff"), hexadecimal(1UL << CAP_DAC_OVERRIDE));
}

// ---- Attacks: the name is reused while the command is stopped ----

// The caller stops the command as soon as it has made "a", and removes "a" by running the command again. Then
// `another` puts something else there. Finally the caller lets the first command continue.
class MountPointAttackTest : public MountPointStoppedTest {
 protected:
  static void attack(const std::function<void()>& another, const char* command = kCommand) {
    StoppedProcess stopped(SYS_mkdir, {command, "a"}, as(kCaller));
    expectSuccess(runAs(kCaller, {"a", "--remove"}));
    another();
    ASSERT_EQ(inProcessOf(kCaller, [&] { return kill(stopped.identifier(), SIGCONT); }), 0);
    expectResult(stopped.wait(), 1, "Failed to chown [/Volumes/a], errno: 1\n");
  }
};

TEST_F(MountPointAttackTest, CallerDoesNotGetAnotherUsersDirectory) {
  attack([] {
    expectSuccess(runAs(kOther, {"a"}));
    makeFile("/Volumes/a/secret");
  });
  expectOwner("/Volumes/a", kOther);
  EXPECT_EQ(openingFailure(kCaller, "/Volumes/a/secret"), EACCES);
}

TEST_F(MountPointAttackTest, CallerDoesNotGetTheRootOfAMountedFileSystem) {
  attack([] {
    fs::create_directory("/Volumes/a");
    ASSERT_EQ(mount("tmpfs", "/Volumes/a", "tmpfs", 0, "mode=0755"), 0);
    makeFile("/Volumes/a/file");
  });
  expectOwner("/Volumes/a", {0, 0});
  EXPECT_EQ(inProcessOf(kCaller, [] { return rename("/Volumes/a/file", "/Volumes/a/b") == 0 ? 0 : errno; }),
            EACCES);
}

TEST_F(MountPointAttackTest, CallerDoesNotGetTheTargetOfRootsLink) {
  fs::create_directory("/root-only");
  ASSERT_EQ(chmod("/root-only", 0700), 0);
  attack([] { fs::create_directory_symlink("/root-only", "/Volumes/a"); });
  expectOwner("/Volumes/a", {0, 0});
  expectOwner("/root-only", {0, 0});
  EXPECT_EQ(openingFailure(kCaller, "/root-only"), EACCES);
  fs::remove("/root-only");
}

TEST_F(MountPointAttackTest, CallerDoesNotGetAnotherUsersDirectoryWithFileCapabilities) {
  vfs_cap_data capabilities{};
  capabilities.magic_etc = VFS_CAP_REVISION_2 | VFS_CAP_FLAGS_EFFECTIVE;
  capabilities.data[0].permitted = 1U << CAP_CHOWN | 1U << CAP_DAC_OVERRIDE;
  if (setxattr(kPlainCommand, "security.capability", &capabilities, XATTR_CAPS_SZ_2, 0) != 0) {
    GTEST_SKIP() << "files cannot have capabilities here: " << std::strerror(errno);
  }
  attack(
      [] {
        expectSuccess(runAs(kOther, {"a"}));
        makeFile("/Volumes/a/secret");
      },
      kPlainCommand);
  expectOwner("/Volumes/a", kOther);
}

// A user who may write in /Volumes could replace the directory when root itself runs the command. Root must
// not become the owner of what the user put there.
TEST_F(MountPointAttackTest, RootDoesNotTakeAnotherUsersDirectory) {
  fs::create_directory("/others");
  ASSERT_EQ(chown("/others", kOther.user, kOther.group), 0);
  StoppedProcess stopped(SYS_mkdir, {kPlainCommand, "a"}, leaveLeaksAlone);
  ASSERT_TRUE(fs::remove("/Volumes/a"));
  fs::create_directory_symlink("/others", "/Volumes/a");
  kill(stopped.identifier(), SIGCONT);
  expectResult(stopped.wait(), 1, "Failed to chown [/Volumes/a], errno: 1\n");
  expectOwner("/others", kOther);
  fs::remove("/others");
}

// If /Volumes is empty, a caller can become its owner and then replace the new directory by a link. The
// command used to give the caller the target of that link.
TEST_F(MountPointStoppedTest, GivesAwayNothingElseIfItsCallerOwnsVolumes) {
  PrivateRoot::removeVolumes();
  fs::create_directory("/Volumes");
  expectSuccess(runAs(kCaller, {"", "--remove"}));
  expectSuccess(runAs(kCaller, {""}));
  expectOwner("/Volumes", kCaller);
  // The targets are new files in the private root itself. Other directories there are the machine's, so a
  // failure of this test would damage them.
  fs::create_directory("/roots-directory");
  makeFile("/roots-file");
  for (const std::string target : {"/roots-file", "/roots-directory"}) {
    StoppedProcess stopped(SYS_mkdir, {kCommand, "a"}, as(kCaller));
    ASSERT_EQ(inProcessOf(kCaller,
                          [&] {
                            return rmdir("/Volumes/a") == 0 && symlink(target.c_str(), "/Volumes/a") == 0 &&
                                           kill(stopped.identifier(), SIGCONT) == 0
                                       ? 0
                                       : errno;
                          }),
              0);
    expectResult(stopped.wait(), 1, "Failed to chown [/Volumes/a], errno: 1\n");
    expectOwner(target, {0, 0});
    EXPECT_TRUE(fs::remove("/Volumes/a") && fs::remove(target));
  }
}

// ---- The command cannot adopt its caller's identity ----

TEST_F(MountPointPrivilegesTest, WorksIfTheSystemRefusesAPartOfTheIdentity) {
  if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  // Only root may write here, so a partly adopted identity would make the command fail.
  ASSERT_EQ(chmod("/Volumes", 0700), 0);
  for (const std::string call : {"capget", "capset", "setfsuid", "setfsgid"}) {
    for (const std::string error : {"EPERM", "ENOSYS"}) {
      SCOPED_TRACE(call + ": " + error);
      expectSuccess(runInjected(call, error, {"a"}, onBehalfOf(kCaller)));
      expectOwner("/Volumes/a", kCaller);
      expectSuccess(runInjected(call, error, {"a", "--remove"}, onBehalfOf(kCaller)));
      EXPECT_FALSE(fs::exists("/Volumes/a"));
    }
  }
}

TEST_F(MountPointPrivilegesTest, WorksWithoutTheCapabilityToWriteAnywhere) {
  expectSuccess(runWithout("dac_override", {"a"}));
  expectOwner("/Volumes/a", kCaller);
  // Now only root's group may write.
  ASSERT_EQ(chown("/Volumes", kOther.user, 0), 0);
  ASSERT_EQ(chmod("/Volumes", 0770), 0);
  expectSuccess(runWithout("dac_override", {"b"}));
  expectOwner("/Volumes/b", kCaller);
}

TEST_F(MountPointPrivilegesTest, FailsToChangeTheOwnerWithoutTheCapability) {
  expectResult(runWithout("chown", {"a"}), 1, "Failed to chown [/Volumes/a], errno: 1\n");
  EXPECT_EQ(statusOf("/Volumes/a").st_uid, 0U);
}

// An ordinary user must set PR_SET_NO_NEW_PRIVS before filtering system calls. The set-user-ID bit then has
// no effect.
TEST_F(MountPointPrivilegesTest, HasNoPrivilegesIfItsCallerMayFilterSystemCalls) {
  if (kInstrumentation == "coverage") {
    GTEST_SKIP() << "only its builder may write the counts of a coverage build";
  }
  const ProcessResult result = run({"a"}, [] {
    as(kCaller)();
    require(prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0);
  });
  expectResult(result, 13, "Failed to create [/Volumes/a], errno: 13\n");
}

// ---- Blocks that only root may write ----

TEST_F(MountPointFullFileSystemTest, MakesNoDirectoryWithBlocksReservedForRoot) {
  expectResult(runAs(kCaller, {"a"}), 28, "Failed to create [/Volumes/a], errno: 28\n");
  expectSuccess(run({"roots"}));
}

}  // namespace
