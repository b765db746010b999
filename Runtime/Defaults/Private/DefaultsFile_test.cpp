// Behaviour that the tests of Runtime/Defaults/UserDefaults.h do not reach.
#include "Runtime/Defaults/Private/DefaultsFile.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstddef>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <string>
#include <system_error>

#include "tests/support/ClockHook.h"

namespace {

namespace fs = std::filesystem;

class DefaultsFile : public testing::Test {
 protected:
  DefaultsFile() {
    std::string folder = testing::TempDir() + "defaults-file.XXXXXX";
    if (mkdtemp(folder.data()) == nullptr) throw std::runtime_error("no temporary folder");
    folder_ = folder;
  }
  ~DefaultsFile() override { fs::remove_all(folder_); }

  // Returns whether the file is older than the step of any file system's clock.
  static bool isOld(const char* path) {
    struct stat status{};
    return stat(path, &status) == 0 && status.st_mtime + 10 < time(nullptr);
  }

  fs::path folder_;
};

TEST_F(DefaultsFile, ReadsAnOldFileOnlyOnce) {
  // The time of a change cannot be set back, so the test uses files that have existed for long.
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

TEST_F(DefaultsFile, ReadsAFreshFileAgain) {
  const rt::DefaultsFile file((folder_ / "file").string());
  std::ofstream(file.path()) << "a";
  EXPECT_FALSE(file.isStill(file.version()));
}

// The clock of a file system may have steps of two seconds. Two changes within one step have the same time.
TEST_F(DefaultsFile, CountsAsFreshForTwoSeconds) {
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

TEST_F(DefaultsFile, HasAVersionForAMissingFile) {
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

TEST_F(DefaultsFile, NamesTheFileThatItCannotRead) {
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
}

TEST_F(DefaultsFile, ReadsTheWholeFile) {
  const rt::DefaultsFile file((folder_ / "file").string());
  for (const std::size_t size : {0U, 1U, 4095U, 4096U, 4097U, 100000U}) {
    const std::string content(size, 'x');
    std::ofstream(file.path()) << content;
    EXPECT_EQ(file.content(100000), content);
  }
}

}  // namespace
