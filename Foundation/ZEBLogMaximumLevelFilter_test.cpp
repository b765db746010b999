#include "Foundation/ZEBLogMaximumLevelFilter.h"

#include <gtest/gtest.h>

#include <climits>

namespace {

using namespace rt::literals;

TEST(ZEBLogMaximumLevelFilter, AllowsItsLevelAndLowerOnes) {
  for (ZEBLogLevel maximum = 0; maximum <= 4; ++maximum) {
    const auto filter = ZEBLogMaximumLevelFilter::initWithMaximumLevel(maximum);
    ASSERT_TRUE(filter) << maximum;
    for (ZEBLogLevel level = -1; level <= 6; ++level) {
      EXPECT_EQ(filter->filterAllowsMessage("line"_s, level), level >= 0 && level <= maximum)
          << maximum << " " << level;
    }
  }
}

TEST(ZEBLogMaximumLevelFilter, IsNullForUnknownLevels) {
  for (const ZEBLogLevel maximum : {INT_MIN, -1, 5, 6, INT_MAX}) {
    EXPECT_FALSE(ZEBLogMaximumLevelFilter::initWithMaximumLevel(maximum)) << maximum;
  }
}

}  // namespace
