#include "Runtime/Text/Description.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cmath>
#include <cstdint>
#include <ctime>
#include <filesystem>
#include <limits>
#include <list>
#include <map>
#include <optional>
#include <random>
#include <ratio>
#include <set>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

#include "Runtime/Text/Format.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Number.h"
#include "tests/support/AllocationCount.h"

namespace host {

using namespace rt::literals;

struct Point {
  int x, y;
};

static rt::String descriptionOf(const Point& point) {
  return rt::format("(%d, %d)", point.x, point.y);
}

enum class Colour : std::uint8_t { red, green };

static rt::String descriptionOf(Colour colour) {
  return colour == Colour::red ? "red"_s : rt::String();
}

// Converts to a text, but has a description of its own.
struct Name {
  operator std::string_view() const { return "text"; }
};

static rt::String descriptionOf(const Name& /*name*/) {
  return "a name"_s;
}

struct Thrower {};

static rt::String descriptionOf(const Thrower& /*thrower*/) {
  throw std::runtime_error("thrown");
}

}  // namespace host

namespace {

using namespace rt::literals;
using namespace std::chrono_literals;
using host::Colour;
using host::Name;
using host::Point;
using host::Thrower;
using std::chrono::duration;
using std::chrono::sys_days;
using std::chrono::system_clock;
using std::chrono::year;

template <class T>
std::string text(const T& value) {
  const rt::String formatted = rt::format("%@"_s, value);
  EXPECT_EQ(rt::describe(value), formatted);
  return std::string(formatted.view());
}

TEST(Description, OfAText) {
  EXPECT_EQ(text(std::string("text")), "text");
  EXPECT_EQ(text(std::string_view("text").substr(1, 2)), "ex");
  EXPECT_EQ(text(std::string()), "");
  EXPECT_EQ(text(std::string("a\xFF")), "a\uFFFD");
  EXPECT_EQ(text(std::string("a\0b", 3)), std::string("a\0b", 3));
}

TEST(Description, OfAPath) {
  EXPECT_EQ(text(std::filesystem::path("/tmp/a b")), "/tmp/a b");
  EXPECT_EQ(text(std::filesystem::path("a\xFF")), "a\uFFFD");
}

TEST(Description, OfADuration) {
  EXPECT_EQ(text(12ns), "12ns");
  EXPECT_EQ(text(-12us), "-12\u00B5s");
  EXPECT_EQ(text(12ms), "12ms");
  EXPECT_EQ(text(0s), "0s");
  EXPECT_EQ(text(12min), "12min");
  EXPECT_EQ(text(12h), "12h");
  EXPECT_EQ(text(std::chrono::days(12)), "12d");
  EXPECT_EQ(text(duration<double>(1.5)), "1.5s");
  EXPECT_EQ(text(duration<int, std::ratio<1, 30>>(3)), "3[1/30]s");
  EXPECT_EQ(text(duration<int, std::ratio<10>>(3)), "3[10]s");
}

TEST(Description, OfATime) {
  const auto day = sys_days(year(2026) / 11 / 22);
  EXPECT_EQ(text(day), "2026-11-22T00:00:00Z");
  EXPECT_EQ(text(day + 18h + 5min + 9s), "2026-11-22T18:05:09Z");
  EXPECT_EQ(text(day + 18h + 45min + 250ms), "2026-11-22T18:45:00.250Z");
  EXPECT_EQ(text(day + 1ns), "2026-11-22T00:00:00.000000001Z");
  EXPECT_EQ(text(sys_days(year(1970) / 1 / 1) - 1ms), "1969-12-31T23:59:59.999Z");
  EXPECT_EQ(text(sys_days(year(2000) / 2 / 29)), "2000-02-29T00:00:00Z");
  EXPECT_EQ(text(sys_days(year(1) / 1 / 1)), "0001-01-01T00:00:00Z");
  EXPECT_EQ(text(sys_days(year(0) / 1 / 1)), "0000-01-01T00:00:00Z");
  EXPECT_EQ(text(sys_days(year(-1) / 12 / 31)), "-0001-12-31T00:00:00Z");
  EXPECT_EQ(text(sys_days(year(12345) / 12 / 31)), "12345-12-31T00:00:00Z");
  using Halves = std::chrono::time_point<system_clock, duration<std::int64_t, std::ratio<3, 2>>>;
  EXPECT_EQ(text(Halves(Halves::duration(1))), "1970-01-01T00:00:01.5Z");
  EXPECT_EQ(text(Halves(Halves::duration(-1))), "1969-12-31T23:59:58.5Z");
  using Quarters = std::chrono::time_point<system_clock, duration<std::int64_t, std::ratio<1, 4>>>;
  EXPECT_EQ(text(Quarters(Quarters::duration(5))), "1970-01-01T00:00:01.25Z");
  // The system's clock cannot count these.
  using Thirtieths = std::chrono::time_point<system_clock, duration<std::int64_t, std::ratio<1, 30>>>;
  EXPECT_EQ(text(Thirtieths(Thirtieths::duration(20))), "20[1/30]s");
  using Years = std::chrono::time_point<system_clock, duration<std::int64_t, std::ratio<31'556'952>>>;
  EXPECT_EQ(text(Years(Years::duration::max())), "9223372036854775807[31556952]s");
}

// The calendar of the system is the model.
TEST(Description, OfATimeIsThatOfTheSystemsCalendar) {
  std::mt19937_64 random(18);
  std::uniform_int_distribution<std::int64_t> seconds(-70'000'000'000, 250'000'000'000);
  for (int i = 0; i < 20'000; ++i) {
    const std::time_t time = seconds(random);
    std::tm parts{};
    ASSERT_NE(gmtime_r(&time, &parts), nullptr);
    std::array<char, 64> expected{};
    ASSERT_GT(std::strftime(expected.data(), expected.size(), "-%m-%dT%H:%M:%SZ", &parts), 0U);
    const std::string told = text(std::chrono::sys_seconds(std::chrono::seconds(time)));
    const int tellsYear = parts.tm_year + 1900;
    std::array<char, 16> tellYear{};
    std::snprintf(tellYear.data(), tellYear.size(), tellsYear < 0 ? "-%04d" : "%04d", std::abs(tellsYear));
    ASSERT_EQ(told, std::string(tellYear.data()) + expected.data()) << time;
  }
}

TEST(Description, OfATimeOfAnotherClock) {
  EXPECT_EQ(text(std::chrono::steady_clock::time_point(12ms)), "12000000ns");
  EXPECT_EQ(text(std::chrono::time_point<system_clock, duration<double>>(duration<double>(0.5))), "0.5s");
}

TEST(Description, OfAnErrorCode) {
  EXPECT_EQ(text(std::make_error_code(std::errc::no_such_file_or_directory)),
            "No such file or directory (generic:2)");
  EXPECT_EQ(text(std::error_code(13, std::system_category())), "Permission denied (system:13)");
  EXPECT_EQ(text(std::make_error_condition(std::errc::permission_denied)), "Permission denied (generic:13)");
}

TEST(Description, OfAnOptional) {
  EXPECT_EQ(text(std::optional<int>()), "(null)");
  EXPECT_EQ(text(std::optional<int>(3)), "3");
  EXPECT_EQ(text(std::optional<std::string>("text")), "text");
  EXPECT_EQ(text(std::optional<std::optional<int>>(std::optional<int>())), "(null)");
  EXPECT_EQ(text(std::optional<rt::String>("text"_s)), "text");
}

TEST(Description, OfARange) {
  EXPECT_EQ(text(std::vector<int>()), "[]");
  EXPECT_EQ(text(std::vector<int>{1, -2, 3}), "[1, -2, 3]");
  EXPECT_EQ(text(std::vector<bool>{true, false}), "[true, false]");
  EXPECT_EQ(text(std::list<std::string>{"a", "b"}), "[a, b]");
  EXPECT_EQ(text(std::set<char>{'x', 'y'}), "[x, y]");
  EXPECT_EQ(text(std::array<double, 3>{0.1, 1e100, -0.0}), "[0.1, 1e+100, -0]");
  EXPECT_EQ(text(std::vector<float>{1.5F}), "[1.5]");
  EXPECT_EQ(text(std::map<std::string, std::vector<int>>{{"a", {1}}, {"b", {}}}), "[a: [1], b: []]");
  EXPECT_EQ(text(std::pair(1, 2ms)), "1: 2ms");
  EXPECT_EQ(text(std::vector<std::uint64_t>{std::numeric_limits<std::uint64_t>::max()}),
            "[18446744073709551615]");
  EXPECT_EQ(text(std::vector<double>{std::nan(""), -std::nan(""), std::numeric_limits<double>::infinity()}),
            "[nan, nan, inf]");
}

TEST(Description, OfARangeOfObjects) {
  EXPECT_EQ(text(std::vector<rt::String>{"a"_s, nullptr}), "[a, (null)]");
  EXPECT_EQ(text(std::vector<rt::Ref<rt::Number>>{rt::Number::of(3), nullptr}), "[3, (null)]");
}

TEST(Description, OfATypeOfTheHost) {
  EXPECT_EQ(text(Point{3, 4}), "(3, 4)");
  EXPECT_EQ(text(Colour::red), "red");
  EXPECT_EQ(text(std::vector<Point>{{1, 2}, {3, 4}}), "[(1, 2), (3, 4)]");
  EXPECT_EQ(text(Name()), "a name");
}

TEST(Description, ThatIsNullIsPrintedAsNull) {
  EXPECT_EQ(rt::format("%@"_s, Colour::green), "(null)");
  EXPECT_TRUE(rt::describe(Colour::green).isNull());
  EXPECT_EQ(text(std::vector<Colour>{Colour::green}), "[(null)]");
}

TEST(Description, MayThrow) {
  EXPECT_THROW(rt::format("%@"_s, Thrower()), std::runtime_error);
  EXPECT_THROW(rt::describe(std::vector<Thrower>(2)), std::runtime_error);
}

TEST(Description, TakesFlagsLikeAnyObject) {
  EXPECT_EQ(rt::format("%-6@|%.2@"_s, std::string("text"), std::string("text")), "text  |te");
}

// One for the description and one for the result.
TEST(Description, AllocatesOnce) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const std::string value = "text";
  const AllocationCount count;
  rt::format("%@"_s, 12ms);
  EXPECT_EQ(count.allocations(), 2);
  rt::describe(value);
  EXPECT_LE(count.allocations(), 4);
}

}  // namespace
