#include "Runtime/Base/Private/UTF8.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <set>
#include <string>
#include <string_view>

#include "Runtime/Objects/String.h"

namespace {

std::string encoded(char32_t character) {
  std::array<char, rt::kMaximumUTF8Length> bytes{};
  return {bytes.data(), rt::encodeUTF8(character, bytes.data())};
}

std::string bytesOf(std::initializer_list<int> values) {
  std::string bytes;
  for (const int value : values) bytes += static_cast<char>(value);
  return bytes;
}

TEST(UTF8, AcceptsEmptyTextAndASCII) {
  EXPECT_TRUE(rt::isValidUTF8(""));
  EXPECT_TRUE(rt::isValidUTF8("a"));
  EXPECT_TRUE(rt::isValidUTF8(std::string_view("a\0b", 3)));
  EXPECT_TRUE(rt::isValidUTF8("\x7F"));
  EXPECT_FALSE(rt::isValidUTF8("\x80"));
  static_assert(rt::isValidUTF8("also while compiling: é"));
  static_assert(!rt::isValidUTF8("\xC3"));
}

TEST(UTF8, EncodesTheExamplesOfTheStandard) {
  EXPECT_EQ(encoded(0), std::string(1, '\0'));
  EXPECT_EQ(encoded(U'$'), "$");
  EXPECT_EQ(encoded(U'\u00E9'), "\xC3\xA9");
  EXPECT_EQ(encoded(U'\u20AC'), "\xE2\x82\xAC");
  EXPECT_EQ(encoded(U'\U00010348'), "\xF0\x90\x8D\x88");
  EXPECT_EQ(encoded(U'\U0010FFFF'), "\xF4\x8F\xBF\xBF");
}

TEST(UTF8, EncodesInvalidCharactersAsTheReplacement) {
  for (const char32_t character : {0xD800U, 0xDBFFU, 0xDC00U, 0xDFFFU, 0x110000U, 0xFFFFFFFFU}) {
    EXPECT_EQ(encoded(character), rt::kReplacementCharacter) << std::hex << std::uint32_t(character);
  }
}

// Only encodings of characters are valid. The test compares all sequences of one and two bytes, and many of
// three. Of sequences of four bytes, it compares the first two.
TEST(UTF8, AcceptsExactlyTheEncodingsOfCharacters) {
  std::set<std::string> characters;
  std::set<std::string> beginnings;
  for (char32_t character = 0; character <= 0x10FFFF; ++character) {
    if (character >= 0xD800 && character <= 0xDFFF) continue;
    const std::string text = encoded(character);
    const rt::UTF8Sequence first = rt::nextUTF8(text);
    ASSERT_TRUE(first.isValid && first.length == text.size()) << std::hex << std::uint32_t(character);
    if (text.size() < 4) characters.insert(text);
    if (text.size() == 4) beginnings.insert(text.substr(0, 2));
  }
  for (int a = 0; a < 256; ++a) {
    ASSERT_EQ(rt::nextUTF8(bytesOf({a})).isValid, characters.contains(bytesOf({a}))) << a;
    for (int b = 0; b < 256; ++b) {
      const bool isTwo = characters.contains(bytesOf({a, b}));
      ASSERT_EQ(rt::nextUTF8(bytesOf({a, b})).length == 2 && rt::isValidUTF8(bytesOf({a, b})), isTwo)
          << a << ' ' << b;
      ASSERT_EQ(rt::isValidUTF8(bytesOf({a, b, 0x80, 0x80})) && a >= 0xF0,
                beginnings.contains(bytesOf({a, b})))
          << a << ' ' << b;
      if (a < 0xC0) continue;
      for (const int c : {0x00, 0x7F, 0x80, 0xA5, 0xBF, 0xC0, 0xFF}) {
        const std::string three = bytesOf({a, b, c});
        const rt::UTF8Sequence next = rt::nextUTF8(three);
        ASSERT_EQ(next.isValid && next.length == 3, characters.contains(three)) << a << ' ' << b << ' ' << c;
      }
    }
  }
}

TEST(UTF8, RejectsOverlongFormsSurrogatesAndTooLargeValues) {
  for (const std::string_view bytes :
       {"\xC0\x80", "\xC1\xBF", "\xE0\x80\x80", "\xE0\x9F\xBF", "\xF0\x80\x80\x80", "\xF0\x8F\xBF\xBF",
        "\xED\xA0\x80", "\xED\xBF\xBF", "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xF8\x88\x80\x80\x80",
        "\xFE", "\xFF"}) {
    EXPECT_FALSE(rt::isValidUTF8(bytes));
  }
}

TEST(UTF8, TellsABrokenSequenceFromATruncatedOne) {
  const rt::UTF8Sequence cut = rt::nextUTF8("\xF0\x9F\x98");
  EXPECT_TRUE(cut.isCutShort && !cut.isValid && cut.length == 3);
  const rt::UTF8Sequence broken = rt::nextUTF8("\xF0\x9Fx");
  EXPECT_TRUE(!broken.isCutShort && !broken.isValid && broken.length == 2);
  const rt::UTF8Sequence lone = rt::nextUTF8("\x80");
  EXPECT_TRUE(!lone.isCutShort && !lone.isValid && lone.length == 1);
  EXPECT_EQ(rt::nextUTF8("").length, 0U);
}

// Puts an invalid byte at every position, also within and between the words that are read at once. The bytes
// before it count as valid.
TEST(UTF8, FindsAnInvalidByteAnywhere) {
  for (std::size_t length = 1; length < 40; ++length) {
    for (std::size_t i = 0; i < length; ++i) {
      std::string text(length, 'a');
      text[i] = '\xFF';
      ASSERT_EQ(rt::validUTF8Length(text), i) << length;
    }
    ASSERT_EQ(rt::validUTF8Length(std::string(length, 'a') + "\u00E9" + std::string(length, 'b')),
              (2 * length) + 2);
  }
}

TEST(UTF8, RepairsEachInvalidSequenceOnce) {
  // The example for "maximal subparts" in the Unicode standard.
  EXPECT_EQ(rt::String::fromUTF8Repaired("\x61\xF1\x80\x80\xE1\x80\xC2\x62\x80\x63\x80\xBF\x64"),
            "a\uFFFD\uFFFD\uFFFDb\uFFFDc\uFFFD\uFFFDd");
  EXPECT_EQ(rt::String::fromUTF8Repaired("\xE2\x82"), "\uFFFD");
  EXPECT_EQ(rt::String::fromUTF8Repaired("\xC0\xAF"), "\uFFFD\uFFFD");
  EXPECT_EQ(rt::String::fromUTF8Repaired("fine é"), "fine é");
  EXPECT_EQ(rt::String::fromUTF8Repaired(""), "");
}

TEST(UTF8, CutsBetweenCharacters) {
  EXPECT_EQ(rt::lengthThatFits("", 2), 0U);
  EXPECT_EQ(rt::lengthThatFits("abc", 3), 3U);
  EXPECT_EQ(rt::lengthThatFits("abc", 2), 2U);
  EXPECT_EQ(rt::lengthThatFits("a\u00E9b", 2), 1U);
  EXPECT_EQ(rt::lengthThatFits("a\u00E9b", 3), 3U);
  EXPECT_EQ(rt::lengthThatFits("a\U0001F600", 4), 1U);
  // No character begins here, and something has to fit.
  EXPECT_EQ(rt::lengthThatFits("\x80\x80\x80", 2), 2U);
}

}  // namespace
