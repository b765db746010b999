// Tests both safe parameters together, since the same rules hold for both.

#include "Shared/Logging/LUMSafeParameter.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>

#include "Runtime/Text/Format.h"
#include "Shared/Logging/LUMSafeNumberParameter.h"
#include "Shared/Logging/LUMSafeStringParameter.h"

namespace {

using namespace rt::literals;

constexpr std::uint64_t kLargestType = std::numeric_limits<std::uint64_t>::max();

rt::Ref<LUMSafeStringParameter> text(const rt::String& value, std::uint64_t type) {
  return LUMSafeStringParameter::parameterWithString(value, type);
}

rt::Ref<LUMSafeNumberParameter> number(int value, std::uint64_t type) {
  return LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(value), type);
}

TEST(LUMSafeParameter, IsSafeToUploadForFourTypesOnly) {
  for (const std::uint64_t type : {std::uint64_t{0}, std::uint64_t{5}, std::uint64_t{6}, kLargestType}) {
    EXPECT_FALSE(text("a"_s, type)->isUploadSafeType()) << type;
    EXPECT_FALSE(number(1, type)->isUploadSafeType()) << type;
  }
  for (const std::uint64_t type : {1U, 2U, 3U, 4U}) {
    EXPECT_TRUE(text("a"_s, type)->isUploadSafeType()) << type;
    EXPECT_TRUE(number(1, type)->isUploadSafeType()) << type;
  }
}

TEST(LUMSafeParameter, HoldsTheGivenTypeAndValue) {
  EXPECT_EQ(text("a"_s, 7)->stringValue(), "a");
  EXPECT_EQ(text("a"_s, kLargestType)->type(), kLargestType);
  EXPECT_EQ(LUMSafeStringParameter::initWithString("b"_s, 2)->stringValue(), "b");
  const rt::Ref<rt::Number> three = rt::Number::of(3);
  EXPECT_EQ(LUMSafeNumberParameter::initWithNumber(three, 2)->numberValue(), three);
  EXPECT_EQ(number(3, kLargestType)->type(), kLargestType);
}

TEST(LUMSafeParameter, HasTheDescriptionOfItsValue) {
  EXPECT_EQ(text("a b"_s, 1)->description(), "a b");
  EXPECT_EQ(number(-3, 1)->description(), "-3");
  EXPECT_TRUE(text(nullptr, 1)->description().isNull());
  EXPECT_TRUE(LUMSafeNumberParameter::parameterWithNumber(nullptr, 1)->description().isNull());
  EXPECT_EQ(rt::format("%@ %@", text("a"_s, 1), number(4, 1)), "a 4");
  EXPECT_EQ(rt::format("%@", text(nullptr, 1)), "(null)");
}

TEST(LUMSafeParameter, CastsToItsProtocol) {
  const rt::Ref<rt::Object> object = text("a"_s, 3);
  const rt::Ref<LUMSafeParameter> parameter = rt::cast<LUMSafeParameter>(object);
  ASSERT_TRUE(parameter);
  EXPECT_EQ(parameter->type(), 3U);
  EXPECT_TRUE(rt::cast<LUMSafeParameter>(rt::Ref<rt::Object>(number(1, 1))));
}

TEST(LUMSafeParameter, ComparesTypeAndValue) {
  EXPECT_TRUE(rt::isEqual(text("a"_s, 1), text(rt::String::fromUTF8("a"), 1)));
  EXPECT_FALSE(rt::isEqual(text("a"_s, 1), text("a"_s, 2)));
  EXPECT_FALSE(rt::isEqual(text("a"_s, 1), text("b"_s, 1)));
  EXPECT_FALSE(rt::isEqual(text("a"_s, 1), text(nullptr, 1)));
  EXPECT_FALSE(rt::isEqual(text(""_s, 1), text(nullptr, 1)));
  EXPECT_TRUE(rt::isEqual(text(nullptr, 1), text(nullptr, 1)));
  EXPECT_TRUE(rt::isEqual(number(1, 1), number(1, 1)));
  EXPECT_FALSE(rt::isEqual(number(1, 1), number(1, 2)));
  EXPECT_FALSE(rt::isEqual(number(1, 1), number(2, 1)));
  EXPECT_FALSE(rt::isEqual(number(1, 1), LUMSafeNumberParameter::parameterWithNumber(nullptr, 1)));
  EXPECT_TRUE(rt::isEqual(LUMSafeNumberParameter::parameterWithNumber(nullptr, 1),
                          LUMSafeNumberParameter::parameterWithNumber(nullptr, 1)));
  EXPECT_FALSE(rt::isEqual(text("1"_s, 1), number(1, 1)));
  EXPECT_FALSE(text("a"_s, 1)->isEqual(nullptr));
  EXPECT_FALSE(number(1, 1)->isEqual(nullptr));
}

TEST(LUMSafeParameter, HashesTypeAndValue) {
  EXPECT_EQ(text("a"_s, 3)->hash(), 3 + "a"_s.hash());
  EXPECT_EQ(text(nullptr, 3)->hash(), 3U);
  EXPECT_EQ(number(5, 3)->hash(), 3 + rt::Number::of(5)->hash());
  EXPECT_EQ(LUMSafeNumberParameter::parameterWithNumber(nullptr, 3)->hash(), 3U);
  // The sum wraps around.
  EXPECT_EQ(text("a"_s, kLargestType)->hash(), "a"_s.hash() - 1);
}

TEST(LUMSafeParameter, CopyReturnsTheSameObject) {
  const rt::Ref<LUMSafeStringParameter> parameter = text("a"_s, 1);
  EXPECT_EQ(parameter->copy(), parameter);
  const rt::Ref<LUMSafeNumberParameter> other = number(1, 1);
  EXPECT_EQ(other->copy(), other);
}

}  // namespace
