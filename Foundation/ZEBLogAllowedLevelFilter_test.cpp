#include "Foundation/ZEBLogAllowedLevelFilter.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <climits>
#include <vector>

namespace {

using namespace rt::literals;
using testing::ElementsAre;

std::vector<ZEBLogLevel> allowedBy(ZEBLogFilter& filter) {
  std::vector<ZEBLogLevel> levels;
  for (const ZEBLogLevel level : {INT_MIN, -1, 0, 1, 2, 3, 4, 5, 6, INT_MAX}) {
    if (filter.filterAllowsMessage("line"_s, level)) levels.push_back(level);
  }
  return levels;
}

TEST(ZEBLogAllowedLevelFilter, AllowsTheLevelsOfItsSet) {
  EXPECT_THAT(allowedBy(*ZEBLogAllowedLevelFilter::initWithAllowedLevels({1, 3})), ElementsAre(1, 3));
  EXPECT_THAT(allowedBy(*ZEBLogAllowedLevelFilter::initWithAllowedLevels({0})), ElementsAre(0));
  EXPECT_THAT(allowedBy(*ZEBLogAllowedLevelFilter::initWithAllowedLevels({4, 0, 4})), ElementsAre(0, 4));
}

TEST(ZEBLogAllowedLevelFilter, AllowsAllLevelsWithoutASet) {
  EXPECT_THAT(allowedBy(*ZEBLogAllowedLevelFilter::init()), ElementsAre(0, 1, 2, 3, 4));
}

TEST(ZEBLogAllowedLevelFilter, IsNullWithoutLevelsOrWithUnknownOnes) {
  EXPECT_FALSE(ZEBLogAllowedLevelFilter::initWithAllowedLevels({}));
  EXPECT_FALSE(ZEBLogAllowedLevelFilter::initWithAllowedLevels({5}));
  EXPECT_FALSE(ZEBLogAllowedLevelFilter::initWithAllowedLevels({0, 5}));
  EXPECT_FALSE(ZEBLogAllowedLevelFilter::initWithAllowedLevels({INT_MAX, 1}));
  EXPECT_FALSE(ZEBLogAllowedLevelFilter::initWithAllowedLevels({-1, 1}));
}

}  // namespace
