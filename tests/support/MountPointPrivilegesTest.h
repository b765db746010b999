#pragma once

#include <fcntl.h>
#include <grp.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "tests/support/MountPointTest.h"
#include "tests/support/StoppedProcess.h"

/// The identifiers of a user.
struct User {
  uid_t user;
  gid_t group;
};
inline constexpr User kCaller = {PrivateRoot::kOrdinaryUser, PrivateRoot::kOrdinaryGroup};
inline constexpr User kOther = {1002, 1003};

/// Installs the command set-user-ID root and sets up /Volumes as the manual requires.
class MountPointPrivilegesTest : public MountPointTest {
 protected:
  // A copy of the command without the set-user-ID bit. Every user may run it.
  static constexpr const char* kPlainCommand = "/mount-point.plain";

  void SetUp() override {
    MountPointTest::SetUp();
    if (IsSkipped()) return;
    if (!isMachineRoot()) GTEST_SKIP() << "this needs root: a user namespace maps only one user";
    std::filesystem::copy_file(kCommand, kPlainCommand, std::filesystem::copy_options::overwrite_existing);
    ASSERT_EQ(chmod(kCommand, 04755), 0);
    makeFile("/Volumes/.keep");
  }
  void TearDown() override { chmod(kCommand, 0755); }

  static std::function<void()> as(User user) {
    return [user] {
      leaveLeaksAlone();
      require(setgroups(0, nullptr) == 0 && setresgid(user.group, user.group, user.group) == 0 &&
              setresuid(user.user, user.user, user.user) == 0);
    };
  }
  static ProcessResult runAs(User user, std::vector<std::string> arguments) {
    return run(std::move(arguments), as(user));
  }

  // Removes the bit and runs the command with root as its effective user and `caller` as its real user.
  static std::function<void()> onBehalfOf(User caller) {
    return [caller] {
      leaveLeaksAlone();
      require(chmod(kCommand, 0755) == 0 && setgroups(0, nullptr) == 0 &&
              setresgid(caller.group, 0, 0) == 0 && setresuid(caller.user, 0, 0) == 0);
    };
  }
  // Runs the command in the same way on behalf of kCaller, but without `capability` (a name of setpriv).
  static ProcessResult runWithout(const std::string& capability, const std::vector<std::string>& arguments) {
    std::vector<std::string> whole = {"setpriv",    "--bounding-set", "-" + capability,
                                      "--inh-caps", "-" + capability, kCommand};
    whole.insert(whole.end(), arguments.begin(), arguments.end());
    return runProcess(whole, onBehalfOf(kCaller));
  }

  static void expectOwner(const std::filesystem::path& path, User owner) {
    EXPECT_EQ(statusOf(path).st_uid, owner.user) << path;
    EXPECT_EQ(statusOf(path).st_gid, owner.group) << path;
  }

  // Runs `action` in a process of `user` and returns its result, which is from 0 to 255.
  static int inProcessOf(User user, const std::function<int()>& action) {
    const pid_t child = fork();
    if (child == 0) {
      as(user)();
      _exit(action());
    }
    int status = 0;
    EXPECT_EQ(waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFEXITED(status));
    return WEXITSTATUS(status);
  }

  // Lets `user` open `path` for reading. Returns the error's number, or 0 if it succeeds.
  static int openingFailure(User user, const std::string& path) {
    return inProcessOf(user, [&] { return open(path.c_str(), O_RDONLY) >= 0 ? 0 : errno; });
  }
};

/// The command is stopped half-way.
class MountPointStoppedTest : public MountPointPrivilegesTest {
 protected:
  void SetUp() override {
    MountPointPrivilegesTest::SetUp();
    if (IsSkipped()) return;
    if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  }
};

/// Makes /Volumes a file system with 40 % of its blocks reserved for root. The caller has filled the rest.
class MountPointFullFileSystemTest : public MountPointPrivilegesTest {
 protected:
  static constexpr const char* kFile = "/Volumes/full/file";

  void SetUp() override {
    MountPointPrivilegesTest::SetUp();
    if (IsSkipped()) return;
    const ProcessResult made =
        runProcess({"bash", "-c",
                    "truncate -s 4M /image && mkfs.ext4 -q -b 1024 -m 40 -O ^has_journal /image"
                    " && mount -o loop /image /Volumes"});
    if (made.exitStatus != 0) GTEST_SKIP() << "no image can be mounted here: " << made.standardError;
    std::filesystem::create_directory("/Volumes/full");
    ASSERT_EQ(chown("/Volumes/full", kCaller.user, kCaller.group), 0);
    EXPECT_EQ(inProcessOf(kCaller, fill), ENOSPC);
  }
  void TearDown() override {
    umount("/Volumes");
    std::filesystem::remove("/image");
    MountPointPrivilegesTest::TearDown();
  }

 private:
  // Writes until no block is free. The file system delays some work until fsync, which may free more blocks.
  static int fill() {
    const int file = open(kFile, O_WRONLY | O_CREAT, 0600);
    const std::string block(1024, '.');
    while (write(file, block.data(), block.size()) > 0) {
      while (write(file, block.data(), block.size()) > 0) {
      }
      fsync(file);
    }
    return errno;
  }
};
