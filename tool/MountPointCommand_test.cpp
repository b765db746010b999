#include "MountPointCommand.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace {

// A parent may start a program without any arguments, not even its name. Newer kernels then add an empty
// name. So only a direct call shows that no argument is read beyond the end.
TEST(MountPointCommandTest, ReadsNoArgumentBeyondTheEnd) {
  testing::internal::CaptureStderr();
  EXPECT_EQ(runMountPointCommand(0, nullptr), EINVAL);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "No subdirectory specified.\n");
}

TEST(MountPointCommandTest, ReportsANameWithASlashWithoutALineFeed) {
  const char* const arguments[] = {"mount-point", "a/b", "--remove", nullptr};
  testing::internal::CaptureStderr();
  EXPECT_EQ(runMountPointCommand(3, arguments), EINVAL);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "The specified subdirectory is not valid: a/b");
}

}  // namespace
