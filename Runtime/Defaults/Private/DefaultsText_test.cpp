#include "Runtime/Defaults/Private/DefaultsText.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <map>
#include <random>
#include <string>
#include <string_view>
#include <utility>
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

// Returns the value of "key" in a text of one line.
std::string valueIn(std::string_view line) {
  const DefaultsText text = DefaultsText::parsed(line);
  const std::string* value = text.find("key");
  return value != nullptr ? *value : "(none)";
}

TEST(DefaultsText, HasNoSettingsIfEmpty) {
  EXPECT_EQ(DefaultsText().find("key"), nullptr);
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

TEST(DefaultsText, ReportsWhatIsMalformedAndWhere) {
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

// Reads random settings with escaped characters, and compares them with a map.
TEST(DefaultsText, ReadsRandomSettings) {
  std::mt19937_64 random(2001);  // the same texts in every run
  const std::vector<std::pair<std::string, std::string>> pieces{
      {"a", "a"},         {" ", " "},      {"\t", R"(\t)"},       {"=", "="},
      {"#", "#"},         {"\"", R"(\")"}, {"\\", R"(\\)"},       {"\n", R"(\n)"},
      {"ü", R"(\u00fc)"}, {"\r", R"(\r)"}, {"\x1B", R"(\u001B)"}, {std::string(1, '\0'), R"(\u0000)"}};
  const auto randomText = [&] {
    std::pair<std::string, std::string> text;
    for (std::uint64_t n = random() % 5; n > 0; --n) {
      const auto& [piece, written] = pieces[random() % pieces.size()];
      text.first += piece;
      text.second += written;
    }
    return text;
  };
  for (int round = 0; round < 200; ++round) {
    std::string text = "# a remark\n";
    std::map<std::string, std::string> model;
    for (int setting = 0; setting < 30; ++setting) {
      const auto [key, writtenKey] = randomText();
      const auto [value, writtenValue] = randomText();
      if (!model.try_emplace(key, value).second) continue;
      text.append("\"").append(writtenKey).append("\" = \"").append(writtenValue).append("\"\r\n");
    }
    const DefaultsText read = DefaultsText::parsed(text);
    for (const auto& [key, value] : model) ASSERT_THAT(read.find(key), Pointee(value)) << text;
  }
}

}  // namespace
