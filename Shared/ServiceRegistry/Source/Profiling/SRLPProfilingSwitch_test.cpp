// The switch in a program that does not define it: it returns what the build was configured with.

#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"

#include <gtest/gtest.h>

#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingEnabled.h"

namespace {

TEST(SRLPProfilingSwitch, ReturnsWhatTheBuildWasConfiguredWith) {
  EXPECT_EQ(SRLPProfilingSwitch(), MOUNT_POINT_PROFILING != 0);
  EXPECT_EQ(SRLPProfilingEnabled(), MOUNT_POINT_PROFILING != 0);
}

}  // namespace
