// What the tests of Runtime/Defaults/UserDefaults.h do not reach.
#include "Runtime/Defaults/Private/DefaultsFile.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <string>
#include <system_error>
#include <vector>

#include "Runtime/Base/Private/FileDescriptor.h"
#include "tests/support/ClockHook.h"

namespace {

namespace fs = std::filesystem;

// The calls that decide what is there after a loss of power, in their order.
std::vector<std::string> calls;
// Of the calls of fsync to come, the one that fails, from 1 on; 0 for none.
int failingSync = 0;

template <class Function>
Function* systems(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

// A program's own functions go before those of the C library.

extern "C" int fsync(int descriptor) {
  struct stat status{};
  fstat(descriptor, &status);
  calls.emplace_back(S_ISDIR(status.st_mode) ? "fsync of a folder" : "fsync of a file");
  if (failingSync > 0 && --failingSync == 0) {
    errno = EIO;
    return -1;
  }
  return systems<int(int)>("fsync")(descriptor);
}

extern "C" int rename(const char* from, const char* to) noexcept {
  calls.emplace_back("rename");
  return systems<int(const char*, const char*)>("rename")(from, to);
}

namespace {

class DefaultsFile : public testing::Test {
 protected:
  DefaultsFile() {
    std::string folder = testing::TempDir() + "defaults-file.XXXXXX";
    if (mkdtemp(folder.data()) == nullptr) throw std::runtime_error("no temporary folder");
    folder_ = folder;
  }
  ~DefaultsFile() override { fs::remove_all(folder_); }

  // Whether the file is older than the step of any file system's clock.
  static bool isOld(const char* path) {
    struct stat status{};
    return stat(path, &status) == 0 && status.st_mtime + 10 < time(nullptr);
  }

  fs::path folder_;
};

TEST_F(DefaultsFile, ThatIsOldIsReadOnlyOnce) {
  // The time of a change cannot be set back, so these are files that have been there for long.
  constexpr const char* kOld = "/etc/passwd";
  constexpr const char* kOther = "/etc/group";
  if (!isOld(kOld) || !isOld(kOther)) GTEST_SKIP() << kOld << " or " << kOther << " is missing or fresh";
  const rt::DefaultsFile file((folder_ / "link").string());
  fs::create_symlink(kOld, folder_ / "link");
  const rt::DefaultsFile::Version version = file.version();
  EXPECT_TRUE(file.isStill(version));
  fs::remove(folder_ / "link");
  EXPECT_FALSE(file.isStill(version));
  fs::create_symlink(kOther, folder_ / "link");
  EXPECT_FALSE(file.isStill(version));
  EXPECT_TRUE(file.isStill(file.version()));
}

TEST_F(DefaultsFile, ThatIsFreshIsReadAgain) {
  const rt::DefaultsFile file((folder_ / "file").string());
  std::ofstream(file.path()) << "a";
  EXPECT_FALSE(file.isStill(file.version()));
}

// File systems may count in steps of two seconds: what changes within one step has the same time twice.
TEST_F(DefaultsFile, IsFreshForTwoSeconds) {
  static time_t now;
  const rt::DefaultsFile file((folder_ / "file").string());
  std::ofstream(file.path()) << "a";
  struct stat status{};
  ASSERT_EQ(stat(file.path().c_str(), &status), 0);
  clockHook = [](clockid_t clock, timespec& time) {
    if (clock == CLOCK_REALTIME) time.tv_sec = now;
  };
  for (const int age : {0, 1, 2}) {
    now = status.st_ctime + age;
    EXPECT_FALSE(file.isStill(file.version())) << age;
  }
  now = status.st_ctime + 3;
  const rt::DefaultsFile::Version settled = file.version();
  clockHook = nullptr;
  EXPECT_TRUE(file.isStill(settled));
}

TEST_F(DefaultsFile, ThatIsMissingHasAVersion) {
  const rt::DefaultsFile file((folder_ / "file").string());
  EXPECT_FALSE(file.isStill(rt::DefaultsFile::Version()));
  const rt::DefaultsFile::Version version = file.version();
  EXPECT_TRUE(file.isStill(version));
  EXPECT_EQ(file.content(1), std::nullopt);
  std::ofstream(file.path()) << "ab";
  EXPECT_FALSE(file.isStill(version));
  EXPECT_EQ(file.content(2), "ab");
  EXPECT_THROW(file.content(1), std::system_error);
}

TEST_F(DefaultsFile, SaysWhatItCannotReadOrMake) {
  const auto errorOf = [](const auto& act) -> std::string {
    try {
      act();
    } catch (const std::system_error& error) {
      return error.what();
    }
    return "";
  };
  fs::create_symlink("loop", folder_ / "loop");
  const rt::DefaultsFile loop((folder_ / "loop").string());
  EXPECT_THAT(errorOf([&] { loop.content(1); }), testing::HasSubstr(loop.path()));
  EXPECT_FALSE(loop.isStill(loop.version()));
  std::ofstream(folder_ / "file") << "no folder";
  const rt::DefaultsFile below((folder_ / "file" / "folder" / "file").string());
  EXPECT_EQ(below.content(1), std::nullopt);
  EXPECT_THAT(errorOf([&] { below.lock(); }),
              testing::StartsWith("cannot make the folder " + (folder_ / "file" / "folder").string()));
}

TEST_F(DefaultsFile, IsReadAndReplacedWhole) {
  const rt::DefaultsFile file((folder_ / "file").string());
  for (const std::size_t size : {0U, 1U, 4095U, 4096U, 4097U, 100000U}) {
    const std::string content(size, 'x');
    file.replace(content);
    EXPECT_EQ(file.content(100000), content);
  }
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 1);
}

// The child has the lock's file open, too, and may never end.
TEST_F(DefaultsFile, IsUnlockedAlsoWhereAChildWasForkedMeanwhile) {
  const rt::DefaultsFile file((folder_ / "file").string());
  std::optional<rt::DefaultsFile::Lock> lock(file.lock());
  const pid_t child = fork();
  if (child == 0) {
    for (;;) pause();
  }
  const rt::FileDescriptor folder = rt::FileDescriptor::open(folder_.string(), O_RDONLY | O_DIRECTORY);
  EXPECT_NE(flock(folder.get(), LOCK_EX | LOCK_NB), 0);
  lock.reset();
  EXPECT_EQ(flock(folder.get(), LOCK_EX | LOCK_NB), 0);
  kill(child, SIGKILL);
  EXPECT_EQ(waitpid(child, nullptr, 0), child);
}

// After a loss of power the new name would stand for a file whose content had not been written, or the old
// one would still be there.
TEST_F(DefaultsFile, IsOnTheDiskBeforeItTakesItsNameAndSoIsTheName) {
  calls.clear();
  rt::DefaultsFile((folder_ / "file").string()).replace("content");
  EXPECT_THAT(calls, testing::ElementsAre("fsync of a file", "rename", "fsync of a folder"));
}

TEST_F(DefaultsFile, StaysWhereTheNewOneDoesNotReachTheDisk) {
  const rt::DefaultsFile file((folder_ / "file").string());
  file.replace("old");
  failingSync = 1;
  try {
    file.replace("new");
    FAIL() << "nobody was told";
  } catch (const std::system_error& error) {
    EXPECT_EQ(error.code().value(), EIO);
    EXPECT_THAT(error.what(), testing::HasSubstr(file.path()));
  }
  EXPECT_EQ(file.content(100), "old");
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 1) << "nothing is left of the new one";
}

// It has been replaced by then.
TEST_F(DefaultsFile, IsReplacedWhereItsFolderDoesNotReachTheDisk) {
  const rt::DefaultsFile file((folder_ / "file").string());
  file.replace("old");
  failingSync = 2;
  EXPECT_NO_THROW(file.replace("new"));
  EXPECT_EQ(failingSync, 0);
  EXPECT_EQ(file.content(100), "new");
}

TEST_F(DefaultsFile, KeepsAllBitsOfItsMode) {
  const rt::DefaultsFile file((folder_ / "file").string());
  file.replace("old");
  for (const mode_t mode : {04640U, 02604U, 01600U, 0600U}) {
    ASSERT_EQ(chmod(file.path().c_str(), mode), 0);
    file.replace("new");
    struct stat status{};
    ASSERT_EQ(stat(file.path().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777U, mode);
  }
}

}  // namespace
