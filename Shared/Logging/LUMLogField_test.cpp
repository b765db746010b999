#include "Shared/Logging/LUMLogField.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "Runtime/Values/Array.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogDropAllFilter.h"
#include "Shared/Logging/LUMLogLevels.h"
#include "Shared/Logging/LUMLogMultiplexer.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/Loggers/Testing/LUMLogMatchers.h"
#include "tests/support/FirstSymbol.h"

namespace {

using namespace rt::literals;
using namespace std::chrono_literals;
using namespace LUMLogMatchers;
using rt::Ref;
using testing::AllOf;
using testing::ElementsAre;
using testing::HasSubstr;

enum Size : std::uint8_t { kSmall, kLarge };

template <class T>
Ref<rt::Object> valueOf(const T& value) {
  return LUMLogField("name", value).value();
}

TEST(LUMLogField, HasAName) {
  EXPECT_EQ(LUMLogField("bytes", 42).name(), "bytes");
}

TEST(LUMLogField, KeepsANumber) {
  EXPECT_TRUE(rt::isEqual(valueOf(42), rt::Number::of(42)));
  EXPECT_TRUE(rt::isEqual(valueOf(std::int64_t{-1}), rt::Number::of(-1)));
  EXPECT_TRUE(rt::isEqual(valueOf(~0ULL), rt::Number::of(~0ULL)));
  EXPECT_TRUE(rt::isEqual(valueOf(1.5), rt::Number::of(1.5)));
  EXPECT_TRUE(rt::isEqual(valueOf(true), rt::Number::of(true)));
  EXPECT_TRUE(rt::isEqual(valueOf(kLarge), rt::Number::of(1)));
}

TEST(LUMLogField, KeepsAnObject) {
  const Ref<rt::Array> array = rt::Array::of("a"_s);
  EXPECT_EQ(valueOf(array).get(), array.get());
  EXPECT_EQ(valueOf(array.get()).get(), array.get());
  EXPECT_EQ(valueOf(Ref<rt::Object>(array)).get(), array.get());
  EXPECT_FALSE(valueOf(Ref<rt::Array>()));
  const rt::String text = "text"_s;
  EXPECT_EQ(valueOf(text).get(), text.object());
}

TEST(LUMLogField, MakesAStringOfATextAndOfADescription) {
  EXPECT_TRUE(rt::isEqual(valueOf("text"), Ref<rt::Object>("text"_s)));
  const char* const null = nullptr;
  EXPECT_FALSE(valueOf(null));
  EXPECT_TRUE(rt::isEqual(valueOf(std::string("text")), Ref<rt::Object>("text"_s)));
  EXPECT_TRUE(rt::isEqual(valueOf(12ms), Ref<rt::Object>("12ms"_s)));
  EXPECT_TRUE(rt::isEqual(valueOf(std::vector<int>{1, 2}), Ref<rt::Object>("[1, 2]"_s)));
}

class LUMLogFieldTest : public testing::Test {
 protected:
  const LUMLogCapture capture_;
};

TEST_F(LUMLogFieldTest, BecomesAPropertyOfTheMessage) {
  const Ref<LUMLogMessage> message =
      LUMLogAt(LUMLogLevelInfo, "%d entries"_s, 3, LUMLogField("user", "ann"_s), LUMLogField("bytes", 42));
  EXPECT_THAT(message, AllOf(HasText("3 entries"), HasField("user", "ann"), HasField("bytes", 42)));
  EXPECT_EQ(message->logMetadata()->properties()->count(), 2U);
}

TEST_F(LUMLogFieldTest, StandsBesideTheMetadataOfTheCall) {
  const Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  const Ref<LUMLogMessage> message = LUMLogAt(LUMLogLevelInfo, importer, "text"_s, LUMLogField("bytes", 42));
  EXPECT_THAT(message, AllOf(HasComponent("Importer"), HasField("bytes", 42)));
  EXPECT_EQ(importer->properties()->count(), 1U);
}

TEST_F(LUMLogFieldTest, ReplacesAPropertyAndALaterOneReplacesIt) {
  const Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  const Ref<LUMLogMessage> message =
      LUMLogAt(LUMLogLevelInfo, importer, "text"_s, LUMLogField("LUMLogMetadataComponent", "Other"_s),
               LUMLogField("n", 1), LUMLogField("n", 2));
  EXPECT_THAT(message, AllOf(HasComponent("Other"), HasField("n", 2)));
}

TEST_F(LUMLogFieldTest, LeavesTheMetadataAsItIsIfThereIsNone) {
  const Ref<LUMLogMetadata> importer = LUMLogMetadata::metadataWithComponent("Importer"_s);
  EXPECT_EQ(LUMLogAt(LUMLogLevelInfo, importer, "text"_s)->logMetadata(), importer);
  EXPECT_FALSE(LUMLogAt(LUMLogLevelInfo, "text"_s)->logMetadata());
}

// The arguments of the format are counted without the fields.
TEST_F(LUMLogFieldTest, IsNoArgumentOfTheFormat) {
  const auto parameter = LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(7), 1);
  const Ref<LUMLogMessage> message = LUMLogAt(LUMLogLevelInfo, "%s %@ %@"_s, "a", parameter, 3ms,
                                              LUMLogField("safe", parameter), LUMLogField("long", 1));
  EXPECT_EQ(message->formattedString(), "a 7 3ms");
  ASSERT_TRUE(message->safeParameters());
  EXPECT_EQ(message->safeParameters()->count(), 1U);
  EXPECT_EQ(message->logMetadata()->propertyForKey("safe"_s).get(), parameter.get());
}

[[gnu::noinline]] void functionThatLogsAField() {
  LUMLogAt(LUMLogLevelError, "text"_s, LUMLogField("n", 1));
}

TEST_F(LUMLogFieldTest, LeavesTheCallerTheFirstFrame) {
  functionThatLogsAField();
  EXPECT_THAT(firstSymbolOf(*capture_.messages().at(0)), HasSubstr("functionThatLogsAField("));
}

// Counts how often its description is asked for.
struct Described {
  int& count;
};
rt::String descriptionOf(const Described& described) {
  ++described.count;
  return "described"_s;
}

TEST_F(LUMLogFieldTest, IsNotDescribedIfNobodyWantsTheMessage) {
  int count = 0;
  LUMLogAt(LUMLogLevelInfo, "%@"_s, Described(count), LUMLogField("described", Described(count)));
  EXPECT_EQ(count, 2);
  const Ref<LUMLogFilter> none = LUMLogDropAllFilter::init();
  LUMLogMultiplexer::sharedInstance()->addLogFilter(none);
  LUMLogAt(LUMLogLevelInfo, "%@"_s, Described(count), LUMLogField("described", Described(count)));
  LUMLogMultiplexer::sharedInstance()->removeLogFilter(none);
  EXPECT_EQ(count, 2);
}

// The component of the call used to decide, and the one that the field gives was not asked.
TEST_F(LUMLogFieldTest, MayNameTheComponentThatIsWanted) {
  const Ref<LUMLogLevels> levels = LUMLogLevels::init();
  ASSERT_FALSE(levels->setText("error,Importer=debug"_s));
  LUMLogMultiplexer::sharedInstance()->addLogFilter(levels);
  LUMLogAt(LUMLogLevelDebug, "wanted"_s, LUMLogField("LUMLogMetadataComponent", "Importer"_s));
  LUMLogAt(LUMLogLevelDebug, "refused"_s, LUMLogField("LUMLogMetadataComponent", "Other"_s));
  LUMLogMultiplexer::sharedInstance()->removeLogFilter(levels);
  EXPECT_THAT(capture_.messages(), ElementsAre(HasText("wanted")));
}

}  // namespace
