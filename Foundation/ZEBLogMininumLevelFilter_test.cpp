#include "Foundation/ZEBLogMininumLevelFilter.h"

#include <gtest/gtest.h>

#include <climits>

namespace {

using namespace rt::literals;

TEST(ZEBLogMininumLevelFilter, AllowsItsLevelAndHigherOnes) {
  for (ZEBLogLevel minimum = 0; minimum <= 4; ++minimum) {
    const auto filter = ZEBLogMininumLevelFilter::initWithMinimumLevel(minimum);
    ASSERT_TRUE(filter) << minimum;
    for (ZEBLogLevel level = -1; level <= 6; ++level) {
      EXPECT_EQ(filter->filterAllowsMessage("line"_s, level), level >= minimum && level <= 4)
          << minimum << " " << level;
    }
  }
}

TEST(ZEBLogMininumLevelFilter, IsNullForUnknownLevels) {
  for (const ZEBLogLevel minimum : {INT_MIN, -1, 5, 6, INT_MAX}) {
    EXPECT_FALSE(ZEBLogMininumLevelFilter::initWithMinimumLevel(minimum)) << minimum;
  }
}

TEST(ZEBLogMininumLevelFilter, KeepsTheSpellingOfItsName) {
  EXPECT_EQ(rt::classNamed("ZEBLogMininumLevelFilter"), &rt::classInfo<ZEBLogMininumLevelFilter>());
  EXPECT_EQ(rt::classNamed("ZEBLogMinimumLevelFilter"), nullptr);
  EXPECT_TRUE(
      rt::classInfo<ZEBLogMininumLevelFilter>().isSubclassOf(rt::classInfo<ZEBLogAllowedLevelFilter>()));
}

}  // namespace
