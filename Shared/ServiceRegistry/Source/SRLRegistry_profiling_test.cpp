// What a registry measures. SWITCH_ANSWER says whether profiling is on in this program.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>

#include "Runtime/Values/Number.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingMeasurement.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPProfilingSwitch.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLPServiceInitializationNewInstanceEvent.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"
#include "tests/support/TestServices.h"

bool SRLPProfilingSwitch() {
  return SWITCH_ANSWER;
}

namespace {

using namespace TestServices;
using rt::Ref;

class SRLRegistryProfiling : public ServicesTest {
 protected:
  // Returns the new events since the last call. The whole process shares one storage.
  std::vector<Ref<SRLPServiceInitializationEvent>> newEvents() {
    std::vector<Ref<SRLPServiceInitializationEvent>> events;
    const Ref<rt::Array> all = SRLProfilingStorage::sharedInstance()->serviceInitializationEvents();
    // The latest come first.
    for (std::size_t i = 0; i + seen < all->count(); ++i) {
      events.emplace_back(all->at<SRLPServiceInitializationEvent>(i));
    }
    seen = all->count();
    return events;
  }
  static std::uint64_t freshOnes() {
    std::uint64_t count = 0;
    const Ref<rt::Array> all =
        SRLProfilingStorage::sharedInstance()->serviceInitializationNewInstanceEvents();
    for (const Ref<rt::Object>& event : *all) {
      count += rt::cast<SRLPServiceInitializationNewInstanceEvent>(event.get())->initializationCount();
    }
    return count;
  }

  std::size_t seen = SRLProfilingStorage::sharedInstance()->serviceInitializationEvents()->count();
};

constexpr std::size_t kOne = SWITCH_ANSWER ? 1 : 0;

TEST_F(SRLRegistryProfiling, MeasuresAScopedInstanceOnce) {
  registry->internalService(&scopedAPI, tags);
  const auto events = newEvents();
  ASSERT_EQ(events.size(), kOne);
  if (SWITCH_ANSWER) {
    EXPECT_EQ(events[0]->apiDescription(), "Scoped");
    EXPECT_TRUE(events[0]->implDescription().contains("identifier: ScopedThing"));
    EXPECT_FALSE(events[0]->parentImplDescription());
  }
  // Requests for an existing instance are not recorded.
  registry->internalService(&scopedAPI, tags);
  registry->internalOptionalService(&scopedAPI, tags);
  EXPECT_EQ(newEvents().size(), 0U);
  EXPECT_EQ(SRLPProfilingDetail::countOfStacks(), 0U);
}

TEST_F(SRLRegistryProfiling, RecordsTheParentOfAService) {
  registry->internalService(&nestedAPI, tags);
  const auto events = newEvents();
  ASSERT_EQ(events.size(), 2 * kOne);
  if (SWITCH_ANSWER) {
    EXPECT_EQ(events[0]->apiDescription(), "Nested");
    EXPECT_FALSE(events[0]->parentImplDescription());
    EXPECT_EQ(events[1]->apiDescription(), "Scoped");
    EXPECT_EQ(events[1]->parentImplDescription(), "Nest");
  }
}

TEST_F(SRLRegistryProfiling, CountsNewInstances) {
  const std::uint64_t before = freshOnes();
  for (int i = 0; i < 3; ++i) registry->internalService(&freshAPI, tags);
  registry->internalOptionalService(&freshAPI, tags);
  EXPECT_EQ(freshOnes() - before, 4 * kOne);
  EXPECT_EQ(newEvents().size(), 0U);
}

TEST_F(SRLRegistryProfiling, MeasuresEachInstanceOfAMultiBoundAPI) {
  const std::uint64_t before = freshOnes();
  registry->internalMultiBoundService(&manyAPI, tags);
  registry->internalMultiBoundService(&manyAPI, tags);
  // A scoped instance and a null are made once. Another instance is made twice.
  EXPECT_EQ(newEvents().size(), 2 * kOne);
  EXPECT_EQ(freshOnes() - before, 2 * kOne);
}

// A null that was made before is not new. Neither is an instance that a copy finds in the shared registry.
TEST_F(SRLRegistryProfiling, DoesNotRecordExistingInstances) {
  const Ref<SRLRegistry> copy = registry->mutableCopy();
  const auto ask = [&] {
    registry->internalOptionalService(&nullAPI, {});
    registry->internalMultiBoundService(&manyAPI, tags);
    copy->internalService(&scopedAPI, tags);
  };
  ask();
  EXPECT_EQ(newEvents().size(), 2 * kOne);
  ask();
  EXPECT_EQ(newEvents().size(), 0U);
  EXPECT_EQ(SRLPProfilingDetail::countOfStacks(), 0U);
}

TEST_F(SRLRegistryProfiling, DoesNotRecordAFactoryThatThrows) {
  EXPECT_THROW(registry->internalService(&throwingAPI, {}), Failure);
  EXPECT_EQ(SRLPProfilingDetail::countOfStacks(), 0U);
  EXPECT_EQ(newEvents().size(), 0U);
}

}  // namespace
