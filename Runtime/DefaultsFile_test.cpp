// What the tests of Runtime/UserDefaults.h do not reach.
#include "Runtime/DefaultsFile.h"

#include <gtest/gtest.h>

#include <ctime>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <system_error>

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

TEST_F(DefaultsFile, IsReadAndReplacedWhole) {
  const rt::DefaultsFile file((folder_ / "file").string());
  for (const std::size_t size : {0U, 1U, 4095U, 4096U, 4097U, 100000U}) {
    const std::string content(size, 'x');
    file.replace(content);
    EXPECT_EQ(file.content(100000), content);
  }
  EXPECT_EQ(std::distance(fs::directory_iterator(folder_), {}), 1);
}

}  // namespace
