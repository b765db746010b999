#include "Foundation/ZEBLogNoFilter.h"

#include <gtest/gtest.h>

#include <climits>

namespace {

using namespace rt::literals;

TEST(ZEBLogNoFilter, AllowsEverything) {
  const auto filter = rt::make<ZEBLogNoFilter>();
  for (const ZEBLogLevel level : {INT_MIN, -1, 0, 1, 2, 3, 4, 5, INT_MAX}) {
    EXPECT_TRUE(filter->filterAllowsMessage("line"_s, level)) << level;
    EXPECT_TRUE(filter->filterAllowsMessage(nullptr, level)) << level;
  }
}

TEST(ZEBLogNoFilter, DoesNothingWhenAttachedAndDetached) {
  const auto filter = rt::make<ZEBLogNoFilter>();
  filter->willDetachFromLogger();
  filter->didAttachToLogger();
}

}  // namespace
