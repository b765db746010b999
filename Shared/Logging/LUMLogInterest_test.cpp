#include "Shared/Logging/LUMLogInterest.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <latch>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Values/Array.h"
#include "Shared/Logging/LUMDefaultMinimumLogLevelFilter.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogComponentFilter.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogLogicalAndFilter.h"
#include "Shared/Logging/LUMLogLogicalOrFilter.h"
#include "Shared/Logging/LUMLogMinimumLevelFilter.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMLogNoFilter.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/TestLoggers.h"

namespace {

using namespace rt::literals;
using rt::Ref;

Ref<LUMLogFilter> from(LUMLogLevel level) {
  return LUMLogMinimumLevelFilter::initWithMinimumLevel(level);
}

Ref<LUMLogFilter> ofComponent(const rt::String& component) {
  return LUMLogComponentFilter::initWithComponent(component);
}

const rt::String kNone;

LUMLogLevel lowest(const Ref<LUMLogFilter>& filter, const rt::String* component = nullptr) {
  return LUMLogLowestLevel(filter.get(), component);
}

// A logger that says what it wants.
class Wanting final : public rt::Implements<Wanting, rt::Object, LUMSyncLogger, LUMLogInterest> {
 public:
  explicit Wanting(Ref<LUMLogFilter> filter) : filter_(std::move(filter)) {}

  void logWithMessage(const Ref<LUMLogMessage>& /*message*/) override { ++count; }
  Ref<LUMLogFilter> filter() const override { return filter_; }
  LUMLogLevel lowestLevel(const rt::String* component) const noexcept override {
    return std::max(LUMLogLowestLevel(filter_.get(), component), least.load());
  }

  std::atomic<LUMLogLevel> least = 0;
  std::atomic<int> count = 0;

 private:
  const Ref<LUMLogFilter> filter_;
};

// Lets everything pass, although its superclass does not.
class Loud final : public rt::Implements<Loud, LUMLogMinimumLevelFilter> {
 public:
  Loud() : Implements(LUMLogLevelFault) {}
  bool allowLogMessage(const LUMLogMessage& /*message*/) const override { return true; }
};

// Counts how often its description is asked for.
class Described final : public rt::Implements<Described, rt::Object> {
 public:
  rt::String description() const override {
    ++count;
    return "described"_s;
  }
  mutable int count = 0;
};

TEST(LUMLogInterest, OfAFilterThatSaysNothingIsEverything) {
  EXPECT_EQ(lowest(nullptr), 0U);
  EXPECT_EQ(lowest(LUMLogNoFilter::init()), 0U);
  EXPECT_EQ(lowest(rt::make<TestFilter>([](const LUMLogMessage&) { return false; })), 0U);
}

TEST(LUMLogInterest, OfAMinimumLevelIsThatLevel) {
  EXPECT_EQ(lowest(from(LUMLogLevelError)), LUMLogLevelError);
  EXPECT_EQ(lowest(from(0)), 0U);
  EXPECT_EQ(lowest(LUMLogDropAllFilter::init()), LUMLogLevelNone);
}

TEST(LUMLogInterest, OfAComponentIsThatComponent) {
  const rt::String importer = "Importer"_s;
  const rt::String other = "Other"_s;
  EXPECT_EQ(lowest(ofComponent(importer)), 0U);
  EXPECT_EQ(lowest(ofComponent(importer), &importer), 0U);
  EXPECT_EQ(lowest(ofComponent(importer), &other), LUMLogLevelNone);
  EXPECT_EQ(lowest(ofComponent(importer), &kNone), LUMLogLevelNone);
  EXPECT_EQ(lowest(ofComponent(nullptr)), LUMLogLevelNone);
  EXPECT_EQ(lowest(ofComponent(nullptr), &kNone), LUMLogLevelNone);
}

TEST(LUMLogInterest, OfAClassThatDerivesFromAStockFilterIsEverything) {
  EXPECT_EQ(lowest(rt::make<Loud>()), 0U);
  EXPECT_EQ(lowest(LUMLogLogicalOrFilter::initWithFilters(rt::Array::of(rt::make<Loud>()))), 0U);
}

// Returns a random filter of at most this depth.
Ref<LUMLogFilter> randomFilter(std::mt19937_64& random, int depth) {
  const auto below = [&](std::uint64_t end) { return random() % end; };
  switch (below(depth > 0 ? 6 : 4)) {
    case 0:
      return from(below(6));
    case 1:
      return ofComponent(below(2) == 0 ? "a"_s : "b"_s);
    case 2:
      return LUMLogDropAllFilter::init();
    case 3:
      return LUMLogNoFilter::init();
    default: {
      std::vector<Ref<rt::Object>> parts;
      for (std::uint64_t count = below(4); count > 0; --count)
        parts.emplace_back(randomFilter(random, depth - 1)->asObject());
      if (below(16) == 0) parts.emplace_back("no filter"_s.object());
      const Ref<rt::Array> all = rt::make<rt::Array>(std::move(parts));
      if (below(2) == 0) return LUMLogLogicalAndFilter::initWithFilters(all);
      return LUMLogLogicalOrFilter::initWithFilters(all);
    }
  }
}

// A filter made of stock filters lets exactly those levels of a component pass that it says. For all
// components together it may say a level that is too low.
TEST(LUMLogInterest, OfStockFiltersIsWhatTheyLetPass) {
  std::mt19937_64 random(16);
  const std::array<rt::String, 3> components = {"a"_s, "b"_s, kNone};
  for (int round = 0; round < 20'000; ++round) {
    const Ref<LUMLogFilter> filter = randomFilter(random, 3);
    for (const rt::String& component : components) {
      const Ref<LUMLogMetadata> metadata =
          component ? LUMLogMetadata::metadataWithComponent(component) : nullptr;
      for (LUMLogLevel level = 0; level < 7; ++level) {
        const bool passes = filter->allowLogMessage(*messageWith(level, nullptr, metadata));
        ASSERT_EQ(level >= lowest(filter, &component), passes) << "round " << round << ", level " << level;
        ASSERT_TRUE(!passes || level >= lowest(filter)) << "round " << round << ", level " << level;
      }
    }
  }
}

// Uses the shared multiplexer, without loggers at first.
class LUMLogInterestTest : public testing::Test {
 protected:
  LUMLogInterestTest() {
    const Ref<LUMSystemLogger> replacement = LUMSystemLogger::initWithFilter(nullptr);
    multiplexer_->addSyncLogger(replacement);
    multiplexer_->removeSyncLogger(replacement);
  }
  ~LUMLogInterestTest() override {
    multiplexer_->removeSyncLogger(errors_);
    multiplexer_->removeSyncLogger(importer_);
  }

  static bool isMade(LUMLogLevel level, const Ref<LUMLogMetadata>& metadata = nullptr) {
    return LUMLogAt(level, metadata, "text"_s) != nullptr;
  }

  const Ref<LUMLogMultiplexer>& multiplexer_ = LUMLogMultiplexer::sharedInstance();
  const Ref<Wanting> errors_ = rt::make<Wanting>(from(LUMLogLevelError));
  const Ref<Wanting> importer_ = rt::make<Wanting>(ofComponent("Importer"_s));
  const Ref<LUMLogMetadata> ofImporter_ = LUMLogMetadata::metadataWithComponent("Importer"_s);
  const Ref<LUMLogMetadata> ofOther_ = LUMLogMetadata::metadataWithComponent("Other"_s);
  const Ref<LUMLogMetadata> ofNone_ = LUMLogMetadata::init();
};

TEST_F(LUMLogInterestTest, NoMessageIsMadeIfThereIsNoLogger) {
  EXPECT_EQ(multiplexer_->lowestLevel(nullptr), LUMLogLevelNone);
  EXPECT_FALSE(isMade(LUMLogLevelFault));
  EXPECT_FALSE(isMade(LUMLogLevelFault, ofImporter_));
}

TEST_F(LUMLogInterestTest, AMessageIsMadeIfSomeLoggerWantsIt) {
  multiplexer_->addSyncLogger(errors_);
  EXPECT_FALSE(isMade(LUMLogLevelInfo));
  EXPECT_TRUE(isMade(LUMLogLevelError));
  EXPECT_FALSE(isMade(LUMLogLevelInfo, ofNone_));
  EXPECT_TRUE(isMade(LUMLogLevelError, ofNone_));
  EXPECT_EQ(errors_->count, 2);
}

TEST_F(LUMLogInterestTest, EachComponentHasItsOwnLevel) {
  multiplexer_->addSyncLogger(errors_);
  multiplexer_->addSyncLogger(importer_);
  EXPECT_TRUE(isMade(LUMLogLevelDebug, ofImporter_));
  EXPECT_FALSE(isMade(LUMLogLevelDebug, ofOther_));
  EXPECT_FALSE(isMade(LUMLogLevelDebug, ofNone_));
  EXPECT_FALSE(isMade(LUMLogLevelDebug));
  EXPECT_TRUE(isMade(LUMLogLevelError, ofOther_));
  EXPECT_EQ(importer_->count, 1);
  EXPECT_EQ(errors_->count, 1);
}

// Metadata keeps the answer for its component until something changes.
TEST_F(LUMLogInterestTest, MetadataThatWasUsedBeforeFollowsEveryChange) {
  multiplexer_->addSyncLogger(errors_);
  EXPECT_FALSE(isMade(LUMLogLevelInfo, ofImporter_));
  multiplexer_->addSyncLogger(importer_);
  EXPECT_TRUE(isMade(LUMLogLevelInfo, ofImporter_));
  importer_->least = LUMLogLevelError;
  EXPECT_TRUE(isMade(LUMLogLevelInfo, ofImporter_));
  LUMLogInterestChanged();
  EXPECT_FALSE(isMade(LUMLogLevelInfo, ofImporter_));
  EXPECT_TRUE(isMade(LUMLogLevelError, ofImporter_));
  multiplexer_->removeSyncLogger(importer_);
  multiplexer_->removeSyncLogger(errors_);
  EXPECT_FALSE(isMade(LUMLogLevelError, ofImporter_));
}

TEST_F(LUMLogInterestTest, AFilterOfTheMultiplexerCountsForAllLoggers) {
  multiplexer_->addSyncLogger(importer_);
  const Ref<LUMLogFilter> filter = from(LUMLogLevelFault);
  multiplexer_->addLogFilter(filter);
  EXPECT_FALSE(isMade(LUMLogLevelError, ofImporter_));
  EXPECT_TRUE(isMade(LUMLogLevelFault, ofImporter_));
  multiplexer_->removeLogFilter(filter);
  EXPECT_TRUE(isMade(LUMLogLevelError, ofImporter_));
}

TEST_F(LUMLogInterestTest, ALoggerThatSaysNothingWantsEverything) {
  const auto silent = rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>&) {}, from(LUMLogLevelFault));
  multiplexer_->addSyncLogger(silent);
  EXPECT_TRUE(isMade(0));
  EXPECT_TRUE(isMade(LUMLogLevelDebug, ofOther_));
  multiplexer_->removeSyncLogger(silent);
  EXPECT_FALSE(isMade(LUMLogLevelDebug, ofOther_));
}

TEST_F(LUMLogInterestTest, ALevelBeyond32BitsIsDelivered) {
  const auto high = rt::make<Wanting>(from(LUMLogLevel{1} << 40));
  multiplexer_->addSyncLogger(high);
  EXPECT_TRUE(isMade(LUMLogLevel{1} << 40, ofOther_));
  EXPECT_FALSE(isMade(LUMLogLevelFault, ofOther_));
  EXPECT_FALSE(isMade((LUMLogLevel{1} << 40) - 1));
  EXPECT_EQ(high->count, 1);
  multiplexer_->removeSyncLogger(high);
}

TEST_F(LUMLogInterestTest, AMessageThatNobodyWantsAsksForNoDescriptionAndAllocatesNothing) {
  multiplexer_->addSyncLogger(errors_);
  const auto described = rt::make<Described>();
  LUMLogAt(LUMLogLevelInfo, ofOther_, "%@"_s, described);
  EXPECT_EQ(described->count, 0);
  LUMLogAt(LUMLogLevelError, "%@"_s, described);
  EXPECT_EQ(described->count, 1);
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  LUMLogAt(LUMLogLevelInfo, "%@ and %d"_s, described, 3);
  LUMLogAt(LUMLogLevelInfo, ofOther_, "%@ and %d"_s, described, 3);
  EXPECT_EQ(count.allocations(), 0);
}

// While other threads add and remove loggers of all kinds, a logger that stays gets all that it wants.
TEST_F(LUMLogInterestTest, NoWantedMessageIsLostWhileLoggersChange) {
  constexpr int kMessages = 5000;
  constexpr int kThreads = 4;
  multiplexer_->addSyncLogger(errors_);
  std::latch mayStart(kThreads + 2);
  std::atomic<int> working = kThreads;
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&, i] {
      mayStart.arrive_and_wait();
      for (int sent = 0; sent < kMessages; ++sent) {
        LUMLogAt(5, i % 2 == 0 ? ofOther_ : nullptr, "text"_s);
        LUMLogAt(LUMLogLevelDebug, ofImporter_, "text"_s);
      }
      --working;
    });
  }
  const std::array<Ref<Wanting>, 2> passing = {importer_, rt::make<Wanting>(from(LUMLogLevelFault))};
  for (const Ref<Wanting>& logger : passing) {
    threads.emplace_back([&] {
      mayStart.arrive_and_wait();
      while (working > 0) {
        multiplexer_->addSyncLogger(logger);
        multiplexer_->removeSyncLogger(logger);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(errors_->count, kThreads * kMessages);
  EXPECT_FALSE(isMade(LUMLogLevelInfo, ofImporter_));
  EXPECT_EQ(multiplexer_->lowestLevel(nullptr), LUMLogLevelError);
}

// With the default system logger, the first message reads OS_ACTIVITY_MODE. From then on, nothing is made for
// messages below its level.
TEST(LUMLogInterestDeathTest, TheDefaultLoggersLevelIsKnownAfterTheFirstMessage) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  const auto body = [](const char* mode) {
    if (mode != nullptr) {
      setenv("OS_ACTIVITY_MODE", mode, 1);
    } else {
      unsetenv("OS_ACTIVITY_MODE");
    }
    std::string made;
    for (const LUMLogLevel level : {LUMLogLevel{1}, LUMLogLevel{0}, LUMLogLevelDebug, LUMLogLevelInfo})
      made += LUMLogAt(level, "text"_s) ? 'y' : 'n';
    std::fprintf(stderr, "made %s.\n", made.c_str());
    std::exit(0);
  };
  EXPECT_EXIT(body(nullptr), testing::ExitedWithCode(0), "made ynnn\\.");
  EXPECT_EXIT(body("info"), testing::ExitedWithCode(0), "made ynny\\.");
  EXPECT_EXIT(body("debug"), testing::ExitedWithCode(0), "made ynyy\\.");
}

}  // namespace
