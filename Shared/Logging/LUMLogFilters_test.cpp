// Tests all filters except the one that reads the environment, which has its own test.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <stdexcept>
#include <vector>

#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogComponentFilter.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogLogicalAndFilter.h"
#include "Shared/Logging/LUMLogLogicalOrFilter.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Array;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::uint64_t kHighest = std::numeric_limits<std::uint64_t>::max();

const std::vector<LUMLogLevel> kLevels = {0, 1, 2, 3, 4, 5, kHighest};

// Returns which of the levels above `filter` lets pass.
std::vector<LUMLogLevel> levelsThrough(const LUMLogFilter& filter) {
  std::vector<LUMLogLevel> passed;
  for (const LUMLogLevel level : kLevels) {
    if (filter.allowLogMessage(*messageWith(level))) passed.push_back(level);
  }
  return passed;
}

TEST(LUMLogNoFilter, LetsEveryMessagePass) {
  EXPECT_EQ(levelsThrough(*LUMLogNoFilter::init()), kLevels);
}

TEST(LUMLogDropAllFilter, LetsNoMessagePass) {
  EXPECT_THAT(levelsThrough(*LUMLogDropAllFilter::init()), IsEmpty());
}

TEST(LUMLogMinimumLevelFilter, LetsItsLevelAndHigherOnesPass) {
  EXPECT_EQ(levelsThrough(*LUMLogMinimumLevelFilter::initWithMinimumLevel(0)), kLevels);
  EXPECT_THAT(levelsThrough(*LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelDebug)),
              ElementsAre(1, 2, 3, 4, 5, kHighest));
  EXPECT_THAT(levelsThrough(*LUMLogMinimumLevelFilter::initWithMinimumLevel(LUMLogLevelFault)),
              ElementsAre(4, 5, kHighest));
}

// All 64 bits count, and none is a sign.
TEST(LUMLogMinimumLevelFilter, ComparesLevelsAsUnsigned) {
  EXPECT_THAT(levelsThrough(*LUMLogMinimumLevelFilter::initWithMinimumLevel(kHighest)),
              ElementsAre(kHighest));
  EXPECT_THAT(levelsThrough(*LUMLogMinimumLevelFilter::initWithMinimumLevel(std::uint64_t{1} << 32U)),
              ElementsAre(kHighest));
}

bool importerPasses(const Ref<LUMLogMetadata>& metadata) {
  return LUMLogComponentFilter::initWithComponent("Importer"_s)
      ->allowLogMessage(*messageWith(LUMLogLevelInfo, "x"_s, metadata));
}

TEST(LUMLogComponentFilter, LetsTheMessagesOfItsComponentPass) {
  EXPECT_TRUE(importerPasses(LUMLogMetadata::metadataWithComponent("Importer"_s)));
  EXPECT_TRUE(importerPasses(LUMLogMetadata::metadataWithComponent(rt::String::fromUTF8("Importer"))));
  EXPECT_TRUE(importerPasses(
      LUMLogMetadata::metadataWithComponent("Importer"_s)->metadataByAddingCategory("network"_s)));
}

TEST(LUMLogComponentFilter, RefusesOtherComponents) {
  EXPECT_FALSE(importerPasses(LUMLogMetadata::metadataWithComponent("importer"_s)));
  EXPECT_FALSE(importerPasses(LUMLogMetadata::metadataWithComponent("Importer.Network"_s)));
  EXPECT_FALSE(importerPasses(LUMLogMetadata::metadataWithComponent("Import"_s)));
  EXPECT_FALSE(importerPasses(LUMLogMetadata::metadataWithComponent(""_s)));
  EXPECT_FALSE(importerPasses(LUMLogMetadata::init()->metadataByAddingCategory("Importer"_s)));
}

TEST(LUMLogComponentFilter, RefusesMessagesWithoutAComponent) {
  EXPECT_FALSE(importerPasses(nullptr));
  EXPECT_FALSE(importerPasses(LUMLogMetadata::init()));
  EXPECT_FALSE(importerPasses(
      LUMLogMetadata::init()->messageWithKey(LUMLogMetadata::kComponentKey, rt::Number::of(1))));
}

TEST(LUMLogComponentFilter, DistinguishesAnEmptyComponentFromNone) {
  const Ref<LUMLogComponentFilter> filter = LUMLogComponentFilter::initWithComponent(""_s);
  EXPECT_TRUE(filter->allowLogMessage(
      *messageWith(LUMLogLevelInfo, "x"_s, LUMLogMetadata::metadataWithComponent(""_s))));
  EXPECT_FALSE(filter->allowLogMessage(*messageWith(LUMLogLevelInfo)));
  EXPECT_FALSE(filter->allowLogMessage(*messageWith(LUMLogLevelInfo, "x"_s, LUMLogMetadata::init())));
}

TEST(LUMLogComponentFilter, RefusesAllIfItsComponentIsNull) {
  const Ref<LUMLogComponentFilter> filter = LUMLogComponentFilter::initWithComponent(nullptr);
  EXPECT_FALSE(filter->allowLogMessage(*messageWith(LUMLogLevelInfo)));
  EXPECT_FALSE(filter->allowLogMessage(*messageWith(LUMLogLevelInfo, "x"_s, LUMLogMetadata::init())));
  EXPECT_FALSE(filter->allowLogMessage(
      *messageWith(LUMLogLevelInfo, "x"_s, LUMLogMetadata::metadataWithComponent(""_s))));
}

// Records which filters were asked about one message.
class LogicalFilterTest : public testing::Test {
 protected:
  Ref<LUMLogFilter> answering(const char* name, bool answer) {
    return rt::make<TestFilter>([this, name, answer](const LUMLogMessage& message) {
      EXPECT_EQ(&message, message_.get());
      trace_.add(name);
      return answer;
    });
  }
  Ref<LUMLogFilter> yes(const char* name) { return answering(name, true); }
  Ref<LUMLogFilter> no(const char* name) { return answering(name, false); }

  bool allOf(const Ref<Array>& filters) {
    return LUMLogLogicalAndFilter::initWithFilters(filters)->allowLogMessage(*message_);
  }
  bool anyOf(const Ref<Array>& filters) {
    return LUMLogLogicalOrFilter::initWithFilters(filters)->allowLogMessage(*message_);
  }

  const Ref<LUMLogMessage> message_ = messageWith(LUMLogLevelInfo, "x"_s);
  Trace trace_;
};

using LUMLogLogicalAndFilterTest = LogicalFilterTest;
using LUMLogLogicalOrFilterTest = LogicalFilterTest;

TEST_F(LUMLogLogicalAndFilterTest, AsksAllFiltersInOrderAndLetsPassWhatAllLetPass) {
  EXPECT_TRUE(allOf(Array::of(yes("a"), yes("b"), yes("c"))));
  EXPECT_THAT(trace_.events(), ElementsAre("a", "b", "c"));
}

TEST_F(LUMLogLogicalAndFilterTest, StopsAtTheFirstRefusal) {
  EXPECT_FALSE(allOf(Array::of(yes("a"), no("b"), yes("c"), no("d"))));
  EXPECT_THAT(trace_.events(), ElementsAre("a", "b"));
}

// Deliberately unlike the "and" of logic.
TEST_F(LUMLogLogicalAndFilterTest, RefusesAllWithoutFilters) {
  EXPECT_FALSE(allOf(Array::of()));
  EXPECT_FALSE(allOf(nullptr));
}

TEST_F(LUMLogLogicalAndFilterTest, RefusesIfAnElementIsNotAFilter) {
  EXPECT_FALSE(allOf(Array::of(yes("a"), "no filter"_s)));
}

TEST_F(LUMLogLogicalAndFilterTest, ThrowsWhatAFilterThrows) {
  EXPECT_THROW(allOf(Array::of(yes("a"), rt::make<TestFilter>([](const LUMLogMessage&) -> bool {
                                 throw std::runtime_error("from a filter");
                               }))),
               std::runtime_error);
}

TEST_F(LUMLogLogicalOrFilterTest, StopsAtTheFirstFilterThatLetsPass) {
  EXPECT_TRUE(anyOf(Array::of(no("a"), yes("b"), no("c"), yes("d"))));
  EXPECT_THAT(trace_.events(), ElementsAre("a", "b"));
}

TEST_F(LUMLogLogicalOrFilterTest, AsksAllFiltersInOrderAndRefusesWhatAllRefuse) {
  EXPECT_FALSE(anyOf(Array::of(no("a"), no("b"), no("c"))));
  EXPECT_THAT(trace_.events(), ElementsAre("a", "b", "c"));
}

TEST_F(LUMLogLogicalOrFilterTest, RefusesAllWithoutFilters) {
  EXPECT_FALSE(anyOf(Array::of()));
  EXPECT_FALSE(anyOf(nullptr));
}

TEST_F(LUMLogLogicalOrFilterTest, SkipsElementsThatAreNotFilters) {
  EXPECT_FALSE(anyOf(Array::of("no filter"_s)));
  EXPECT_TRUE(anyOf(Array::of("no filter"_s, yes("a"))));
}

TEST_F(LUMLogLogicalOrFilterTest, ThrowsWhatAFilterThrows) {
  EXPECT_THROW(anyOf(Array::of(no("a"), rt::make<TestFilter>([](const LUMLogMessage&) -> bool {
                                 throw std::runtime_error("from a filter");
                               }))),
               std::runtime_error);
}

TEST_F(LogicalFilterTest, MayBeNested) {
  const auto either = LUMLogLogicalOrFilter::initWithFilters(Array::of(no("a"), yes("b")));
  EXPECT_TRUE(allOf(Array::of(either, yes("c"))));
  EXPECT_THAT(trace_.events(), ElementsAre("a", "b", "c"));
  EXPECT_FALSE(allOf(Array::of(either, LUMLogLogicalAndFilter::initWithFilters(Array::of()))));
}

}  // namespace
