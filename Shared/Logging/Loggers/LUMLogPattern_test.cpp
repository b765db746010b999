#include "Shared/Logging/Loggers/LUMLogPattern.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstdlib>
#include <ctime>
#include <map>
#include <random>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLog.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSpan.h"
#include "Shared/Logging/Loggers/LUMLogCapture.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/ClockHook.h"
#include "tests/support/ForkTest.h"

namespace {

using namespace rt::literals;

// The time of the messages that are made while one of these exists.
class Time {
 public:
  explicit Time(std::int64_t second, long nanosecond = 0) {
    second_ = second;
    nanosecond_ = nanosecond;
    clockHook = [](clockid_t clock, timespec& time) {
      if (clock == CLOCK_REALTIME) time = {second_, nanosecond_};
    };
  }
  Time(const Time&) = delete;
  Time& operator=(const Time&) = delete;
  ~Time() { clockHook = nullptr; }

  // Returns the time that messages have, or 0 if nothing changes the clock.
  static std::int64_t now() {
    return clockHook.load() == nullptr ? 0 : (second_ * 1'000'000'000) + nanosecond_;
  }

 private:
  static inline std::atomic<std::int64_t> second_;
  static inline std::atomic<long> nanosecond_;
};

struct Parts {
  LUMLogLevel level = LUMLogLevelInfo;
  rt::String text = "text"_s;
  rt::String file = "/a/b/Importer.cpp"_s;
  rt::String function = "void run()"_s;
  std::uint64_t line = 42;
  rt::String thread = "main"_s;
  rt::String queue = "work"_s;
  rt::Ref<LUMLogCallstack> callstack = nullptr;
  rt::Ref<LUMLogMetadata> metadata = nullptr;
};

rt::Ref<LUMLogMessage> message(const Parts& parts = {}) {
  for (;;) {
    rt::Ref<LUMLogMessage> made = LUMLogMessage::initWithLevel(
        parts.level, parts.text, parts.text, parts.file, parts.function, parts.line, parts.thread,
        parts.queue, parts.callstack, nullptr, parts.metadata);
    // Messages see a change of the clock after a millisecond.
    if (Time::now() == 0 || made->time() == Time::now()) return made;
  }
}

rt::Ref<LUMLogPattern> pattern(std::string_view text) {
  return LUMLogPattern::initWithPattern(rt::String::fromUTF8(text));
}

std::string lineOf(std::string_view text, const LUMLogMessage& message,
                   LUMLogLine::Caller caller = LUMLogLine::Caller::kThread) {
  std::array<char, 8192> place{};
  LUMLogLine line(place, caller);
  pattern(text)->appendLine(line, message);
  EXPECT_TRUE(line.isComplete());
  return std::string(line.text());
}

std::string lineOf(std::string_view text, const Parts& parts = {}) {
  return lineOf(text, *message(parts));
}

rt::Ref<LUMLogMetadata> metadata(
    std::initializer_list<std::pair<rt::Ref<rt::Object>, rt::Ref<rt::Object>>> entries) {
  return LUMLogMetadata::initWithProperties(rt::Dictionary::of(entries));
}

std::string errorOf(const rt::String& text) {
  try {
    LUMLogPattern::initWithPattern(text);
  } catch (const std::invalid_argument& error) {
    return error.what();
  }
  return "no error";
}

TEST(LUMLogPattern, HasTheFieldsOfAMessage) {
  Parts parts;
  parts.metadata = LUMLogMetadata::metadataWithComponent("Importer"_s)->metadataByAddingCategory("net"_s);
  EXPECT_EQ(lineOf("{level} {component} {category} {thread} {queue} {text}", parts),
            "info Importer net main work text");
  EXPECT_EQ(lineOf("{file} {path} {line} {function}", parts), "Importer.cpp /a/b/Importer.cpp 42 void run()");
  EXPECT_EQ(lineOf("{tid}", parts), std::to_string(message()->threadIdentifier()));
}

TEST(LUMLogPattern, LeavesWhatAMessageDoesNotHaveEmpty) {
  Parts parts;
  parts.text = parts.file = parts.function = parts.queue = nullptr;
  parts.line = 0;
  EXPECT_EQ(lineOf("[{text}{file}{path}{function}{queue}{component}{category}{fields}{stack}] {line}", parts),
            "[] 0");
  parts.metadata = metadata({{LUMLogMetadata::kComponentKey, rt::Number::of(7)}});
  EXPECT_EQ(lineOf("[{component}]", parts), "[]");
}

TEST(LUMLogPattern, NamesTheLevels) {
  std::string names;
  for (const LUMLogLevel level : {0U, 1U, 2U, 3U, 4U, 5U}) {
    Parts parts;
    parts.level = level;
    names += lineOf("{level} ", parts);
  }
  EXPECT_EQ(names, "0 debug info error fault 5 ");
}

TEST(LUMLogPattern, NamesAThreadByItsNumberIfItHasNoName) {
  Parts parts;
  parts.thread = ""_s;
  EXPECT_EQ(lineOf("{thread}", parts), std::to_string(message()->threadIdentifier()));
}

TEST(LUMLogPattern, HasBraces) {
  EXPECT_EQ(lineOf("{{{level}}} {{}} }}{{"), "{info} {} }{");
}

TEST(LUMLogPattern, FillsUpToAWidthInCharacters) {
  EXPECT_EQ(lineOf("[{level:<6}] [{level:>6}] [{level:<4}] [{level:>3}]"), "[info  ] [  info] [info] [info]");
  Parts parts;
  parts.text = "\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80"_s;
  EXPECT_EQ(lineOf("[{text:<5}] [{text:>5}]", parts),
            "[\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80  ] [  \xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80]");
  const std::string longText(3000, 'x');
  parts.text = rt::String::fromUTF8(longText);
  EXPECT_EQ(lineOf("{text:<255}|{text:>255}", parts), longText + "|" + longText);
}

TEST(LUMLogPattern, KeepsAMessageOnOneLine) {
  Parts parts;
  parts.text = "a\nb\x1B[31m"_s;
  parts.file = "x/\ny"_s;
  parts.function = "\r"_s;
  parts.thread = parts.queue = "\t"_s;
  parts.metadata = metadata({{LUMLogMetadata::kComponentKey, "\a"_s}, {"k\n"_s, "v\n"_s}});
  EXPECT_EQ(lineOf("{text} {file} {path} {function} {thread} {queue} {component} {fields}", parts),
            "a\\nb\\x1b[31m \\ny x/\\ny \\x0d \\t \\t \\x07 k\\n=v\\n");
}

TEST(LUMLogPattern, SortsFieldsAndQuotesValues) {
  Parts parts;
  parts.metadata = metadata({{"user"_s, "ann"_s},
                             {"bytes"_s, rt::Number::of(42)},
                             {"empty"_s, ""_s},
                             {"space"_s, "a b"_s},
                             {"quote"_s, "say \"a\\b\""_s},
                             {"equal"_s, "a=b"_s},
                             {"a key"_s, "\\"_s},
                             {rt::Number::of(1), "no name"_s},
                             {LUMLogMetadata::kComponentKey, "c"_s},
                             {LUMLogMetadata::kCategoryKey, "c"_s},
                             {LUMLogMetadata::kCauseKey, "c"_s},
                             {LUMLogMetadata::kObfuscatedKiriIDKey, "c"_s}});
  EXPECT_EQ(lineOf("{fields}", parts),
            R"("a key"=\ bytes=42 empty="" equal="a=b" quote="say \"a\\b\"" space="a b" user=ann)");
}

TEST(LUMLogPattern, SortsAnyNumberOfFields) {
  for (const int count : {15, 16, 17, 32, 33, 100}) {
    std::map<std::string, int> sorted;
    rt::Dictionary::Builder builder;
    for (int i = 0; i < count; ++i) {
      const std::string key = "k" + std::to_string(i * 7919 % 1000);
      sorted[key] = i;
      builder.set(rt::String::fromUTF8(key), rt::Number::of(i));
    }
    std::string expected;
    for (const auto& [key, value] : sorted) {
      if (!expected.empty()) expected += ' ';
      expected += key + "=" + std::to_string(value);
    }
    Parts parts;
    parts.metadata = LUMLogMetadata::initWithProperties(builder.dictionary());
    EXPECT_EQ(lineOf("{fields}", parts), expected);
  }
}

TEST(LUMLogPattern, LeavesOutTheSpaceBeforeFieldsAndAStackThatAreEmpty) {
  EXPECT_EQ(lineOf("{text} {fields}"), "text");
  EXPECT_EQ(lineOf("{text}  {fields} {stack} {level}"), "text  info");
  Parts parts;
  parts.metadata = metadata({{"a"_s, "b"_s}});
  EXPECT_EQ(lineOf("{text} {fields} {level}", parts), "text a=b info");
}

TEST(LUMLogPattern, HasTheCallStack) {
  Parts parts;
  const rt::Ref<LUMLogAddressCallstack> stack = LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(0);
  parts.callstack = stack;
  EXPECT_EQ(lineOf("{text} {stack}", parts),
            "text " + std::string(message(parts)->callstack()->asObject()->description().view()));
}

TEST(LUMLogPattern, HasTheTimeInUtc) {
  const Time time(1'000'000'000, 123'456'789);
  EXPECT_EQ(lineOf("{utc:%Y-%m-%d %H:%M:%S %3f %6f %9f %z%% 7}"),
            "2001-09-09 01:46:40 123 123456 123456789 +0000% 7");
  EXPECT_EQ(lineOf("{utc}"), "2001-09-09T01:46:40.123Z");
}

TEST(LUMLogPattern, AgreesWithTheSystemOnDates) {
  // Ends of years, months and leap days, also before 1970, and random seconds.
  std::vector<std::int64_t> seconds = {0,
                                       -1,
                                       68'169'599,
                                       951'782'400,
                                       951'868'799,
                                       951'868'800,
                                       3'976'214'400,
                                       -2'203'977'600,
                                       4'000'000'000,
                                       -4'000'000'000};
  std::mt19937_64 random(17);
  std::uniform_int_distribution<std::int64_t> anySecond(-4'000'000'000, 4'000'000'000);
  for (int i = 0; i < 2000; ++i) seconds.push_back(anySecond(random));
  for (const std::int64_t second : seconds) {
    const Time time(second, 999'999'999);
    const std::time_t given = second;
    std::tm parts{};
    gmtime_r(&given, &parts);
    std::array<char, 64> expected{};
    std::strftime(expected.data(), expected.size(), "%Y-%m-%d %H:%M:%S", &parts);
    EXPECT_EQ(lineOf("{utc:%Y-%m-%d %H:%M:%S.%3f}"), std::string(expected.data()) + ".999");
  }
}

TEST(LUMLogPattern, HasTheLocalTimeOfTheZone) {
  struct Case {
    const char* zone;
    std::int64_t second;
    const char* expected;
  };
  // Zones as POSIX writes them need no files. Each case is in a quarter of an hour of its own.
  const Case cases[] = {
      {"UTC0", 1'000'000'000, "2001-09-09 01:46:40 +0000"},
      {"IST-5:30", 1'000'001'000, "2001-09-09 07:33:20 +0530"},
      {"NST3:30", 1'000'002'000, "2001-09-08 22:50:00 -0330"},
      {"NPT-5:45", 1'000'003'000, "2001-09-09 08:21:40 +0545"},
      {"LINT-14", 1'000'004'000, "2001-09-09 16:53:20 +1400"},
      {"AoE12", 1'000'005'000, "2001-09-08 15:10:00 -1200"},
      // The clocks go forward by an hour, and back, at 01:00 UTC.
      {"CET-1CEST,M3.5.0,M10.5.0/3", 1'616'893'199, "2021-03-28 01:59:59 +0100"},
      {"CET-1CEST,M3.5.0,M10.5.0/3", 1'616'893'200, "2021-03-28 03:00:00 +0200"},
      {"CET-1CEST,M3.5.0,M10.5.0/3", 1'635'641'999, "2021-10-31 02:59:59 +0200"},
      {"CET-1CEST,M3.5.0,M10.5.0/3", 1'635'642'000, "2021-10-31 02:00:00 +0100"},
  };
  const char* const before = std::getenv("TZ");
  const std::string kept = before != nullptr ? before : "";
  for (const Case& each : cases) {
    setenv("TZ", each.zone, 1);
    const Time time(each.second, 5'000'000);
    EXPECT_EQ(lineOf("{time:%Y-%m-%d %H:%M:%S %z}"), each.expected) << each.zone;
    EXPECT_EQ(lineOf("{time}"), std::string(each.expected).substr(0, 19) + ".005") << each.zone;
    EXPECT_EQ(lineOf("{utc:%z}"), "+0000");
  }
  if (before != nullptr) {
    setenv("TZ", kept.c_str(), 1);
  } else {
    unsetenv("TZ");
  }
  tzset();
}

TEST(LUMLogPattern, KnowsAChangeOfTheZoneInTheNextQuarterOfAnHour) {
  setenv("TZ", "AAA-1", 1);
  constexpr std::int64_t kQuarter = 1'100'000'700;  // the start of one
  static_assert(kQuarter % 900 == 0);
  const std::string first = [] {
    const Time time(kQuarter);
    return lineOf("{time:%z}");
  }();
  EXPECT_EQ(first, "+0100");
  setenv("TZ", "BBB-2", 1);
  {
    const Time time(kQuarter + 899);
    EXPECT_EQ(lineOf("{time:%z}"), "+0100");
  }
  {
    const Time time(kQuarter + 900);
    EXPECT_EQ(lineOf("{time:%z}"), "+0200");
  }
  unsetenv("TZ");
  tzset();
}

TEST(LUMLogPattern, UsesTheLastOffsetInASignalHandler) {
  setenv("TZ", "AAA-1", 1);
  {
    const Time time(1'200'000'000);
    EXPECT_EQ(lineOf("{time:%z}"), "+0100");
  }
  setenv("TZ", "BBB-2", 1);
  const Time time(1'300'000'000);
  EXPECT_EQ(lineOf("{time:%z}", *message(), LUMLogLine::Caller::kSignalHandler), "+0100");
  EXPECT_EQ(lineOf("{time:%z}"), "+0200");
  unsetenv("TZ");
  tzset();
}

// A pattern keeps the text of a second.
TEST(LUMLogPattern, HasTheRightTimeWhateverTheOrderOfTheSeconds) {
  const rt::Ref<LUMLogPattern> used = pattern("{utc} {time} {utc:%S} {time:%H%M%9f}");
  constexpr std::int64_t kStart = 1'650'000'000;
  for (const int distance : {0, 0, 1, 0, 1, 2, 1, 59, 3600, 0, -1, 86'400}) {
    for (const long nanosecond : {0, 999'999'999}) {
      const Time time(kStart + distance, nanosecond);
      const rt::Ref<LUMLogMessage> given = message();
      EXPECT_EQ(used->formattedLogMessage(*given).view(),
                lineOf("{utc} {time} {utc:%S} {time:%H%M%9f}", *given));
    }
  }
}

TEST(LUMLogPattern, KeepsNoTimeOfASignalHandler) {
  setenv("TZ", "AAA-1", 1);
  const rt::Ref<LUMLogPattern> used = pattern("{time:%z}");
  {
    const Time time(1'210'000'000);
    EXPECT_EQ(used->formattedLogMessage(*message()), "+0100");
  }
  setenv("TZ", "BBB-2", 1);
  const Time time(1'310'000'000);
  const rt::Ref<LUMLogMessage> given = message();
  std::array<char, 16> place{};
  LUMLogLine line(place, LUMLogLine::Caller::kSignalHandler);
  used->appendLine(line, *given);
  EXPECT_EQ(line.text(), "+0100");
  EXPECT_EQ(used->formattedLogMessage(*given), "+0200");
  unsetenv("TZ");
  tzset();
}

TEST(LUMLogPattern, HasDescriptionsOfObjectsExceptInASignalHandler) {
  Parts parts;
  const rt::Ref<rt::Array> array = rt::Array::of("a"_s);
  parts.metadata = metadata({{"list"_s, array}, {"n"_s, rt::Number::of(2)}, {"s"_s, "t"_s}});
  EXPECT_NE(lineOf("{fields}", parts).find(R"(list=)"), std::string::npos);
  EXPECT_EQ(lineOf("{fields}", *message(parts), LUMLogLine::Caller::kSignalHandler),
            "list=[" + std::string(array->classInfo().name) + "] n=2 s=t");
}

TEST(LUMLogPattern, ChecksThePattern) {
  const std::string fields =
      "there are time, utc, level, component, category, thread, tid, queue, file, path, line, function, "
      "text, "
      "fields, stack";
  const std::string parts =
      "is no part of a time; there are %Y, %m, %d, %H, %M, %S, %3f, %6f, %9f, %z and %%";
  const std::pair<std::string, std::string> cases[] = {
      {"", "column 1: the pattern is empty"},
      {"{time} {lvel}", "column 8: there is no field 'lvel'; do you mean 'level'?"},
      {"{levle}", "column 1: there is no field 'levle'; do you mean 'level'?"},
      {"{Text}", "column 1: there is no field 'Text'; do you mean 'text'?"},
      {"{message}", "column 1: there is no field 'message'; " + fields},
      {"{" + std::string(100, 'x') + "}",
       "column 1: there is no field '" + std::string(100, 'x') + "'; " + fields},
      {"ab {}", "column 4: a field without a name; a field is for example {text}"},
      {"{:<5}", "column 1: a field without a name; a field is for example {text}"},
      {"ab {text", "column 4: this '{' has no '}'; write '{{' for a brace"},
      {"{text {level}", "column 1: this '{' has no '}'; write '{{' for a brace"},
      {"{", "column 1: this '{' has no '}'; write '{{' for a brace"},
      {"{text}}", "column 7: this '}' ends no field; write '}}' for a brace"},
      {"{text:5}", "column 7: '5' is no width; write for example '<5' or '>5'"},
      {"{text:}", "column 7: '' is no width; write for example '<5' or '>5'"},
      {"{text:<}", "column 7: '<' is no width; write for example '<5' or '>5'"},
      {"{text:<0}", "column 7: '<0' is no width; write for example '<5' or '>5'"},
      {"{text:>-1}", "column 7: '>-1' is no width; write for example '<5' or '>5'"},
      {"{text:<5x}", "column 7: '<5x' is no width; write for example '<5' or '>5'"},
      {"{text:<256}", "column 7: a width is at most 255"},
      {"{text:<99999999999999999999}", "column 7: a width is at most 255"},
      {"{time:}", "column 7: a time without a format; write for example {time:%H:%M:%S}"},
      {"{utc:%H:%q}", "column 9: '%q' " + parts},
      {"{utc:%H%}", "column 8: '%' " + parts},
      {"{utc:%3}", "column 6: '%3' " + parts},
      {"{utc:%3d}", "column 6: '%3d' " + parts},
      {"{utc:%4f}", "column 6: '%4' " + parts},
      {"{utc:" + std::string(97, '-') + "}", "column 102: a time has at most 96 characters"},
      {"{utc:" + std::string(95, '-') + "%m}", "column 101: a time has at most 96 characters"},
      {"a\nb", "column 2: a control character; a message is one line"},
      {"{utc:%H\x1B}", "column 8: a control character; a message is one line"},
      {"\x7F", "column 1: a control character; a message is one line"},
  };
  for (const auto& [text, error] : cases) EXPECT_EQ(errorOf(rt::String::fromUTF8(text)), error) << text;
  EXPECT_EQ(errorOf(nullptr), "column 1: the pattern is empty");
  EXPECT_EQ(errorOf("\t{text:<255}"_s), "no error");
  EXPECT_EQ(errorOf(rt::String::fromUTF8("{utc:" + std::string(92, '-') + "%Y}")), "no error");
}

TEST(LUMLogPattern, AgreesWithASimpleModelOnRandomPatterns) {
  std::mt19937 random(1717);
  const auto below = [&](unsigned limit) { return static_cast<unsigned>(random() % limit); };
  const std::string_view alphabet[] = {"a", " ", "\n", "\xC3\xA4", "\"", "=", "{", "}", "%", "\x01", "\\"};
  const auto randomText = [&] {
    std::string text;
    for (unsigned count = below(12); count > 0; --count) text += alphabet[below(std::size(alphabet))];
    return text;
  };
  const auto escaped = [](const std::string& text) {
    std::string result;
    for (const char character : text) {
      if (character == '\n') {
        result += "\\n";
      } else if (character == '\x01') {
        result += "\\x01";
      } else {
        result += character;
      }
    }
    return result;
  };
  const auto width = [](const std::string& text) {
    std::size_t count = 0;
    for (const char character : text) count += (static_cast<unsigned char>(character) >> 6) != 2 ? 1 : 0;
    return count;
  };
  for (int round = 0; round < 2000; ++round) {
    const std::string text = randomText();
    const std::string component = randomText();
    Parts parts;
    parts.text = rt::String::fromUTF8(text);
    parts.line = random();
    parts.metadata = LUMLogMetadata::metadataWithComponent(rt::String::fromUTF8(component));
    std::string patternText = "|";
    std::string expected = "|";
    for (unsigned count = below(8); count > 0; --count) {
      std::string value;
      switch (below(5)) {
        case 0:
          patternText += "{{";
          expected += "{";
          continue;
        case 1:
          patternText += "}}-\xE2\x82\xAC";
          expected += "}-\xE2\x82\xAC";
          continue;
        case 2:
          patternText += "{text";
          value = escaped(text);
          break;
        case 3:
          patternText += "{component";
          value = escaped(component);
          break;
        default:
          patternText += "{line";
          value = std::to_string(parts.line);
          break;
      }
      if (below(2) == 0) {
        const unsigned wanted = 1 + below(20);
        const bool isRight = below(2) == 0;
        patternText += std::string(isRight ? ":>" : ":<") + std::to_string(wanted);
        const std::string spaces(wanted > width(value) ? wanted - width(value) : 0, ' ');
        value = isRight ? spaces + value : value + spaces;
      }
      patternText += "}";
      expected += value;
    }
    EXPECT_EQ(lineOf(patternText, parts), expected) << patternText;
  }
}

TEST(LUMLogPattern, CountsTheLengthOfALineThatDoesNotFit) {
  Parts parts;
  parts.metadata = metadata({{"user"_s, "ann"_s}});
  const rt::Ref<LUMLogMessage> given = message(parts);
  const rt::Ref<LUMLogPattern> formatter = pattern("{utc} {level:<7} {line:>9} {text} {fields}");
  std::array<char, 200> place{};
  LUMLogLine whole(place);
  formatter->appendLine(whole, *given);
  for (std::size_t size = 0; size < whole.length(); ++size) {
    LUMLogLine line(std::span<char>(place).subspan(100, size));
    formatter->appendLine(line, *given);
    EXPECT_EQ(line.length(), whole.length());
    EXPECT_EQ(line.text(), whole.text().substr(0, size));
  }
}

TEST(LUMLogPattern, AllocatesNothing) {
  Parts parts;
  parts.metadata = metadata({{LUMLogMetadata::kComponentKey, "c"_s}, {"a"_s, "b c"_s}});
  const rt::Ref<LUMLogMessage> given = message(parts);
  const rt::Ref<LUMLogPattern> formatter = pattern(
      "{time} {utc:%9f} {level:<5} {component:>9} {category} {thread} {tid} {queue} {file} {path} "
      "{line:>4} {function} {text} {fields} {stack}");
  std::array<char, 1000> place{};
  {
    // Asks the system for the offset of this quarter of an hour.
    LUMLogLine line(place);
    formatter->appendLine(line, *given);
  }
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  for (const auto caller : {LUMLogLine::Caller::kThread, LUMLogLine::Caller::kSignalHandler}) {
    LUMLogLine line(place, caller);
    formatter->appendLine(line, *given);
  }
  EXPECT_EQ(count.allocations(), 0);
}

// Invariant: whichever thread asks for the offset first, all render the same line.
TEST(LUMLogPattern, IsSharedByThreads) {
  const rt::Ref<LUMLogPattern> formatter = LUMLogPattern::init();
  const rt::Ref<LUMLogMessage> first = [] {
    const Time time(1'400'000'000);
    return message();
  }();
  const rt::Ref<LUMLogMessage> second = [] {
    const Time time(1'400'100'000);
    return message();
  }();
  const rt::String firstLine = formatter->formattedLogMessage(*first);
  const rt::String secondLine = formatter->formattedLogMessage(*second);
  std::atomic<int> mistakes = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < 500; ++round) {
        if (formatter->formattedLogMessage(*first) != firstLine) ++mistakes;
        if (formatter->formattedLogMessage(*second) != secondLine) ++mistakes;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(mistakes, 0);
}

TEST(LUMLogPattern, WorksInTheChildOfAFork) {
  const rt::Ref<LUMLogMessage> given = [] {
    const Time time(1'500'000'000);
    return message();
  }();
  const rt::Ref<LUMLogPattern> formatter = LUMLogPattern::init();
  const rt::String expected = formatter->formattedLogMessage(*given);
  const Time later(1'600'000'000);
  EXPECT_EQ(statusOfChild([&] {
              formatter->formattedLogMessage(*message());  // asks the system
              return formatter->formattedLogMessage(*given) == expected ? 0 : 1;
            }),
            0);
}

TEST(LUMLogPattern, HasAUsualPattern) {
  const Time time(1'000'000'000, 5'000'000);
  Parts parts;
  parts.metadata = metadata({{LUMLogMetadata::kComponentKey, "Importer"_s}, {"user"_s, "ann"_s}});
  const rt::Ref<LUMLogMessage> given = message(parts);
  const std::string line(LUMLogPattern::init()->formattedLogMessage(*given).view());
  EXPECT_EQ(line, lineOf("{time}", *given) + " info  [Importer] main Importer.cpp:42 text user=ann");
}

TEST(LUMLogPattern, LeavesTheIdentifiersAndTimesOfSpansToPrograms) {
  const LUMLogCapture capture;
  {
    const LUMLogSpan span(LUMLogLevelError, "import"_s, LUMLogField("span", "import"_s), LUMLogField("n", 1));
    LUMLogAt(LUMLogLevelError, "text"_s);
  }
  const std::vector<rt::Ref<LUMLogMessage>> messages = capture.messages();
  ASSERT_EQ(messages.size(), 2U);
  const rt::Ref<LUMLogPattern> pattern = LUMLogPattern::initWithPattern("{level} {fields}"_s);
  for (const rt::Ref<LUMLogMessage>& message : messages)
    EXPECT_EQ(pattern->formattedLogMessage(*message), "error n=1 span=import");
}

}  // namespace
