#include "Shared/Logging/LUMLogScope.h"

#include <gtest/gtest.h>

#include <thread>

#include "Runtime/Queues/Queue.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogLevels.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Ref;

Ref<rt::Object> property(const Ref<LUMLogMetadata>& metadata, const char* key) {
  return metadata ? metadata->propertyForKey(rt::String::fromUTF8(key)) : nullptr;
}

rt::String stringOf(const Ref<LUMLogMetadata>& metadata, const char* key) {
  return rt::String::from(property(metadata, key).get());
}

Ref<LUMLogMetadata> metadataOf(const Ref<LUMLogMessage>& message) {
  return message->logMetadata();
}

class LUMLogScopeTest : public testing::Test {
 protected:
  LUMLogScopeTest() { LUMLogMultiplexer::sharedInstance()->addSyncLogger(logger_); }
  ~LUMLogScopeTest() override { LUMLogMultiplexer::sharedInstance()->removeSyncLogger(logger_); }

  Ref<LUMLogMessage> last_;
  const Ref<TestSyncLogger> logger_ =
      rt::make<TestSyncLogger>([this](const Ref<LUMLogMessage>& message) { last_ = message; });
};

TEST_F(LUMLogScopeTest, ThereIsNoneAtFirst) {
  EXPECT_FALSE(LUMLogScope::current());
  EXPECT_FALSE(LUMLogScope::metadataWith(nullptr));
  EXPECT_FALSE(metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)));
}

TEST_F(LUMLogScopeTest, AddsItsFieldsToEachMessage) {
  {
    const LUMLogScope scope(LUMLogField("request", 7), LUMLogField("user", "ann"_s));
    const Ref<LUMLogMetadata> metadata = metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s));
    EXPECT_TRUE(rt::isEqual(property(metadata, "request"), rt::Number::of(7)));
    EXPECT_EQ(stringOf(metadata, "user"), "ann");
    EXPECT_EQ(metadata->properties()->count(), 2U);
    EXPECT_EQ(metadata, LUMLogScope::current());
  }
  EXPECT_FALSE(metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)));
}

TEST_F(LUMLogScopeTest, ReachesTheFunctionForGeneratedCode) {
  const LUMLogScope scope(LUMLogField("request", 7));
  const Ref<LUMLogMessage> message =
      LUMLog(LUMLogLevelInfo, "file.cpp", "function", 1, nullptr, 0, nullptr, "text"_s);
  EXPECT_TRUE(rt::isEqual(property(metadataOf(message), "request"), rt::Number::of(7)));
}

TEST_F(LUMLogScopeTest, TakesMetadata) {
  const Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  {
    const LUMLogScope scope(importer);
    EXPECT_EQ(metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)), importer);
  }
  const LUMLogScope scope(importer, LUMLogField("n", 1));
  const Ref<LUMLogMetadata> metadata = metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s));
  EXPECT_EQ(metadata->component(), "Importer");
  EXPECT_TRUE(rt::isEqual(property(metadata, "n"), rt::Number::of(1)));
}

TEST_F(LUMLogScopeTest, MayBeOfNothing) {
  const LUMLogScope scope(Ref<LUMLogMetadata>{});
  EXPECT_FALSE(metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)));
}

// What is nearer to the call replaces what is farther away.
TEST_F(LUMLogScopeTest, NestsAndTheCallHasTheLastWord) {
  const LUMLogScope outer(LUMLogField("a", "outer"_s), LUMLogField("b", "outer"_s),
                          LUMLogField("c", "outer"_s));
  {
    const LUMLogScope inner(LUMLogField("b", "inner"_s), LUMLogField("c", "inner"_s));
    const Ref<LUMLogMetadata> given = LUMLogMetadata::init()->messageWithKey("c"_s, "call"_s);
    const Ref<LUMLogMetadata> metadata = metadataOf(LUMLogAt(LUMLogLevelInfo, given, "text"_s));
    EXPECT_EQ(stringOf(metadata, "a"), "outer");
    EXPECT_EQ(stringOf(metadata, "b"), "inner");
    EXPECT_EQ(stringOf(metadata, "c"), "call");
    EXPECT_EQ(given->properties()->count(), 1U);
  }
  EXPECT_EQ(stringOf(metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)), "b"), "outer");
}

TEST_F(LUMLogScopeTest, JoinsTheFieldsOfACall) {
  const LUMLogScope scope(LUMLogField("a", "scope"_s), LUMLogField("b", "scope"_s));
  const Ref<LUMLogMetadata> metadata =
      metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s, LUMLogField("b", "call"_s)));
  EXPECT_EQ(stringOf(metadata, "a"), "scope");
  EXPECT_EQ(stringOf(metadata, "b"), "call");
}

TEST_F(LUMLogScopeTest, BelongsToItsThreadAndToTheTasksThatItQueues) {
  const Ref<rt::Queue> queue = rt::make<rt::Queue>("LUMLogScope_test"_s);
  Ref<LUMLogMetadata> ofThread;
  Ref<LUMLogMetadata> ofTask;
  Ref<LUMLogMetadata> current;
  {
    const LUMLogScope scope(LUMLogField("request", 7));
    current = LUMLogScope::current();
    std::thread([&] { ofThread = metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)); }).join();
    queue->async([&] { ofTask = metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s)); });
  }
  queue->barrierSync();
  EXPECT_FALSE(ofThread);
  EXPECT_EQ(ofTask, current);
  std::thread([&] {
    const LUMLogScope scope(current);
    ofThread = metadataOf(LUMLogAt(LUMLogLevelInfo, "text"_s));
  }).join();
  EXPECT_EQ(ofThread, current);
}

// A message without metadata of its own was refused by the level of messages without a component.
TEST_F(LUMLogScopeTest, MayNameTheComponentThatIsWanted) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  ASSERT_FALSE(levels->setText("error,Importer=debug"_s));
  LUMLogMultiplexer::sharedInstance()->addLogFilter(levels);
  const Ref<LUMLogMetadata> category = LUMLogMetadata::init()->metadataByAddingCategory("network"_s);
  const Ref<LUMLogMetadata> other = LUMLogMetadata::metadataWithComponent("Other"_s);
  EXPECT_FALSE(LUMLogAt(LUMLogLevelDebug, "refused"_s));
  {
    const LUMLogScope scope(LUMLogField("LUMLogMetadataComponent", "Importer"_s));
    LUMLogAt(LUMLogLevelDebug, "wanted"_s);
    ASSERT_TRUE(last_);
    EXPECT_EQ(last_->formattedString(), "wanted");
    LUMLogAt(LUMLogLevelDebug, category, "with a category"_s);
    EXPECT_EQ(last_->formattedString(), "with a category");
    LUMLogAt(LUMLogLevelDebug, other, "of another component"_s);
    EXPECT_EQ(last_->formattedString(), "with a category");
  }
  {
    const LUMLogScope scope(other);
    EXPECT_FALSE(LUMLogAt(LUMLogLevelDebug, "refused"_s));
  }
  LUMLogMultiplexer::sharedInstance()->removeLogFilter(levels);
}

TEST_F(LUMLogScopeTest, CostsNoAllocationForAMessageWithoutMetadata) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const auto allocationsOfAMessage = [] {
    LUMLogAt(LUMLogLevelInfo, "text"_s);
    const AllocationCount count;
    LUMLogAt(LUMLogLevelInfo, "text"_s);
    return count.allocations();
  };
  const auto without = allocationsOfAMessage();
  const LUMLogScope scope(LUMLogField("request", 7));
  EXPECT_EQ(allocationsOfAMessage(), without);
}

}  // namespace
