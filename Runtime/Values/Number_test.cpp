#include "Runtime/Values/Number.h"

#include <gtest/gtest.h>

#include <cmath>
#include <compare>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <random>
#include <string>
#include <vector>

namespace {

using namespace rt::literals;
using Kind = rt::Number::Kind;

constexpr auto kLargest = std::numeric_limits<std::int64_t>::max();
constexpr auto kLeast = std::numeric_limits<std::int64_t>::min();
constexpr auto kLargestUnsigned = std::numeric_limits<std::uint64_t>::max();
constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

TEST(Number, KnowsItsKind) {
  EXPECT_EQ(rt::Number::of(true)->kind(), Kind::kBoolean);
  EXPECT_EQ(rt::Number::of(1)->kind(), Kind::kSigned);
  EXPECT_EQ(rt::Number::of(std::uint64_t{1})->kind(), Kind::kSigned);
  EXPECT_EQ(rt::Number::of(static_cast<std::uint64_t>(kLargest))->kind(), Kind::kSigned);
  EXPECT_EQ(rt::Number::of(kLargestUnsigned)->kind(), Kind::kUnsigned);
  EXPECT_EQ(rt::Number::of(kLeast)->kind(), Kind::kSigned);
  EXPECT_EQ(rt::Number::of(1.0)->kind(), Kind::kReal);
  EXPECT_EQ(rt::Number::of(1.0F)->kind(), Kind::kReal);
  EXPECT_EQ(rt::Number::of('a')->integerValue(), 97);
}

TEST(Number, ConvertsItsValue) {
  EXPECT_EQ(rt::Number::of(-3)->integerValue(), -3);
  EXPECT_EQ(rt::Number::of(-1)->unsignedValue(), kLargestUnsigned);
  EXPECT_EQ(rt::Number::of(kLargestUnsigned)->integerValue(), -1);
  EXPECT_EQ(rt::Number::of(-1)->realValue(), -1.0);
  EXPECT_EQ(rt::Number::of(kLargestUnsigned)->realValue(), 18446744073709551616.0);
  EXPECT_EQ(rt::Number::of(true)->realValue(), 1.0);
  EXPECT_EQ(rt::Number::of(2.9)->integerValue(), 2);
  EXPECT_EQ(rt::Number::of(-2.9)->integerValue(), -2);
  EXPECT_EQ(rt::Number::of(-2.9)->unsignedValue(), 0U);
  EXPECT_EQ(rt::Number::of(1e300)->integerValue(), kLargest);
  EXPECT_EQ(rt::Number::of(-1e300)->integerValue(), kLeast);
  EXPECT_EQ(rt::Number::of(2.9)->unsignedValue(), 2U);
  EXPECT_EQ(rt::Number::of(1.5e19)->unsignedValue(), 15'000'000'000'000'000'000U);
  EXPECT_EQ(rt::Number::of(18446744073709551616.0)->unsignedValue(), kLargestUnsigned);
  EXPECT_EQ(rt::Number::of(1e300)->unsignedValue(), kLargestUnsigned);
  EXPECT_EQ(rt::Number::of(kNan)->integerValue(), 0);
  EXPECT_EQ(rt::Number::of(kNan)->unsignedValue(), 0U);
  EXPECT_TRUE(rt::Number::of(-1)->booleanValue());
  EXPECT_TRUE(rt::Number::of(0.5)->booleanValue());
  EXPECT_FALSE(rt::Number::of(0)->booleanValue());
  EXPECT_FALSE(rt::Number::of(-0.0)->booleanValue());
  EXPECT_FALSE(rt::Number::of(false)->booleanValue());
}

TEST(Number, IsEqualByValue) {
  EXPECT_TRUE(rt::isEqual(rt::Number::of(true), rt::Number::of(1)));
  EXPECT_TRUE(rt::isEqual(rt::Number::of(1), rt::Number::of(1.0)));
  EXPECT_TRUE(rt::isEqual(rt::Number::of(1U), rt::Number::of(1)));
  EXPECT_TRUE(rt::isEqual(rt::Number::of(0.0), rt::Number::of(-0.0)));
  EXPECT_TRUE(rt::isEqual(rt::Number::of(kNan), rt::Number::of(-kNan)));
  EXPECT_FALSE(rt::isEqual(rt::Number::of(-1), rt::Number::of(kLargestUnsigned)));
  EXPECT_FALSE(rt::isEqual(rt::Number::of(1), rt::Number::of(1.5)));
  EXPECT_FALSE(rt::isEqual(rt::Number::of(1), rt::Ref<rt::Object>("1"_s)));
  EXPECT_FALSE(rt::Number::of(1)->isEqual(nullptr));
}

TEST(Number, ComparesWithoutRounding) {
  // Both numbers of the first line would round to 2^63, those of the second to 2^53.
  EXPECT_FALSE(rt::isEqual(rt::Number::of(kLargest), rt::Number::of(9223372036854775808.0)));
  EXPECT_FALSE(rt::isEqual(rt::Number::of(9007199254740993), rt::Number::of(9007199254740992.0)));
  EXPECT_TRUE(rt::isEqual(rt::Number::of(std::uint64_t{1} << 63), rt::Number::of(9223372036854775808.0)));
  EXPECT_TRUE(rt::isEqual(rt::Number::of(kLeast), rt::Number::of(-9223372036854775808.0)));
  EXPECT_FALSE(rt::isEqual(rt::Number::of(kLargestUnsigned), rt::Number::of(18446744073709551616.0)));
}

// `places` lists values in ascending order. The values in one place are equal. Values in two places must
// compare as the indices of their places do.
TEST(Number, OrdersAllKinds) {
  const std::vector<std::vector<rt::Ref<rt::Number>>> places{
      {rt::Number::of(kNan), rt::Number::of(-kNan)},
      {rt::Number::of(-kInfinity)},
      {rt::Number::of(-1e19)},
      {rt::Number::of(kLeast), rt::Number::of(-9223372036854775808.0)},
      {rt::Number::of(kLeast + 1)},
      {rt::Number::of(-1.5)},
      {rt::Number::of(-1), rt::Number::of(-1.0)},
      {rt::Number::of(-0.5)},
      {rt::Number::of(0), rt::Number::of(0U), rt::Number::of(false), rt::Number::of(0.0),
       rt::Number::of(-0.0)},
      {rt::Number::of(std::numeric_limits<double>::denorm_min())},
      {rt::Number::of(1), rt::Number::of(true), rt::Number::of(1.0)},
      {rt::Number::of(1.5)},
      {rt::Number::of(2)},
      {rt::Number::of(9007199254740992.0), rt::Number::of(9007199254740992)},
      {rt::Number::of(9007199254740993)},
      {rt::Number::of(kLargest)},
      {rt::Number::of(std::uint64_t{1} << 63), rt::Number::of(9223372036854775808.0)},
      {rt::Number::of(kLargestUnsigned)},
      {rt::Number::of(18446744073709551616.0)},
      {rt::Number::of(kInfinity)}};
  for (std::size_t i = 0; i < places.size(); ++i) {
    for (std::size_t j = 0; j < places.size(); ++j) {
      for (const auto& first : places[i]) {
        for (const auto& second : places[j]) {
          EXPECT_EQ(first->compare(*second), i <=> j)
              << first->description().view() << ' ' << second->description().view();
          EXPECT_EQ(first->isEqual(second.get()), i == j);
          if (i == j) {
            EXPECT_EQ(first->hash(), second->hash()) << first->description().view();
          }
        }
      }
    }
  }
}

TEST(Number, DescribesItselfAsAPlainDecimal) {
  EXPECT_EQ(rt::Number::of(0)->description(), "0");
  EXPECT_EQ(rt::Number::of(-3)->description(), "-3");
  EXPECT_EQ(rt::Number::of(kLeast)->description(), "-9223372036854775808");
  EXPECT_EQ(rt::Number::of(kLargestUnsigned)->description(), "18446744073709551615");
  EXPECT_EQ(rt::Number::of(true)->description(), "1");
  EXPECT_EQ(rt::Number::of(false)->description(), "0");
  EXPECT_EQ(rt::Number::of(0.1)->description(), "0.1");
  EXPECT_EQ(rt::Number::of(3.0)->description(), "3");
  EXPECT_EQ(rt::Number::of(-2.5)->description(), "-2.5");
  EXPECT_EQ(rt::Number::of(1e21)->description(), "1000000000000000000000");
  EXPECT_EQ(rt::Number::of(1e-7)->description(), "0.0000001");
  EXPECT_EQ(rt::Number::of(kInfinity)->description(), "inf");
  EXPECT_EQ(rt::Number::of(-kInfinity)->description(), "-inf");
  EXPECT_EQ(rt::Number::of(kNan)->description(), "nan");
  EXPECT_EQ(rt::Number::of(-kNan)->description(), "nan");
}

TEST(Number, DescriptionReadsBackAsTheSameValue) {
  std::mt19937_64 random(42);
  std::vector<double> values{std::numeric_limits<double>::max(), -std::numeric_limits<double>::denorm_min(),
                             std::numeric_limits<double>::min(), 5e-324, 1.7976931348623157e308};
  for (int i = 0; i < 20000; ++i) {
    const std::uint64_t bits = random();
    double value = 0;
    std::memcpy(&value, &bits, sizeof value);
    if (std::isfinite(value)) values.push_back(value);
  }
  for (const double value : values) {
    const std::string text(rt::Number::of(value)->description().view());
    EXPECT_EQ(text.find_first_not_of("-.0123456789"), std::string::npos) << text;
    EXPECT_EQ(std::strtod(text.c_str(), nullptr), value) << text;
  }
}

// Compares random integers and real numbers. The model is the comparison of long doubles.
TEST(Number, ComparesAsLongDoublesDo) {
  std::mt19937_64 random(11);
  for (int i = 0; i < 100000; ++i) {
    const auto integer = static_cast<std::int64_t>(random()) >> (random() % 64);
    const double real =
        std::ldexp(static_cast<double>(static_cast<std::int64_t>(random())), -int(random() % 70));
    // A long double has 64 bits of precision, so it holds both values exactly.
    const auto first = static_cast<long double>(integer);
    const auto second = static_cast<long double>(real);
    static_assert(std::numeric_limits<long double>::digits >= 64);
    const std::partial_ordering expected = first <=> second;
    ASSERT_EQ(rt::Number::of(integer)->compare(*rt::Number::of(real)), expected) << integer << ' ' << real;
    ASSERT_EQ(rt::Number::of(real)->compare(*rt::Number::of(integer)), 0 <=> expected)
        << integer << ' ' << real;
  }
}

}  // namespace
