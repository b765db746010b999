#include <gtest/gtest.h>

#include "tests/support/Process.h"

namespace {

TEST(Clash, IsReportedOnceForEachNameAndKeepsTheFirst) {
  const ProcessResult result = runProcess({CLASH});
  EXPECT_EQ(result.exitStatus, 0);
  EXPECT_EQ(result.standardOutput, "2\n");
  std::string errors = result.standardError;
  for (const char* line : {"rt: two classes are called \"Three\"; the first is kept\n",
                           "rt: two classes are called \"Two\"; the first is kept\n",
                           "rt: two protocols are called \"P\"; the first is kept\n"}) {
    const std::size_t place = errors.find(line);
    ASSERT_NE(place, std::string::npos) << line << "is not in:\n" << result.standardError;
    errors.erase(place, std::string(line).size());
  }
  EXPECT_EQ(errors, "");
}

}  // namespace
