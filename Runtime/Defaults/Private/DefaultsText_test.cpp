#include "Runtime/Defaults/Private/DefaultsText.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

using rt::DefaultsText;
using testing::Pointee;

std::string errorOf(std::string_view text) {
  try {
    DefaultsText::parsed(text);
  } catch (const rt::MalformedDefaults& error) {
    return error.what();
  }
  return "";
}

// The value that the text of one line gives "key".
std::string valueIn(std::string_view line) {
  const DefaultsText text = DefaultsText::parsed(line);
  const std::string* value = text.find("key");
  return value != nullptr ? *value : "(none)";
}

TEST(DefaultsText, NothingHasNoSettings) {
  EXPECT_EQ(DefaultsText().find("key"), nullptr);
  EXPECT_EQ(DefaultsText().text(), "");
  for (const char* text : {"", "\n", "# remark", "  # remark\n\n\t\r\n"}) {
    EXPECT_EQ(DefaultsText::parsed(text).find("key"), nullptr);
  }
}

TEST(DefaultsText, ReadsALine) {
  EXPECT_EQ(valueIn("key=value"), "value");
  EXPECT_EQ(valueIn("  key \t =\t two words  "), "two words");
  EXPECT_EQ(valueIn("key = value # remark"), "value");
  EXPECT_EQ(valueIn("key = a=b\r\n"), "a=b");
  EXPECT_EQ(valueIn("key ="), "");
  EXPECT_EQ(valueIn("key = # remark"), "");
  EXPECT_EQ(valueIn("key = C:\\n"), "C:\\n");
  EXPECT_EQ(valueIn("key = he said \"yes\""), "he said \"yes\"");
  EXPECT_EQ(valueIn("\"key\" = \" # \\\" \\\\ \\n\\r\\t\\u00fc\\u20AC \"  # remark"), " # \" \\ \n\r\tü€ ");
  EXPECT_EQ(valueIn("key = \"\\uD7FF\\uE000\""), "\uD7FF\uE000");
  EXPECT_EQ(valueIn("key = \"\""), "");
  EXPECT_THAT(DefaultsText::parsed("\"\" = 1").find(""), Pointee(std::string("1")));
  EXPECT_THAT(DefaultsText::parsed("\"a = b\" = 1").find("a = b"), Pointee(std::string("1")));
  EXPECT_THAT(DefaultsText::parsed("two words = ü").find("two words"), Pointee(std::string("ü")));
}

TEST(DefaultsText, SaysWhatIsMalformedAndWhere) {
  EXPECT_EQ(errorOf("a = 1\nb"), "line 2: a key without a = behind it");
  EXPECT_EQ(errorOf("b # = 1"), "line 1: a key without a = behind it");
  EXPECT_EQ(errorOf("\"b\" c = 1"), "line 1: a key without a = behind it");
  EXPECT_EQ(errorOf("= 1"), "line 1: no key");
  EXPECT_EQ(errorOf("a = 1\n\na = 2"), "line 3: a key for the second time");
  EXPECT_EQ(errorOf("a = \"1"), "line 1: a quotation mark without its other");
  EXPECT_EQ(errorOf("\"a = 1"), "line 1: a quotation mark without its other");
  EXPECT_EQ(errorOf("a = \"1\" 2"), "line 1: text behind a quoted value");
  for (const char* text : {R"(a = "\)", R"(a = "\x")", R"(a = "\u12")", R"(a = "\u12g4")", R"(a = "\uD83D")",
                           R"(a = "\uD800")", R"(a = "\uDFFF")", R"(a = "\u+123")", R"(a = "\u")"}) {
    EXPECT_EQ(errorOf(text), "line 1: a backslash that stands for no character") << text;
  }
  EXPECT_EQ(errorOf("a = \x01"), "line 1: a control character");
  EXPECT_EQ(errorOf("a = \"\x7F\""), "line 1: a control character");
  EXPECT_EQ(errorOf("a\rb = 1"), "line 1: a control character");
  EXPECT_EQ(errorOf(std::string_view("a = 1\0", 6)), "line 1: a control character");
  EXPECT_EQ(errorOf("# \xFF"), "line 1: bytes that are not UTF-8");
  EXPECT_EQ(errorOf(std::string(DefaultsText::kMaximumSize + 1, '\n')), "more than 1 MiB");
  EXPECT_EQ(errorOf(std::string(DefaultsText::kMaximumSize, '\n')), "");
}

TEST(DefaultsText, KeepsWhatIsNotChanged) {
  DefaultsText text = DefaultsText::parsed("# first\r\n\n  a=1 # remark\nb = 2\n# last");
  EXPECT_EQ(text.text(), "# first\r\n\n  a=1 # remark\nb = 2\n# last\n");
  text.set("b", "3");
  text.set("c", "4");
  EXPECT_EQ(text.text(), "# first\r\n\n  a=1 # remark\nb = 3\n# last\nc = 4\n");
  text.remove("b");
  text.remove("none");
  EXPECT_EQ(text.text(), "# first\r\n\n  a=1 # remark\n# last\nc = 4\n");
  EXPECT_EQ(text.find("b"), nullptr);
  EXPECT_THAT(text.find("c"), Pointee(std::string("4")));
}

TEST(DefaultsText, WritesQuotesOnlyWhereNeeded) {
  const auto lineOf = [](std::string_view key, std::string_view value) {
    DefaultsText text;
    text.set(key, value);
    return text.text();
  };
  EXPECT_EQ(lineOf("a b", "c d"), "a b = c d\n");
  EXPECT_EQ(lineOf("", ""), "\"\" = \"\"\n");
  EXPECT_EQ(lineOf("a=", " b"), "\"a=\" = \" b\"\n");
  EXPECT_EQ(lineOf("#a", "b#"), "\"#a\" = \"b#\"\n");
  EXPECT_EQ(lineOf("a", std::string_view("\"\\\n\r\t\0\x7F", 7)),
            "a = \"\\\"\\\\\\n\\r\\t\\u0000\\u007f\"\n");
  EXPECT_THROW(lineOf("a", "\xFF"), std::invalid_argument);
  EXPECT_THROW(lineOf("\xFF", "a"), std::invalid_argument);
}

// Changes of random texts against a map, read again from the text after each.
TEST(DefaultsText, ReadsBackRandomSettings) {
  std::mt19937_64 random(2001);  // NOLINT(cert-msc*): the same texts in every run
  const auto randomText = [&random] {
    const std::vector<std::string> pieces{
        "a", " ", "\t", "=", "#", "\"", "\\", "\n", "ü", "\r", "u", "😀", "0", "\x1B", std::string(1, '\0')};
    std::string text;
    for (std::uint64_t n = random() % 5; n > 0; --n) text += pieces[random() % pieces.size()];
    return text;
  };
  for (int round = 0; round < 200; ++round) {
    DefaultsText text;
    std::map<std::string, std::string> model;
    for (int change = 0; change < 30; ++change) {
      const std::string key = randomText();
      if (random() % 4 == 0) {
        text.remove(key);
        model.erase(key);
      } else {
        model[key] = randomText();
        text.set(key, model[key]);
      }
      text = DefaultsText::parsed(text.text());
      ASSERT_EQ(text.find(key) != nullptr, model.contains(key));
    }
    for (const auto& [key, value] : model) ASSERT_THAT(text.find(key), Pointee(value)) << text.text();
  }
}

}  // namespace
