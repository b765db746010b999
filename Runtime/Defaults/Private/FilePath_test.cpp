#include "Runtime/Defaults/Private/FilePath.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdlib>
#include <string>

namespace {

TEST(FilePath, FindsTheFolderOfAPath) {
  EXPECT_EQ(rt::folderOf("/a/b/c"), "/a/b");
  EXPECT_EQ(rt::folderOf("/a"), "/");
  EXPECT_EQ(rt::folderOf("/"), "/");
}

TEST(FilePath, FollowsSymbolicLinks) {
  std::string folder = testing::TempDir() + "FilePath.XXXXXX";
  ASSERT_NE(mkdtemp(folder.data()), nullptr);
  const std::string link = folder + "/link";
  ASSERT_EQ(symlink("/", link.c_str()), 0);
  EXPECT_EQ(rt::resolvedPath(link), "/");
  EXPECT_EQ(unlink(link.c_str()), 0);
  EXPECT_EQ(rmdir(folder.c_str()), 0);
}

TEST(FilePath, LeavesAnUnresolvablePathUnchanged) {
  EXPECT_EQ(rt::resolvedPath("/missing/b"), "/missing/b");
}

}  // namespace
