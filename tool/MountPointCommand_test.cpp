#include "MountPointCommand.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace {

// A parent may start a program with no arguments at all, not even its name. Newer kernels add an
// empty name, so only a direct call shows that such a command line is read no further than it goes.
TEST(MountPointCommandTest, ReadsNoArgumentWhereThereIsNone) {
  testing::internal::CaptureStderr();
  EXPECT_EQ(runMountPointCommand(0, nullptr), EINVAL);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "No subdirectory specified.\n");
}

TEST(MountPointCommandTest, ReportsANameWithASlashWithoutANewline) {
  const char* const arguments[] = {"mount-point", "a/b", "--remove", nullptr};
  testing::internal::CaptureStderr();
  EXPECT_EQ(runMountPointCommand(3, arguments), EINVAL);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "The specified subdirectory is not valid: a/b");
}

}  // namespace
