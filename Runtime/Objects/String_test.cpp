#include "Runtime/Objects/String.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <map>
#include <random>
#include <string>
#include <thread>
#include <unordered_map>
#include <utility>
#include <vector>

#include "Runtime/Objects/StringBuilder.h"
#include "Runtime/Objects/Weak.h"
#include "tests/support/AllocationCount.h"

namespace {

using namespace rt::literals;

class Stone final : public rt::Implements<Stone, rt::Object> {};

constexpr rt::String kConstant = "constant"_s;

TEST(String, IsOnePointer) {
  EXPECT_EQ(sizeof(rt::String), sizeof(void*));
}

TEST(String, NullIsNotEmpty) {
  const rt::String null;
  const rt::String empty = ""_s;
  EXPECT_TRUE(null.isNull());
  EXPECT_FALSE(null);
  EXPECT_TRUE(empty);
  EXPECT_FALSE(empty.isNull());
  EXPECT_TRUE(null.isEmpty());
  EXPECT_TRUE(empty.isEmpty());
  EXPECT_FALSE(null == empty);
  EXPECT_FALSE(null == "");
  EXPECT_TRUE(null == nullptr);
  EXPECT_TRUE(empty == "");
  EXPECT_LT(null, empty);
  EXPECT_LT(empty, "a"_s);
  EXPECT_EQ(null <=> rt::String(), std::strong_ordering::equal);
}

TEST(String, NullAnswersLikeAnEmptyText) {
  const rt::String null;
  EXPECT_EQ(null.length(), 0U);
  EXPECT_EQ(null.view(), "");
  EXPECT_EQ(null.hash(), 0U);
  EXPECT_EQ(null.integerValue(), 0);
  EXPECT_TRUE(null.hasPrefix(""));
  EXPECT_FALSE(null.hasPrefix("a"));
  EXPECT_FALSE(null.contains("a"));
  EXPECT_EQ(null.object(), nullptr);
  EXPECT_TRUE(null.trimmed().isNull());
  EXPECT_TRUE(null.uppercased().isNull());
  EXPECT_TRUE(null.lastPathComponent().isNull());
}

TEST(String, LiteralsAreConstants) {
  static_assert("a\0b"_s.length() == 3);
  static_assert(kConstant == "constant"_s && kConstant != "other"_s && kConstant != nullptr);
  static_assert("abc"_s.hasPrefix("ab") && "abc"_s.hasSuffix("bc") && "abc"_s.contains("c"));
  static_assert("a"_s < "b"_s);
  EXPECT_EQ(kConstant, "constant");
  // Equal literals are one object, wherever they stand.
  EXPECT_EQ(kConstant.object(), "constant"_s.object());
  EXPECT_EQ("\u20AC"_s.view(), "\xE2\x82\xAC");
}

TEST(String, LiteralsMayHaveWeakReferences) {
  const rt::Weak<rt::Object> weak{rt::Ref<rt::Object>("weakly"_s)};
  EXPECT_EQ(rt::String::from(weak.lock().get()), "weakly");
}

TEST(String, IsMadeFromBytes) {
  EXPECT_EQ(rt::String::fromUTF8("caf\xC3\xA9"), "café");
  EXPECT_EQ(rt::String::fromUTF8(std::string_view("a\0b", 3)).length(), 3U);
  EXPECT_TRUE(rt::String::fromUTF8(""));
  EXPECT_TRUE(rt::String::fromUTF8(static_cast<const char*>(nullptr)).isNull());
  EXPECT_TRUE(rt::String::fromUTF8("caf\xC3").isNull());
  EXPECT_TRUE(rt::String::fromUTF8("\xED\xA0\x80").isNull());
  EXPECT_TRUE(rt::String::fromUTF8(std::string_view("ok\0\xC0\x80", 5)).isNull());
}

TEST(String, CopiesBytesUnlessTheyAreStatic) {
  std::string bytes = "first";
  const rt::String copy = rt::String::fromUTF8(bytes);
  bytes[0] = 'F';
  EXPECT_EQ(copy, "first");
  static const char kBytes[] = {'s', 't', 'a', 't', 'i', 'c'};
  const rt::String over = rt::String::overStatic({kBytes, sizeof kBytes});
  EXPECT_EQ(over, "static");
  EXPECT_EQ(over.view().data(), kBytes);
  EXPECT_TRUE(rt::String::overStatic("\xFF").isNull());
}

TEST(String, IsAnObject) {
  const rt::String string = rt::String::fromUTF8("text");
  const rt::Ref<rt::Object> object = string;
  EXPECT_EQ(object->classInfo().name, "String");
  EXPECT_TRUE(object->isEqual(rt::Ref<rt::Object>("text"_s).get()));
  EXPECT_FALSE(object->isEqual(rt::Ref<rt::Object>("other"_s).get()));
  EXPECT_FALSE(object->isEqual(rt::make<Stone>().get()));
  EXPECT_FALSE(object->isEqual(nullptr));
  EXPECT_EQ(object->hash(), string.hash());
  EXPECT_EQ(object->hash(), "text"_s.hash());
  EXPECT_EQ(object->description(), string);
  EXPECT_EQ(object->description().object(), object.get());
  EXPECT_EQ(rt::String::from(object.get()), "text");
  EXPECT_TRUE(rt::String::from(rt::make<Stone>().get()).isNull());
  EXPECT_TRUE(rt::String::from(nullptr).isNull());
}

TEST(String, ComparesByBytes) {
  EXPECT_LT("a"_s, "aa"_s);
  EXPECT_LT("Z"_s, "a"_s);
  EXPECT_LT("z"_s, "é"_s);
  EXPECT_LT("\uFFFF"_s, "\U00010000"_s);
  EXPECT_EQ(std::hash<rt::String>()("ab"_s), std::hash<rt::String>()(rt::String::fromUTF8("ab")));
  std::unordered_map<rt::String, int> table{{"one"_s, 1}, {rt::String(), 0}};
  EXPECT_EQ(table.at(rt::String::fromUTF8("one")), 1);
  EXPECT_EQ(table.at(nullptr), 0);
}

TEST(String, CopiesShareTheObjectAndMovesLeaveNull) {
  rt::String first = rt::String::fromUTF8("shared");
  rt::String second = first;
  EXPECT_EQ(first.object(), second.object());
  const rt::String third = std::move(first);
  EXPECT_TRUE(first.isNull());  // NOLINT(bugprone-use-after-move): moving leaves null
  EXPECT_EQ(third, "shared");
  const rt::String& alias = second;
  second = alias;
  EXPECT_EQ(second, "shared");
  second = nullptr;
  EXPECT_TRUE(second.isNull());
  EXPECT_EQ(third, "shared");
}

TEST(String, Searches) {
  const rt::String text = "one two one"_s;
  EXPECT_TRUE(text.hasPrefix("one"));
  EXPECT_FALSE(text.hasPrefix("one two one three"));
  EXPECT_TRUE(text.hasSuffix(" one"));
  EXPECT_TRUE(text.hasPrefix(""_s));
  EXPECT_TRUE(text.contains("two"_s));
  EXPECT_TRUE(text.contains(""));
  EXPECT_FALSE(text.contains("three"));
}

TEST(String, TrimsWhiteSpaceAndLineEnds) {
  EXPECT_EQ(" \t\n\v\f\r a b \r\n"_s.trimmed(), "a b");
  EXPECT_EQ("\u0085\u00A0\u1680\u2000\u200A\u2028\u2029\u202F\u205F\u3000é\u3000"_s.trimmed(), "é");
  EXPECT_EQ("   "_s.trimmed(), "");
  EXPECT_EQ(""_s.trimmed(), "");
  // These characters are not white space, but share bytes with white space.
  EXPECT_EQ("\u00E0x\u2003\u00E0"_s.trimmed(), "\u00E0x\u2003\u00E0");
  EXPECT_EQ("\u200Ba"_s.trimmed(), "\u200Ba");
  const rt::String plain = rt::String::fromUTF8("plain");
  EXPECT_EQ(plain.trimmed().object(), plain.object());
}

TEST(String, Uppercases) {
  EXPECT_EQ("yes, true; Été"_s.uppercased(), "YES, TRUE; ÉTé");
  EXPECT_EQ("`az{@AZ["_s.uppercased(), "`AZ{@AZ[");
  EXPECT_EQ(kConstant.uppercased().uppercased(), "CONSTANT");
  const rt::String upper = "UPPER"_s;
  EXPECT_EQ(upper.uppercased().object(), upper.object());
}

TEST(String, HasAnIntegerValue) {
  const std::map<std::string, std::int64_t> cases{
      {"", 0},
      {"0", 0},
      {"2", 2},
      {"007", 7},
      {"-12", -12},
      {"+5", 5},
      {" \t\n 3", 3},
      {"3 ", 3},
      {"12abc", 12},
      {"abc", 0},
      {"-", 0},
      {"--1", 0},
      {"+-1", 0},
      {"- 1", 0},
      {"1.9", 1},
      {"0x10", 0},
      {"9223372036854775807", std::numeric_limits<std::int64_t>::max()},
      {"9223372036854775808", std::numeric_limits<std::int64_t>::max()},
      {"-9223372036854775808", std::numeric_limits<std::int64_t>::min()},
      {"-9223372036854775809", std::numeric_limits<std::int64_t>::min()},
      {"99999999999999999999999999", std::numeric_limits<std::int64_t>::max()},
      {"-99999999999999999999999999", std::numeric_limits<std::int64_t>::min()}};
  for (const auto& [text, value] : cases) EXPECT_EQ(rt::String::fromUTF8(text).integerValue(), value) << text;
}

TEST(String, HasALastPathComponent) {
  EXPECT_EQ("a/b/c.m"_s.lastPathComponent(), "c.m");
  EXPECT_EQ("/a"_s.lastPathComponent(), "a");
  EXPECT_EQ("a/b/"_s.lastPathComponent(), "");
  EXPECT_EQ("/"_s.lastPathComponent(), "");
  EXPECT_EQ(""_s.lastPathComponent(), "");
  const rt::String whole = rt::String::fromUTF8("c.m");
  EXPECT_EQ(whole.lastPathComponent().object(), whole.object());
}

TEST(String, Concatenates) {
  EXPECT_EQ("a"_s + "b"_s, "ab");
  EXPECT_EQ("a"_s + rt::String(), "a");
  EXPECT_EQ(rt::String() + "b"_s, "b");
  EXPECT_EQ(""_s + ""_s, "");
  EXPECT_TRUE(rt::String() + rt::String());
  EXPECT_EQ("a\0b"_s + "c\0"_s, std::string_view("a\0bc\0", 5));
}

// The model is a std::string with the same bytes.
TEST(String, BehavesLikeTheModel) {
  std::mt19937 random(20240229);
  const std::vector<std::string> pieces{
      "", "a", "b", " ", "\n", "/", "é", "\u3000", "😀", std::string(1, '\0'), "abab"};
  const auto piece = [&] { return pieces[random() % pieces.size()]; };
  for (int round = 0; round < 20000; ++round) {
    std::string first;
    std::string second;
    for (auto i = random() % 6; i > 0; --i) first += piece();
    for (auto i = random() % 4; i > 0; --i) second += piece();
    const rt::String one = rt::String::fromUTF8(first);
    const rt::String two = rt::String::fromUTF8(second);
    ASSERT_EQ(one.view(), first);
    ASSERT_EQ((one + two).view(), first + second);
    ASSERT_EQ(one == two, first == second);
    ASSERT_EQ(one < two, first < second);
    ASSERT_EQ(one.contains(two), first.find(second) != std::string::npos);
    ASSERT_EQ(one.hasPrefix(two), first.starts_with(second));
    ASSERT_EQ(one.hasSuffix(two), first.ends_with(second));
    const std::string trimmed(one.trimmed().view());
    ASSERT_NE(first.find(trimmed), std::string::npos);
    ASSERT_EQ(rt::String::fromUTF8(" \u3000" + trimmed + "\n").trimmed().view(), trimmed);
  }
}

// Invariant: the text stays whole while threads copy and assign it. It is gone after the last copy.
TEST(String, IsSharedByThreads) {
  rt::Weak<rt::Object> weak;
  {
    const rt::String text = rt::String::fromUTF8("shared by threads");
    weak = rt::Ref<rt::Object>(text);
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
      threads.emplace_back([text] {
        rt::String mine = text;
        for (int round = 0; round < 10000; ++round) {
          const rt::String copy = mine;
          mine = copy;
          if (mine != "shared by threads") std::abort();
        }
      });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(text, "shared by threads");
  }
  EXPECT_FALSE(weak.lock());
}

TEST(String, LiteralsAndCopiesDoNotAllocate) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const rt::String made = rt::String::fromUTF8("made at run time, and longer than any buffer within");
  const AllocationCount count;
  const rt::String literal = "a literal that is longer than any buffer within would be"_s;
  rt::String copy = literal;
  copy = made;
  const rt::String another = copy;
  const rt::String empty = rt::String::fromUTF8("");
  const rt::Ref<rt::Object> object = another;
  const rt::String back = rt::String::from(object.get());
  EXPECT_EQ(back.trimmed(), made);
  EXPECT_EQ(count.allocations(), 0);
}

TEST(String, MakingOneAllocatesOnce) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  {
    const rt::String copy = rt::String::fromUTF8("some text");
    EXPECT_EQ(count.allocations(), 1);
    const rt::String both = copy + "and more"_s;
    EXPECT_EQ(count.allocations(), 2);
    const rt::String over = rt::String::overStatic("static");
    EXPECT_EQ(count.allocations(), 3);
    const rt::String repaired = rt::String::fromUTF8Repaired("some\xFFtext");
    EXPECT_EQ(count.allocations(), 4);
  }
  EXPECT_EQ(count.balance(), 0);
}

TEST(StringBuilder, Builds) {
  rt::StringBuilder builder;
  EXPECT_EQ(builder.string(), "");
  builder.append("a");
  builder.append('b');
  builder.append(3, 'c');
  builder.append(std::string_view());
  builder.append("é"_s);
  EXPECT_EQ(builder.view(), "abcccé");
  EXPECT_EQ(builder.string(), "abcccé");
  builder.append("\xFF");
  EXPECT_EQ(builder.string(), "abcccé\uFFFD");
}

TEST(StringBuilder, GrowsBeyondItsBuffer) {
  std::mt19937 random(7);
  rt::StringBuilder builder;
  std::string model;
  while (model.size() < 100000) {
    const std::size_t count = random() % 700;
    const char byte = static_cast<char>('a' + random() % 26);
    builder.append(count, byte);
    model.append(count, byte);
    ASSERT_EQ(builder.view(), model);
  }
  EXPECT_EQ(builder.string(), model);
}

TEST(StringBuilder, AllocatesOnlyTheStringForShortTexts) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  rt::StringBuilder builder;
  builder.append(rt::StringBuilder::kInlineCapacity, 'a');
  EXPECT_EQ(count.allocations(), 0);
  const rt::String string = builder.string();
  EXPECT_EQ(count.allocations(), 1);
}

TEST(StringBuilder, ThrowsIfTheSizeOverflows) {
  rt::StringBuilder builder;
  builder.append("kept");
  EXPECT_THROW(builder.prepare(std::numeric_limits<std::size_t>::max()), std::bad_alloc);
  EXPECT_EQ(builder.string(), "kept");
}

// Puts one invalid byte at each position of texts of many lengths.
TEST(String, RepairsAnInvalidByteAtAnyPosition) {
  for (std::size_t length = 1; length <= 40; ++length) {
    const std::string plain(length, 'a');
    EXPECT_EQ(rt::String::fromUTF8Repaired(plain).view(), plain);
    for (std::size_t place = 0; place < length; ++place) {
      std::string torn = plain;
      torn[place] = '\xff';
      const std::string repaired = plain.substr(0, place) + "\uFFFD" + plain.substr(place + 1);
      EXPECT_EQ(rt::String::fromUTF8Repaired(torn).view(), repaired);
    }
  }
}

}  // namespace
