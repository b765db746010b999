#include "Shared/Logging/Loggers/LUMLogLine.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdio>
#include <limits>
#include <stdexcept>
#include <string>
#include <string_view>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Array.h"
#include "Runtime/Values/Number.h"
#include "tests/support/AllocationCount.h"

namespace {

using namespace rt::literals;

// What `append` appends to an empty line.
template <class Append>
std::string lineOf(Append append, LUMLogLine::Caller caller = LUMLogLine::Caller::kThread) {
  std::array<char, 256> place{};
  LUMLogLine line(place, caller);
  append(line);
  EXPECT_TRUE(line.isComplete());
  EXPECT_EQ(line.length(), line.text().size());
  return std::string(line.text());
}

std::string escaped(std::string_view text) {
  return lineOf([&](LUMLogLine& line) { line.appendEscaped(text); });
}

std::string textOf(const rt::Ref<rt::Object>& object,
                   LUMLogLine::Caller caller = LUMLogLine::Caller::kThread) {
  return lineOf(
      [&](LUMLogLine& line) {
        line.withTextOf(object.get(), [&](std::string_view text) { line.append(text); });
      },
      caller);
}

class Mute : public rt::Implements<Mute, rt::Object> {
 public:
  static constexpr std::string_view kClassName = "Mute";
  rt::String description() const override { throw std::runtime_error("no"); }
};

TEST(LUMLogLine, IsEmptyAtFirst) {
  EXPECT_EQ(lineOf([](LUMLogLine&) {}), "");
}

TEST(LUMLogLine, AppendsBytes) {
  EXPECT_EQ(lineOf([](LUMLogLine& line) {
              line.append("ab\n");
              line.append('c');
              line.append(3, '.');
              line.append("");
            }),
            "ab\nc...");
}

TEST(LUMLogLine, KeepsWhatFitsAndCountsTheRest) {
  std::array<char, 5> place{};
  LUMLogLine line(place);
  line.append("abc");
  EXPECT_TRUE(line.isComplete());
  line.append("def");
  EXPECT_FALSE(line.isComplete());
  line.append("ghi");
  line.append(2, '.');
  line.append('!');
  EXPECT_EQ(line.text(), "abcde");
  EXPECT_EQ(line.length(), 12U);
}

TEST(LUMLogLine, EscapesControlCharacters) {
  EXPECT_EQ(escaped(""), "");
  EXPECT_EQ(escaped("plain \\ \xC3\xA4"), "plain \\ \xC3\xA4");
  EXPECT_EQ(escaped("\na\n\tb\r\x1B[31m\x7F"), "\\na\\n\\tb\\x0d\\x1b[31m\\x7f");
  EXPECT_EQ(escaped(std::string_view("\0", 1)), "\\x00");
}

// A terminal takes U+009B for the beginning of a command.
TEST(LUMLogLine, EscapesControlCharactersBeyondASCII) {
  EXPECT_EQ(escaped("a\xC2\x9B"
                    "31m\xC2\x80\xC2\x9F"),
            "a\\x9b31m\\x80\\x9f");
  EXPECT_EQ(escaped("\xC2\xA0 \xC2\xA9 2026"), "\xC2\xA0 \xC2\xA9 2026");
  EXPECT_EQ(escaped("\xC2"), "\xC2");
  for (std::size_t before = 0; before < 20; ++before) {
    const std::string text = std::string(before, 'x') + "\xC2\x9B" + std::string(9, 'y');
    EXPECT_EQ(escaped(text), std::string(before, 'x') + "\\x9b" + std::string(9, 'y'));
  }
}

TEST(LUMLogLine, FindsControlCharactersWhereverTheyAre) {
  constexpr std::size_t kLength = 19;
  for (int code = 0; code < 256; ++code) {
    for (const char around : {'a', ' ', '~', '\xC3', '\xA0'}) {
      std::string expected(1, static_cast<char>(code));
      if (code < 0x20 || code == 0x7F) {
        expected = code == '\n' ? "\\n" : "\\t";
        if (code != '\n' && code != '\t') {
          std::array<char, 5> digits{};
          std::snprintf(digits.data(), digits.size(), "\\x%02x", static_cast<unsigned>(code));
          expected = digits.data();
        }
      }
      for (std::size_t position = 0; position < kLength; ++position) {
        std::string text(kLength, around);
        text[position] = static_cast<char>(code);
        EXPECT_EQ(escaped(text),
                  std::string(position, around) + expected + std::string(kLength - position - 1, around));
      }
    }
  }
}

TEST(LUMLogLine, AppendsNumbers) {
  EXPECT_EQ(lineOf([](LUMLogLine& line) {
              line.appendNumber(std::numeric_limits<std::int64_t>::min());
              line.append(' ');
              line.appendNumber(0);
              line.append(' ');
              line.appendUnsigned(~0ULL);
              line.append(' ');
              line.appendUnsigned(7, 3);
              line.append(' ');
              line.appendUnsigned(1234, 3);
            }),
            "-9223372036854775808 0 18446744073709551615 007 1234");
}

TEST(LUMLogLine, HasTheTextOfAnObject) {
  EXPECT_EQ(textOf("a b"_s), "a b");
  EXPECT_EQ(textOf(nullptr), "(null)");
  EXPECT_EQ(textOf(rt::Number::of(1.5)), "1.5");
  EXPECT_EQ(textOf(rt::make<Mute>()), "(no description)");
  const rt::Ref<rt::Array> array = rt::Array::of("a"_s);
  EXPECT_EQ(textOf(array), array->description().view());
}

TEST(LUMLogLine, AsksForNoDescriptionInASignalHandler) {
  constexpr auto kHandler = LUMLogLine::Caller::kSignalHandler;
  EXPECT_EQ(textOf("a b"_s, kHandler), "a b");
  EXPECT_EQ(textOf(rt::make<Mute>(), kHandler), "[Mute]");
  EXPECT_EQ(textOf(nullptr, kHandler), "(null)");
}

TEST(LUMLogLine, AllocatesNothingInASignalHandler) {
  constexpr auto kHandler = LUMLogLine::Caller::kSignalHandler;
  const rt::Ref<rt::Object> numbers[] = {rt::Number::of(-3), rt::Number::of(~0ULL), rt::Number::of(1.5),
                                         rt::Number::of(true), rt::make<Mute>()};
  std::array<char, 256> place{};
  LUMLogLine line(place, kHandler);
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  for (const rt::Ref<rt::Object>& number : numbers) {
    line.withTextOf(number.get(), [&](std::string_view text) { line.append(text); });
    line.append(' ');
  }
  EXPECT_EQ(count.allocations(), 0);
  EXPECT_EQ(line.text(), "-3 18446744073709551615 1.5 1 [Mute] ");
}

}  // namespace
