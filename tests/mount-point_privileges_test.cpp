// Tests the mount-point command when it is installed set-user-ID root and so has more rights than its caller.
// Shows that a hostile caller gains nothing. docs/security.md names these cases.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <grp.h>
#include <gtest/gtest.h>
#include <linux/capability.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "tests/support/MountPointTest.h"
#include "tests/support/StoppedProcess.h"

namespace {

namespace fs = std::filesystem;

struct User {
  uid_t user;
  gid_t group;
};
constexpr User kCaller = {PrivateRoot::kOrdinaryUser, PrivateRoot::kOrdinaryGroup};
constexpr User kOther = {1002, 1003};

// Installs the command set-user-ID root and sets up /Volumes as the manual requires.
class MountPointPrivilegesTest : public MountPointTest {
 protected:
  // A copy of the command without the set-user-ID bit. Every user may run it.
  static constexpr const char* kPlainCommand = "/mount-point.plain";

  void SetUp() override {
    MountPointTest::SetUp();
    if (IsSkipped()) return;
    if (!isMachineRoot()) GTEST_SKIP() << "this needs root: a user namespace maps only one user";
    fs::copy_file(kCommand, kPlainCommand, fs::copy_options::overwrite_existing);
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

  static void expectOwner(const fs::path& path, User owner) {
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

// ---- Ordinary use ----

TEST_F(MountPointPrivilegesTest, GivesTheDirectoryToTheRealUserAndGroup) {
  expectSuccess(run({"a"}, onBehalfOf(kCaller)));
  expectOwner("/Volumes/a", kCaller);
  EXPECT_EQ(statusOf("/Volumes/a").st_mode & 07777U, 0700U);
}

TEST_F(MountPointPrivilegesTest, WorksForAnOrdinaryUserIfSetUserId) {
  expectSuccess(runAs(kCaller, {"a"}));
  expectOwner("/Volumes/a", kCaller);
  EXPECT_EQ(statusOf("/Volumes/a").st_mode & 07777U, 0700U);
  expectResult(runAs(kCaller, {"a"}), 17, "Failed to create [/Volumes/a], errno: 17\n");
  expectSuccess(runAs(kCaller, {"a", "--remove"}));
  expectResult(runAs(kCaller, {"a", "--remove"}), 0, "", "Path already does not exist: [/Volumes/a]\n");
  expectResult(runAs(kCaller, {".keep", "--remove"}), 20, "Failed to remove [/Volumes/.keep], errno: 20\n");
  EXPECT_EQ(volumes(), std::vector<std::string>{".keep"});
}

TEST_F(MountPointPrivilegesTest, WorksIfSetGroupIdToo) {
  ASSERT_EQ(chmod(kCommand, 06755), 0);
  expectSuccess(runAs(kCaller, {"a"}));
  expectOwner("/Volumes/a", kCaller);
  expectSuccess(runAs(kCaller, {"a", "--remove"}));
}

TEST_F(MountPointPrivilegesTest, SetsTheCallersGroupIfVolumesIsSetGroupId) {
  ASSERT_EQ(chown("/Volumes", 0, kOther.group), 0);
  ASSERT_EQ(chmod("/Volumes", 02755), 0);
  expectSuccess(runAs(kCaller, {"a"}));
  expectOwner("/Volumes/a", kCaller);
  EXPECT_EQ(statusOf("/Volumes/a").st_mode & 07777U, 02700U);
}

TEST_F(MountPointPrivilegesTest, WorksIfOnlyRootMaySearchVolumes) {
  ASSERT_EQ(chmod("/Volumes", 0700), 0);
  expectSuccess(runAs(kCaller, {"a"}));
  expectOwner("/Volumes/a", kCaller);
  expectSuccess(runAs(kCaller, {"a", "--remove"}));
}

TEST_F(MountPointPrivilegesTest, WorksIfVolumesIsALinkOwnedByRoot) {
  PrivateRoot::removeVolumes();
  fs::create_directory("/elsewhere");
  fs::create_directory_symlink("/elsewhere", "/Volumes");
  expectSuccess(runAs(kCaller, {"a"}));
  expectOwner("/elsewhere/a", kCaller);
  expectSuccess(runAs(kCaller, {"a", "--remove"}));
  expectResult(runAs(kCaller, {"", "--remove"}), 20, "Failed to remove [/Volumes/], errno: 20\n");
  expectResult(runAs(kCaller, {""}), 17, "Failed to create [/Volumes/], errno: 17\n");
  EXPECT_TRUE(fs::remove("/Volumes") && fs::remove("/elsewhere"));
}

TEST_F(MountPointPrivilegesTest, AppliesTheCallersUmask) {
  expectSuccess(run({"a"}, [] {
    umask(0777);
    as(kCaller)();
  }));
  expectOwner("/Volumes/a", kCaller);
  EXPECT_EQ(statusOf("/Volumes/a").st_mode & 07777U, 0U);
  expectSuccess(runAs(kCaller, {"a", "--remove"}));
}

// If the caller has closed a standard stream, the C library opens one that accepts no bytes in its place.
// Otherwise the next file that is opened would become that stream.
TEST_F(MountPointPrivilegesTest, ReportsTheFailureOfItsMessageIfItsStreamsAreClosed) {
  const auto closed = [] {
    as(kCaller)();
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) close(stream);
  };
  expectSuccess(run({"a"}, closed));
  expectResult(run({"a"}, closed), EBADF, "");
  expectSuccess(run({"a", "--remove"}, closed));
  expectSuccess(run({"a", "--remove"}, closed));
}

TEST_F(MountPointPrivilegesTest, DoesNothingIfAClosedStreamCannotBeReplaced) {
  if (!kInstrumentation.empty()) GTEST_SKIP() << "instrumented builds open files";
  const ProcessResult result = run({"a"}, [] {
    as(kCaller)();
    const rlimit none{0, 0};
    require(setrlimit(RLIMIT_NOFILE, &none) == 0);
    close(STDERR_FILENO);
  });
  EXPECT_NE(result.signal, 0);
  EXPECT_FALSE(fs::exists("/Volumes/a"));
}

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

TEST_F(MountPointPrivilegesTest, RemovesAnotherUsersEmptyDirectory) {
  expectSuccess(runAs(kOther, {"a"}));
  expectSuccess(runAs(kCaller, {"a", "--remove"}));
}

TEST_F(MountPointPrivilegesTest, RemovesOnlyTheCallersDirectoriesIfVolumesIsSticky) {
  ASSERT_EQ(chmod("/Volumes", 01755), 0);
  expectSuccess(runAs(kOther, {"a"}));
  expectResult(runAs(kCaller, {"a", "--remove"}), 1, "Failed to remove [/Volumes/a], errno: 1\n");
  expectOwner("/Volumes/a", kOther);
  expectSuccess(runAs(kOther, {"a", "--remove"}));
  expectSuccess(runAs(kCaller, {"a"}));
  expectSuccess(run({"a", "--remove"}));
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

class MountPointStoppedTest : public MountPointPrivilegesTest {
 protected:
  void SetUp() override {
    MountPointPrivilegesTest::SetUp();
    if (IsSkipped()) return;
    if (const std::string problem = tracingRefusal(); !problem.empty()) GTEST_SKIP() << problem;
  }
};

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

// The ways in which a process can read or change another one. `accessTo` tries all of them and returns those
// that work.
enum Access : std::uint8_t { attached = 1, readMemory = 2, openedMemory = 4, sawProgram = 8 };
int accessTo(pid_t process) {
  int access = 0;
  const std::string folder = "/proc/" + std::to_string(process);
  if (open((folder + "/mem").c_str(), O_RDWR) >= 0) access |= openedMemory;
  std::array<char, 64> text{};
  if (readlink((folder + "/exe").c_str(), text.data(), text.size()) > 0) access |= sawProgram;
  // The address does not exist in the other process. The kernel checks the permission first.
  iovec local{text.data(), 1};
  iovec remote{text.data(), 1};
  if (process_vm_readv(process, &local, 1, &remote, 1, 0) >= 0 || errno == EFAULT) access |= readMemory;
  if (ptrace(PTRACE_SEIZE, process, nullptr, nullptr) == 0) access |= attached;
  return access;
}

TEST_F(MountPointStoppedTest, LetsItsCallerStopItButNotTraceIt) {
  const StoppedProcess plain(SYS_mkdir, {kPlainCommand, "a"}, as(kCaller));
  ASSERT_EQ(inProcessOf(kCaller, [&] { return accessTo(plain.identifier()); }),
            attached | readMemory | openedMemory | sawProgram)
      << "the caller's own program";

  const StoppedProcess stopped(SYS_mkdir, {kCommand, "a"}, as(kCaller));
  EXPECT_EQ(inProcessOf(kCaller, [&] { return accessTo(stopped.identifier()); }), 0);
  EXPECT_EQ(inProcessOf(kCaller, [&] { return kill(stopped.identifier(), SIGSTOP); }), 0);
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

// ---- /Volumes is not as the manual requires ----

TEST_F(MountPointPrivilegesTest, DoesNotRemoveVolumesIfItContainsAnEntryOfRoot) {
  PrivateRoot::removeVolumes();
  fs::create_directories("/Volumes/.keep");
  makeFile("/Volumes/.keep/file");
  expectResult(runAs(kCaller, {"", "--remove"}), 39, "Failed to remove [/Volumes/], errno: 39\n");
  expectResult(runAs(kCaller, {""}), 17, "Failed to create [/Volumes/], errno: 17\n");
  expectResult(runAs(kCaller, {".", "--remove"}), 22, "Failed to remove [/Volumes/.], errno: 22\n");
  expectResult(runAs(kCaller, {"..", "--remove"}), 39, "Failed to remove [/Volumes/..], errno: 39\n");
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

// ---- Blocks and files that only root may write ----

// Makes /Volumes a file system with 40 % of its blocks reserved for root. The caller has filled the rest.
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
    fs::create_directory("/Volumes/full");
    ASSERT_EQ(chown("/Volumes/full", kCaller.user, kCaller.group), 0);
    EXPECT_EQ(inProcessOf(kCaller, fill), ENOSPC);
  }
  void TearDown() override {
    umount("/Volumes");
    fs::remove("/image");
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

TEST_F(MountPointFullFileSystemTest, MakesNoDirectoryWithBlocksReservedForRoot) {
  expectResult(runAs(kCaller, {"a"}), 28, "Failed to create [/Volumes/a], errno: 28\n");
  expectSuccess(run({"roots"}));
}

// Messages about the arguments used to be written as root: each could put up to 128 KiB of the caller's bytes
// there.
TEST_F(MountPointFullFileSystemTest, WritesNoMessageWithBlocksReservedForRoot) {
  const off_t size = statusOf(kFile).st_size;
  const auto intoFile = [] {
    as(kCaller)();
    const int file = open(kFile, O_WRONLY | O_APPEND);
    require(file >= 0 && dup2(file, STDERR_FILENO) == STDERR_FILENO);
  };
  const std::string name(100000, 'y');
  expectResult(run({"/" + name}, intoFile), 22, "");
  expectResult(run({}, intoFile), 22, "");
  expectResult(run({name}, intoFile), ENOSPC, "");
  EXPECT_EQ(statusOf(kFile).st_size, size);
}

// If a user other than root writes to a program, the kernel removes its set-user-ID and set-group-ID bits. A
// message that the command writes for its caller must have the same effect.
TEST_F(MountPointPrivilegesTest, ClearsTheSetIdBitsOfTheFileThatItsMessageGoesTo) {
  const auto intoProgram = [] {
    as(kCaller)();
    const int file = open("/Volumes/program", O_WRONLY | O_APPEND);
    require(file >= 0 && dup2(file, STDERR_FILENO) == STDERR_FILENO);
  };
  makeFile("/Volumes/program");
  ASSERT_EQ(chown("/Volumes/program", kOther.user, kOther.group), 0);
  for (const std::vector<std::string>& arguments : {std::vector<std::string>{}, {"a/b"}, {"program"}}) {
    SCOPED_TRACE(testing::PrintToString(arguments));
    const off_t size = statusOf("/Volumes/program").st_size;
    ASSERT_EQ(chmod("/Volumes/program", 06777), 0);
    expectResult(run(arguments, intoProgram), arguments == std::vector<std::string>{"program"} ? 17 : 22, "");
    EXPECT_GT(statusOf("/Volumes/program").st_size, size);
    EXPECT_EQ(statusOf("/Volumes/program").st_mode & 07777U, 0777U);
  }
}

}  // namespace
