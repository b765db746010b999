// Tests the mount-point command when it is installed set-user-ID root and so has more rights than its caller.
// Shows that a hostile caller gains nothing. docs/security.md names these cases.

#include <gtest/gtest.h>
#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <filesystem>

#include "tests/support/MountPointPrivilegesTest.h"

namespace {

namespace fs = std::filesystem;

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

// ---- The command is stopped ----

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

  const StoppedProcess stopped(kIsForMacOS ? SYS_mkdirat : SYS_mkdir, {kCommand, "a"}, as(kCaller));
  EXPECT_EQ(inProcessOf(kCaller, [&] { return accessTo(stopped.identifier()); }), 0);
  EXPECT_EQ(inProcessOf(kCaller, [&] { return kill(stopped.identifier(), SIGSTOP); }), 0);
}

// ---- /Volumes is not as the manual requires ----

TEST_F(MountPointPrivilegesTest, DoesNotRemoveVolumesIfItContainsAnEntryOfRoot) {
  PrivateRoot::removeVolumes();
  fs::create_directories("/Volumes/.keep");
  makeFile("/Volumes/.keep/file");
  const int number = numberOf(ENOTEMPTY);
  const std::string error = ", errno: " + std::to_string(number) + "\n";
  expectResult(runAs(kCaller, {"", "--remove"}), number, "Failed to remove [/Volumes/]" + error);
  expectResult(runAs(kCaller, {""}), 17, "Failed to create [/Volumes/], errno: 17\n");
  expectResult(runAs(kCaller, {".", "--remove"}), 22, "Failed to remove [/Volumes/.], errno: 22\n");
  expectResult(runAs(kCaller, {"..", "--remove"}), number, "Failed to remove [/Volumes/..]" + error);
}

// ---- Blocks and files that only root may write ----

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
