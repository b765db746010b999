#include "Runtime/Text/Private/LocalTimeFormatter.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cstdlib>
#include <filesystem>
#include <random>
#include <thread>
#include <vector>

#include "tests/support/AllocationCount.h"

namespace {

using namespace rt::literals;
using Time = std::chrono::system_clock::time_point;
using std::chrono::milliseconds;

constexpr rt::String kPattern = "yyyy-MM-dd HH:mm:ss.SSS"_s;

class LocalTimeFormatterTest : public testing::Test {
 protected:
  LocalTimeFormatterTest() {
    if (const char* const zone = std::getenv("TZ")) zone_ = zone;
  }
  ~LocalTimeFormatterTest() override {
    if (zone_.empty()) {
      unsetenv("TZ");
    } else {
      setenv("TZ", zone_.c_str(), 1);
    }
    tzset();
  }

  // Returns false if the zone database lacks the zone.
  static bool setZone(const char* zone) {
    setenv("TZ", zone, 1);
    return std::filesystem::exists(std::string("/usr/share/zoneinfo/") + zone);
  }

  static Time at(std::int64_t secondsOf1970, int millisecond = 0) {
    return Time(std::chrono::seconds(secondsOf1970) + milliseconds(millisecond));
  }

  std::string text(std::int64_t secondsOf1970, int millisecond = 0) const {
    return std::string(formatter_->stringFromTime(at(secondsOf1970, millisecond)).view());
  }

  rt::Ref<rt::LocalTimeFormatter> formatter_ = rt::LocalTimeFormatter::initWithPattern(kPattern);

 private:
  std::string zone_;
};

TEST_F(LocalTimeFormatterTest, FillsInEveryField) {
  setenv("TZ", "UTC0", 1);
  EXPECT_EQ(text(0), "1970-01-01 00:00:00.000");
  EXPECT_EQ(text(1'795'248'260, 7), "2026-11-21 08:04:20.007");
  EXPECT_EQ(text(1'798'761'599, 999), "2026-12-31 23:59:59.999");
  EXPECT_EQ(text(951'782'400), "2000-02-29 00:00:00.000");
}

TEST_F(LocalTimeFormatterTest, TruncatesToMilliseconds) {
  setenv("TZ", "UTC0", 1);
  const Time time = at(59) + std::chrono::microseconds(999'999);
  EXPECT_EQ(formatter_->stringFromTime(time), "1970-01-01 00:00:59.999");
}

TEST_F(LocalTimeFormatterTest, RoundsDownBefore1970) {
  setenv("TZ", "UTC0", 1);
  EXPECT_EQ(text(0, -1), "1969-12-31 23:59:59.999");
  EXPECT_EQ(text(-1), "1969-12-31 23:59:59.000");
}

TEST_F(LocalTimeFormatterTest, ReadsFieldsAndQuotedText) {
  setenv("TZ", "UTC0", 1);
  const auto format = [](const rt::String& pattern) {
    const rt::Ref<rt::LocalTimeFormatter> formatter = rt::LocalTimeFormatter::initWithPattern(pattern);
    return formatter ? std::string(formatter->stringFromTime(at(3'661, 42)).view()) : "none";
  };
  EXPECT_EQ(format(""_s), "");
  EXPECT_EQ(format("HH"_s), "01");
  EXPECT_EQ(format("SSS SSS"_s), "042 042");
  EXPECT_EQ(format("yyyyMMdd'T'HHmmss"_s), "19700101T010101");
  EXPECT_EQ(format("dd.MM.yyyy, HH 'o''clock' ''"_s), "01.01.1970, 01 o'clock '");
  // A quoted text that ends with an apostrophe used to be printed with two.
  EXPECT_EQ(format("'a'''"_s), "a'");
  EXPECT_EQ(format("'a''''b'HH"_s), "a''b01");
  EXPECT_EQ(format("'''a'"_s), "'a");
  EXPECT_EQ(format("HH \xe2\x80\x94 mm"_s), "01 \xe2\x80\x94 01");
}

TEST_F(LocalTimeFormatterTest, ReturnsNullForInvalidPatterns) {
  for (const rt::String& pattern :
       {rt::String(), "yy"_s, "yyyyy"_s, "EEE"_s, "H"_s, "HH:m"_s, "SS"_s, "SSSS"_s, "'open"_s, "T"_s}) {
    EXPECT_FALSE(rt::LocalTimeFormatter::initWithPattern(pattern)) << pattern.view();
  }
}

TEST_F(LocalTimeFormatterTest, FormatsTheFirstAndLastTimeOfTheClock) {
  setenv("TZ", "UTC0", 1);
  // Clocks of some C++ libraries count nanoseconds, and others microseconds.
  const bool areNanoseconds = std::is_same_v<Time::period, std::nano>;
  EXPECT_TRUE(
      formatter_->stringFromTime(Time::max()).view().starts_with(areNanoseconds ? "2262-" : "294247-"));
  EXPECT_TRUE(
      formatter_->stringFromTime(Time::min()).view().starts_with(areNanoseconds ? "1677-" : "-290308-"));
}

TEST_F(LocalTimeFormatterTest, NoticesAChangeOfTheZoneAtTheNextCall) {
  setenv("TZ", "UTC0", 1);
  EXPECT_EQ(text(0), "1970-01-01 00:00:00.000");
  setenv("TZ", "XYZ-05:30", 1);
  EXPECT_EQ(text(0), "1970-01-01 05:30:00.000");
  setenv("TZ", "ABC+03", 1);
  EXPECT_EQ(text(0), "1969-12-31 21:00:00.000");
  setenv("TZ", "UTC0", 1);
  EXPECT_EQ(text(0), "1970-01-01 00:00:00.000");
}

TEST_F(LocalTimeFormatterTest, UsesTheSystemsZoneAfterTheZoneIsUnset) {
  setenv("TZ", "XYZ-05:30", 1);
  EXPECT_EQ(text(0), "1970-01-01 05:30:00.000");
  unsetenv("TZ");
  std::tm local{};
  const std::time_t second = 0;
  tzset();
  localtime_r(&second, &local);
  char expected[32] = {};
  std::strftime(expected, sizeof expected, "%Y-%m-%d %H:%M:%S.000", &local);
  EXPECT_EQ(text(0), expected);
}

TEST_F(LocalTimeFormatterTest, SwitchesToSummerTimeAndBack) {
  if (!setZone("Europe/Berlin")) GTEST_SKIP() << "the zone database lacks Europe/Berlin";
  EXPECT_EQ(text(1'774'745'999, 999), "2026-03-29 01:59:59.999");
  EXPECT_EQ(text(1'774'746'000), "2026-03-29 03:00:00.000");
  EXPECT_EQ(text(1'792'889'999), "2026-10-25 02:59:59.000");
  EXPECT_EQ(text(1'792'890'000), "2026-10-25 02:00:00.000");
}

TEST_F(LocalTimeFormatterTest, SwitchesInTheSouthernHemisphereAndByHalfAnHour) {
  if (!setZone("Australia/Lord_Howe")) GTEST_SKIP() << "the zone database lacks Australia/Lord_Howe";
  EXPECT_EQ(text(1'775'314'799), "2026-04-05 01:59:59.000");
  EXPECT_EQ(text(1'775'314'800), "2026-04-05 01:30:00.000");
}

TEST_F(LocalTimeFormatterTest, KnowsZonesWithOffsetsThatAreNotWholeHours) {
  if (!setZone("Asia/Kathmandu")) GTEST_SKIP() << "the zone database lacks Asia/Kathmandu";
  EXPECT_EQ(text(1'000'000'000), "2001-09-09 07:31:40.000");
}

TEST_F(LocalTimeFormatterTest, AgreesWithStrftimeOnRandomTimes) {
  std::mt19937_64 random(20261121);
  for (const char* const zone :
       {"Europe/Berlin", "America/New_York", "Pacific/Chatham", "UTC0", "Asia/Kolkata"}) {
    setenv("TZ", zone, 1);
    tzset();
    for (int i = 0; i < 2000; ++i) {
      const auto second = static_cast<std::time_t>(random() % 4'000'000'000);
      const auto millisecond = static_cast<int>(random() % 1000);
      std::tm local{};
      localtime_r(&second, &local);
      char expected[32] = {};
      const std::size_t length = std::strftime(expected, sizeof expected, "%Y-%m-%d %H:%M:%S.", &local);
      std::snprintf(expected + length, sizeof expected - length, "%03d", millisecond);
      ASSERT_EQ(text(second, millisecond), expected) << zone << " " << second;
    }
  }
}

TEST_F(LocalTimeFormatterTest, AllocatesTheTextAndNothingElseWithinASecond) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  text(5);
  const AllocationCount count;
  const rt::String string = formatter_->stringFromTime(at(5, 20));
  EXPECT_EQ(count.allocations(), 1);
}

// Each thread gets the text of the time that it asked for, whatever the others ask.
TEST_F(LocalTimeFormatterTest, ServesAllThreadsAtOnce) {
  setenv("TZ", "UTC0", 1);
  std::vector<std::thread> threads;
  std::atomic<int> wrong = 0;
  for (int thread = 0; thread < 4; ++thread) {
    threads.emplace_back([&, thread] {
      for (int i = 0; i < 2000; ++i) {
        const rt::String string = formatter_->stringFromTime(at(thread * 10 + i % 2, i % 1000));
        char expected[32] = {};
        std::snprintf(expected, sizeof expected, "1970-01-01 00:00:%02d.%03d", thread * 10 + i % 2, i % 1000);
        if (!(string == std::string_view(expected))) ++wrong;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(wrong, 0);
}

// The child used to wait for ever if another thread of the parent was using any formatter during the fork.
TEST_F(LocalTimeFormatterTest, WorksInTheChildOfAFork) {
  setenv("TZ", "UTC0", 1);
  std::atomic<bool> isEnding = false;
  std::thread user([&] {
    for (int second = 0; !isEnding; ++second) formatter_->stringFromTime(at(second, 0));
  });
  for (int i = 0; i < 100; ++i) {
    const pid_t child = fork();
    if (child == 0) _exit(formatter_->stringFromTime(at(5, 7)) == "1970-01-01 00:00:05.007" ? 0 : 1);
    int status = -1;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
  }
  isEnding = true;
  user.join();
}

}  // namespace
