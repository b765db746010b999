// Tests which system logger replaces which.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "tests/support/LUMLogMultiplexerTest.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

class LUMLogMultiplexerSystemLoggerTest : public LUMLogMultiplexerTest {
 protected:
  std::vector<std::string> heard() {
    systemMultiplexer_->logWithMessage(messageWith(LUMLogLevelInfo, "x"_s));
    return trace_.events();
  }

  const Ref<LUMSystemLogger> first_ = system("first");
  const Ref<LUMLogMultiplexer> systemMultiplexer_ = LUMLogMultiplexer::initWithSystemLogger(first_);
};

TEST_F(LUMLogMultiplexerSystemLoggerTest, TheFirstAddedReplacesTheOriginal) {
  systemMultiplexer_->addSyncLogger(system("second"));
  EXPECT_THAT(heard(), ElementsAre("second"));
}

// Deliberate: only the original is replaced.
TEST_F(LUMLogMultiplexerSystemLoggerTest, TheSecondAddedReplacesNothing) {
  systemMultiplexer_->addSyncLogger(system("second"));
  systemMultiplexer_->addSyncLogger(system("third"));
  EXPECT_THAT(heard(), UnorderedElementsAre("second", "third"));
  systemMultiplexer_->addSyncLogger(system("fourth"));
  EXPECT_THAT(heard(), UnorderedElementsAre("second", "third", "fourth"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, OtherLoggersReplaceNothing) {
  systemMultiplexer_->addSyncLogger(sync("sync"));
  EXPECT_THAT(heard(), UnorderedElementsAre("first", "sync"));
  systemMultiplexer_->addSyncLogger(system("second"));
  EXPECT_THAT(heard(), UnorderedElementsAre("second", "sync"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, TheOriginalStaysForGoodIfAddedAgain) {
  systemMultiplexer_->addSyncLogger(first_);
  EXPECT_THAT(heard(), ElementsAre("first"));
  systemMultiplexer_->addSyncLogger(system("second"));
  EXPECT_THAT(heard(), UnorderedElementsAre("first", "second"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, TheOriginalStaysIfAddedAfterItsReplacement) {
  systemMultiplexer_->removeSyncLogger(first_);
  EXPECT_THAT(heard(), IsEmpty());
  systemMultiplexer_->addSyncLogger(system("second"));
  systemMultiplexer_->addSyncLogger(first_);
  EXPECT_THAT(heard(), UnorderedElementsAre("first", "second"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, NothingIsReplacedWithoutAnOriginal) {
  multiplexer_->addSyncLogger(system("a"));
  multiplexer_->addSyncLogger(system("b"));
  EXPECT_THAT(logAndDrain(), UnorderedElementsAre("a", "b"));
}

TEST_F(LUMLogMultiplexerSystemLoggerTest, TheOriginalIsReleasedWhenReplaced) {
  Ref<LUMSystemLogger> kept = system("first");
  const rt::Weak<LUMSystemLogger> weak = kept;
  const auto multiplexer = LUMLogMultiplexer::initWithSystemLogger(std::move(kept));
  EXPECT_NE(weak.lock(), nullptr);
  multiplexer->addSyncLogger(system("second"));
  EXPECT_EQ(weak.lock(), nullptr);
}

}  // namespace
