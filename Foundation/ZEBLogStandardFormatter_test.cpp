#include "Foundation/ZEBLogStandardFormatter.h"

#include <gtest/gtest.h>
#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <bit>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <regex>
#include <stdexcept>
#include <string>
#include <thread>

#include "Runtime/Process/Process.h"
#include "Runtime/Process/Thread.h"
#include "Runtime/Text/Format.h"

namespace {

using namespace rt::literals;

std::string line(ZEBLogStandardFormatter& formatter, const rt::String& func, ZEBLogLevel level,
                 const rt::String* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  const rt::String text = formatter.stringForFunc(func, *format, arguments, level);
  va_end(arguments);
  return std::string(text.view());
}

class ZEBLogStandardFormatterTest : public testing::Test {
 protected:
  ZEBLogStandardFormatterTest() {
    if (const char* const zone = std::getenv("TZ")) zone_ = zone;
  }
  ~ZEBLogStandardFormatterTest() override {
    if (zone_.empty()) {
      unsetenv("TZ");
    } else {
      setenv("TZ", zone_.c_str(), 1);
    }
    tzset();
  }

  // Returns a line of the calling thread with the message "7 left".
  std::string line() const { return ::line(*formatter_, "main"_s, 3, &kFormat, 7); }

  // Returns the time in a line, to the second.
  std::string timeNow() const { return line().substr(0, 19); }

  // Returns the text that follows the time in each of these lines.
  static std::string rest() {
    char text[256];
    std::snprintf(text, sizeof text, " %s[%d/0x%lx] [lvl=3] main() 7 left",
                  std::string(rt::Process::name().view()).c_str(), getpid(),
                  std::bit_cast<unsigned long>(pthread_self()));
    return text;
  }

  // Reads the clock that lines use; `std::time` lags behind it.
  static std::time_t now() { return std::chrono::system_clock::to_time_t(std::chrono::system_clock::now()); }

  static std::string utc(std::time_t time) {
    std::tm parts{};
    gmtime_r(&time, &parts);
    char text[64];
    std::strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &parts);
    return text;
  }

  static constexpr rt::String kFormat = "%d left"_s;
  const rt::Ref<ZEBLogStandardFormatter> formatter_ = ZEBLogStandardFormatter::init();

 private:
  std::string zone_;
};

TEST_F(ZEBLogStandardFormatterTest, ShowsTimeProcessThreadLevelFunctionAndMessage) {
  setenv("TZ", "UTC0", 1);
  const std::time_t before = now();
  const std::string text = line();
  const std::time_t after = now();
  std::smatch time;
  ASSERT_TRUE(std::regex_search(text, time, std::regex(R"(^(\d{4}-\d\d-\d\d \d\d:\d\d:\d\d)\.\d{3}(?= ))")))
      << text;
  EXPECT_LE(utc(before), time[1].str());
  EXPECT_GE(utc(after), time[1].str());
  EXPECT_EQ(text.substr(23), rest());
}

// The formatter puts the line together by hand. The line must be what this format makes.
TEST_F(ZEBLogStandardFormatterTest, MakesWhatItsFormatWouldMake) {
  for (const ZEBLogLevel level : {-1, 0, 4, 2'147'483'647}) {
    const std::string text = ::line(*formatter_, "-[A b]"_s, level, &kFormat, -3);
    const rt::String expected = rt::format(
        "%@ %@[%d/%p] [lvl=%d] %@ %@"_s, rt::String::fromUTF8(text.substr(0, 23)), rt::Process::name(),
        rt::Process::identifier(), rt::Thread::currentHandle(), level, "-[A b]"_s, "-3 left"_s);
    EXPECT_EQ(text, expected.view());
  }
}

TEST_F(ZEBLogStandardFormatterTest, ShowsTheThreadThatLogs) {
  std::string text;
  std::string expected;
  std::thread([&] {
    text = line().substr(23);
    expected = rest();
  }).join();
  EXPECT_EQ(text, expected);
  EXPECT_NE(text, rest());
}

TEST_F(ZEBLogStandardFormatterTest, FormatsALongMessage) {
  const rt::String message = rt::String::fromUTF8(std::string(100'000, 'x'));
  const rt::String format = "%@"_s;
  const std::string text = ::line(*formatter_, nullptr, 1, &format, message.object());
  EXPECT_TRUE(text.ends_with("[lvl=1] (unknown) " + std::string(message.view())));
}

TEST_F(ZEBLogStandardFormatterTest, ShowsAMissingMessageAsNull) {
  const rt::String none;
  EXPECT_TRUE(::line(*formatter_, nullptr, 4, &none).ends_with(" [lvl=4] (unknown) (null)"));
  EXPECT_TRUE(formatter_->stringForFunc("f"_s, "text"_s, nullptr, 4).hasSuffix(" [lvl=4] f() (null)"));
}

TEST_F(ZEBLogStandardFormatterTest, ThrowsWhatADescriptionThrows) {
  class Throwing final : public rt::Implements<Throwing, rt::Object> {
   public:
    rt::String description() const override { throw std::runtime_error("no description"); }
  };
  const rt::Ref<rt::Object> object = rt::make<Throwing>();
  const rt::String format = "%@"_s;
  EXPECT_THROW(::line(*formatter_, nullptr, 4, &format, object.get()), std::runtime_error);
  EXPECT_TRUE(line().ends_with("7 left"));
}

TEST_F(ZEBLogStandardFormatterTest, UsesTheCurrentTimeZone) {
  // Tries again if the second changes in the middle.
  for (int attempt = 0; attempt < 100; ++attempt) {
    setenv("TZ", "UTC0", 1);
    const std::time_t before = now();
    const std::string here = timeNow();
    setenv("TZ", "XYZ-05:30", 1);
    const std::string east = timeNow();
    setenv("TZ", "ABC+03", 1);
    const std::string west = timeNow();
    if (now() != before) continue;
    EXPECT_EQ(here, utc(before));
    EXPECT_EQ(east, utc(before + 19'800));
    EXPECT_EQ(west, utc(before - 10'800));
    return;
  }
  FAIL() << "no second was long enough";
}

// Uses a zone whose summer time begins in a moment, and logs until it has begun. Tries again if no line came
// before the change, because the process was held up.
TEST_F(ZEBLogStandardFormatterTest, FollowsTheBeginningOfSummerTime) {
  for (int attempt = 0, lines = 0; lines == 0; ++attempt) {
    ASSERT_LT(attempt, 20);
    const std::time_t change = now() + 2;
    std::tm parts{};
    gmtime_r(&change, &parts);
    char zone[64];
    std::snprintf(zone, sizeof zone, "AAA0BBB,%d/%02d:%02d:%02d,%d/0", parts.tm_yday, parts.tm_hour,
                  parts.tm_min, parts.tm_sec, (parts.tm_yday + 180) % 365);
    setenv("TZ", zone, 1);
    const auto local = [&](std::time_t time) { return utc(time < change ? time : time + 3600); };
    std::time_t before = 0;
    std::time_t after = 0;
    do {
      before = now();
      const std::string time = timeNow();
      after = now();
      ASSERT_LE(local(before), time) << zone;
      ASSERT_GE(local(after), time) << zone;
      if (before < change) ++lines;
    } while (before < change);
  }
}

// All threads share a formatter. The time in a line is never a mixture of two.
TEST_F(ZEBLogStandardFormatterTest, IsThreadSafe) {
  setenv("TZ", "UTC0", 1);
  std::vector<std::thread> threads;
  threads.reserve(8);
  for (int thread = 0; thread < 8; ++thread) {
    threads.emplace_back([&] {
      const std::string expected = rest();
      for (int i = 0; i < 500; ++i) {
        const std::string text = line();
        ASSERT_EQ(text.substr(23), expected);
        std::string shape = text.substr(0, 23);
        std::ranges::replace_if(shape, [](char c) { return c >= '0' && c <= '9'; }, '0');
        ASSERT_EQ(shape, "0000-00-00 00:00:00.000") << text;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
