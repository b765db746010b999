// Tests how the set-user-ID command for macOS uses root's rights. The caller stops the command between its
// system calls, and reuses the names. docs/security.md names these cases.

#include <sys/syscall.h>

#include <cerrno>
#include <csignal>
#include <fstream>

#include "tests/support/MountPointPrivilegesTest.h"

namespace {

namespace fs = std::filesystem;

class MountPointMacAttackTest : public MountPointStoppedTest {
 protected:
  // The caller stops the command at the end of its first `systemCall`. Then `another` puts something else
  // somewhere. Finally the caller lets the command continue. Returns the command's result.
  static ProcessResult attack(long systemCall, const std::function<void()>& another) {
    StoppedProcess stopped(systemCall, {kCommand, "a"}, as(kCaller));
    another();
    EXPECT_EQ(inProcessOf(kCaller, [&] { return kill(stopped.identifier(), SIGCONT); }), 0);
    return stopped.wait();
  }

  // Returns the name of the folder in which root works. Empty if there is none.
  static std::string rootsFolder() {
    for (const std::string& name : volumes()) {
      if (name.starts_with(".mount-point.")) return name;
    }
    return "";
  }

  static void expectRoots(const std::string& folder) {
    EXPECT_EQ(statusOf("/Volumes/" + folder).st_uid, 0U);
    EXPECT_EQ(statusOf("/Volumes/" + folder).st_mode & 07777U, 0700U);
  }

  static void expectNoRootsFolder() { EXPECT_EQ(rootsFolder(), ""); }
};

TEST_F(MountPointMacAttackTest, CallerDoesNotGetWhatIsPutInPlaceOfRootsFolder) {
  std::string name;
  const ProcessResult result = attack(SYS_mkdirat, [&] {
    name = rootsFolder();
    ASSERT_NE(name, "");
    expectRoots(name);
    expectSuccess(runAs(kCaller, {name, "--remove"}));
    expectSuccess(runAs(kOther, {name}));
  });
  const int number = numberOf(EAGAIN);
  expectResult(result, number, "Failed to create [/Volumes/a], errno: " + std::to_string(number) + "\n");
  EXPECT_FALSE(fs::exists("/Volumes/a"));
}

TEST_F(MountPointMacAttackTest, CallerDoesNotGetAnotherUsersDirectory) {
  const ProcessResult result = attack(SYS_fchown, [] {
    expectSuccess(runAs(kOther, {"a"}));
    makeFile("/Volumes/a/secret");
  });
  expectResult(result, EEXIST, "Failed to create [/Volumes/a], errno: 17\n");
  expectOwner("/Volumes/a", kOther);
  EXPECT_EQ(openingFailure(kCaller, "/Volumes/a/secret"), EACCES);
  expectNoRootsFolder();
}

TEST_F(MountPointMacAttackTest, CallerDoesNotGetADirectoryThatReplacesItsOwn) {
  const ProcessResult result = attack(SYS_renameat2, [] {
    expectOwner("/Volumes/a", kCaller);
    expectSuccess(runAs(kCaller, {"a", "--remove"}));
    expectSuccess(runAs(kOther, {"a"}));
  });
  expectSuccess(result);
  expectOwner("/Volumes/a", kOther);
  expectNoRootsFolder();
}

TEST_F(MountPointMacAttackTest, CallerDoesNotGetTheTargetOfALink) {
  fs::create_directory("/root-only");
  ASSERT_EQ(chmod("/root-only", 0700), 0);
  const ProcessResult result =
      attack(SYS_fchown, [] { fs::create_directory_symlink("/root-only", "/Volumes/a"); });
  expectResult(result, EEXIST, "Failed to create [/Volumes/a], errno: 17\n");
  expectOwner("/root-only", {0, 0});
  fs::remove("/root-only");
}

TEST_F(MountPointMacAttackTest, OthersCannotEnterRootsFolder) {
  attack(SYS_fchown, [] {
    expectRoots(rootsFolder());
    EXPECT_EQ(openingFailure(kCaller, "/Volumes/" + rootsFolder()), EACCES);
    EXPECT_NE(runAs(kCaller, {rootsFolder(), "--remove"}).exitStatus, 0);
  });
  expectOwner("/Volumes/a", kCaller);
}

// docs/security.md says so.
TEST_F(MountPointMacAttackTest, LeavesRootsFolderIfItIsKilled) {
  {
    const StoppedProcess killed(SYS_fchown, {kCommand, "a"}, as(kCaller));
  }
  EXPECT_FALSE(fs::exists("/Volumes/a"));
  expectRoots(rootsFolder());
}

TEST_F(MountPointMacAttackTest, HasItsCallersIdentityWhenItWritesAMessage) {
  const StoppedProcess stopped(SYS_write, {kCommand}, as(kCaller));
  std::ifstream file("/proc/" + std::to_string(stopped.identifier()) + "/status");
  std::string identities;
  for (std::string line; std::getline(file, line);) {
    if (line.starts_with("Uid:")) identities = line;
  }
  EXPECT_TRUE(identities.starts_with("Uid:\t1000\t1000\t")) << identities;
}

}  // namespace
