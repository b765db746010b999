#include "Shared/Logging/Loggers/Private/LUMLogJSONText.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <fstream>
#include <random>
#include <string>
#include <string_view>

#include "tests/support/AllocationCount.h"
#include "tests/support/Process.h"
#include "tests/support/TemporaryFolder.h"

namespace {

std::string written(std::string_view text, std::size_t limit = std::string_view::npos) {
  std::string place(6 * text.size(), '\0');
  LUMLogLine line(place);
  appendJSONText(line, text, limit);
  EXPECT_TRUE(line.isComplete());
  return std::string(line.text());
}

TEST(LUMLogJSONText, LeavesPrintableText) {
  EXPECT_EQ(written(""), "");
  EXPECT_EQ(written("a"), "a");
  EXPECT_EQ(written("no route to host, 3 tries; {[~ !]}"), "no route to host, 3 tries; {[~ !]}");
  EXPECT_EQ(written("\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80"), "\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80");
}

TEST(LUMLogJSONText, EscapesWhatJSONDemands) {
  EXPECT_EQ(written("\"a\\b\""), R"(\"a\\b\")");
  EXPECT_EQ(written("\n\r\t\b\f\x1B"), R"(\n\r\t\u0008\u000c\u001b)");
  EXPECT_EQ(written(std::string_view("a\0b", 3)), R"(a\u0000b)");
}

// Every byte that is escaped, at every place in a machine word.
TEST(LUMLogJSONText, FindsEachSpecialByteAtEachPlace) {
  for (int code = 0; code < 0x80; ++code) {
    const std::string special(1, static_cast<char>(code));
    const std::string alone = written(special);
    const bool isPlain = code >= 0x20 && code != 0x7F && code != '"' && code != '\\';
    EXPECT_EQ(alone == special, isPlain) << code;
    for (std::size_t place = 0; place < 17; ++place) {
      std::string text(17, 'x');
      text[place] = static_cast<char>(code);
      EXPECT_EQ(written(text), std::string(place, 'x') + alone + std::string(16 - place, 'x')) << code;
    }
  }
}

TEST(LUMLogJSONText, EscapesWhatControlsTerminalsOrEndsLines) {
  EXPECT_EQ(written("\x7F"), R"(\u007f)");
  EXPECT_EQ(written("\xC2\x80\xC2\x85\xC2\x9F\xC2\xA0"), "\\u0080\\u0085\\u009f\xC2\xA0");
  EXPECT_EQ(written("\xE2\x80\xA7\xE2\x80\xA8\xE2\x80\xA9\xE2\x80\xAF"),
            "\xE2\x80\xA7\\u2028\\u2029\xE2\x80\xAF");
}

TEST(LUMLogJSONText, ReplacesWhatIsNotUTF8) {
  EXPECT_EQ(written("a\xFF"
                    "b\xC3"),
            "a\xEF\xBF\xBD"
            "b\xEF\xBF\xBD");
  EXPECT_EQ(written("\xED\xA0\x80"), "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
}

TEST(LUMLogJSONText, StopsBeforeTheLimit) {
  EXPECT_EQ(written("abc", 0), "");
  EXPECT_EQ(written("abc", 2), "ab");
  EXPECT_EQ(written("abc", 3), "abc");
  EXPECT_EQ(written("a\nb", 2), "a");
  EXPECT_EQ(written("a\nb", 3), "a\\n");
  EXPECT_EQ(written("a\xE2\x82\xAC", 3), "a");
  EXPECT_EQ(written("a\xE2\x82\xAC", 4), "a\xE2\x82\xAC");
}

TEST(LUMLogJSONText, AllocatesNothing) {
  std::array<char, 64> place{};
  LUMLogLine line(place);
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  appendJSONText(line, "a\"\n\x01\xC2\x85\xE2\x80\xA8\xFF");
  EXPECT_EQ(count.allocations(), 0);
}

// Reads each text back and compares it with what Python makes of the same bytes.
constexpr const char* kReader = R"(
import json, sys, unicodedata
count = 0
for line in open(sys.argv[1], "rb"):
    given, text = line.rstrip(b"\n").split(b" ", 1)
    text = text.decode("utf-8")
    if json.loads('"' + text + '"') != bytes.fromhex(given.decode()).decode("utf-8", "replace"):
        sys.exit(f"{given} became {text}")
    if any(unicodedata.category(character) in ("Cc", "Zl", "Zp") for character in text):
        sys.exit(f"{given} has a control character: {text!r}")
    count += 1
print(count)
)";

TEST(LUMLogJSONText, IsWhatPythonReadsBack) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  // Half of the bytes are of these, which take part in what is special.
  constexpr std::string_view kSpecial = "\"\\\n\x7F\xC2\x80\x85\xE2\x80\xA8\xA9\xF0\x9F\xED\xA0x";
  std::mt19937_64 random(17);  // NOLINT(cert-msc51-cpp): the same each time
  const TemporaryFolder folder;
  constexpr int kCount = 20'000;
  {
    std::ofstream file(folder.file("texts"), std::ios::binary);
    for (int i = 0; i < kCount; ++i) {
      std::string text(random() % 24, '\0');
      for (char& byte : text)
        byte = random() % 2 == 0 ? static_cast<char>(random()) : kSpecial[random() % kSpecial.size()];
      for (const char byte : text) {
        const auto code = static_cast<unsigned char>(byte);
        file << kDigits[code >> 4U] << kDigits[code & 0xFU];
      }
      file << ' ' << written(text) << '\n';
    }
  }
  const ProcessResult result = runProcess({"python3", "-c", kReader, folder.file("texts")});
  if (result.exitStatus == 127) GTEST_SKIP() << "python3 is not installed";
  EXPECT_EQ(result.standardError, "");
  EXPECT_EQ(result.standardOutput, std::to_string(kCount) + "\n");
}

}  // namespace
