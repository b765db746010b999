#include "Runtime/Defaults/Private/FilePath.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <system_error>

namespace {

class FilePathTest : public testing::Test {
 protected:
  FilePathTest() : before_(rt::absolutePath("")) {
    std::string name = testing::TempDir() + "FilePathTest.XXXXXX";
    folder_ = rt::resolvedPath(mkdtemp(name.data()));
    EXPECT_EQ(chdir(folder_.c_str()), 0);
  }
  ~FilePathTest() override {
    EXPECT_EQ(chdir(before_.c_str()), 0);
    rmdir(folder_.c_str());
  }

  std::string before_;
  std::string folder_;
};

TEST_F(FilePathTest, LeavesAPathFromTheRootAsItIs) {
  EXPECT_EQ(rt::absolutePath("/a/../b"), "/a/../b");
}

TEST_F(FilePathTest, BeginsARelativePathWithTheWorkingFolder) {
  EXPECT_EQ(rt::absolutePath("a/b"), folder_ + "/a/b");
  ASSERT_EQ(chdir("/"), 0);
  EXPECT_EQ(rt::absolutePath("a/b"), "/a/b");
}

TEST_F(FilePathTest, ThrowsWhereTheWorkingFolderIsGone) {
  ASSERT_EQ(rmdir(folder_.c_str()), 0);
  EXPECT_EQ(rt::absolutePath("/a"), "/a");
  EXPECT_THROW(rt::absolutePath("a"), std::system_error);
}

TEST_F(FilePathTest, FindsTheFolderOfAPath) {
  EXPECT_EQ(rt::folderOf("/a/b/c"), "/a/b");
  EXPECT_EQ(rt::folderOf("a/b"), "a");
  EXPECT_EQ(rt::folderOf("/a"), "/");
  EXPECT_EQ(rt::folderOf("/"), "/");
  EXPECT_EQ(rt::folderOf("a"), ".");
}

TEST_F(FilePathTest, FollowsSymbolicLinks) {
  ASSERT_EQ(symlink("/", "link"), 0);
  EXPECT_EQ(rt::resolvedPath("link"), "/");
  EXPECT_EQ(unlink("link"), 0);
}

TEST_F(FilePathTest, LeavesAPathThatCannotBeFollowedAsItIs) {
  EXPECT_EQ(rt::resolvedPath("missing/b"), "missing/b");
}

}  // namespace
