#include "Shared/Logging/LUMLogSourceText.h"

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "tests/support/AllocationCount.h"

namespace {

constexpr const char* kInvalid = "a\xFF";

TEST(LUMLogSourceText, ReturnsTheTextAsAString) {
  EXPECT_EQ(LUMLogSourceText("a/b.cpp"), "a/b.cpp");
  EXPECT_EQ(LUMLogSourceText(""), "");
  EXPECT_TRUE(LUMLogSourceText(nullptr).isNull());
  EXPECT_TRUE(LUMLogSourceText(kInvalid).isNull());
  EXPECT_TRUE(LUMLogSourceText(kInvalid).isNull());
}

TEST(LUMLogSourceText, MakesOneStringPerText) {
  const char* text = "Shared/Logging/LUMLogSourceText";
  LUMLogSourceText(text);
  const rt::String string = LUMLogSourceText(text);
  EXPECT_EQ(LUMLogSourceText(text).object(), string.object());
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations on this system";
  const AllocationCount count;
  LUMLogSourceText(text);
  EXPECT_EQ(count.allocations(), 0);
}

TEST(LUMLogSourceText, DetectsThatATextHasChanged) {
  static char text[] = "first text";
  EXPECT_EQ(LUMLogSourceText(text), "first text");
  EXPECT_EQ(LUMLogSourceText(text), "first text");
  std::string_view("other text").copy(text, sizeof text);
  EXPECT_EQ(LUMLogSourceText(text), "other text");
  text[5] = '\0';
  EXPECT_EQ(LUMLogSourceText(text), "other");
  std::string_view("first text").copy(text, sizeof text);
  EXPECT_EQ(LUMLogSourceText(text), "first text");
}

// Such a text used to be taken for its own beginning.
TEST(LUMLogSourceText, DetectsThatATextHasGrown) {
  static char text[] = "first\0text";
  EXPECT_EQ(LUMLogSourceText(text), "first");
  text[5] = ' ';
  EXPECT_EQ(LUMLogSourceText(text), "first text");
}

TEST(LUMLogSourceText, DoesNotRememberLongTexts) {
  const std::string longest(kLUMLogSourceTextLength, 'x');
  const std::string longer(kLUMLogSourceTextLength + 1, 'x');
  EXPECT_EQ(LUMLogSourceText(longest.c_str()), longest);
  EXPECT_EQ(LUMLogSourceText(longest.c_str()).object(), LUMLogSourceText(longest.c_str()).object());
  EXPECT_EQ(LUMLogSourceText(longer.c_str()), longer);
  const rt::String first = LUMLogSourceText(longer.c_str());
  EXPECT_NE(LUMLogSourceText(longer.c_str()).object(), first.object());
}

// However many texts there are, each comes out unchanged, on all threads.
TEST(LUMLogSourceText, IsRightForTextsThatAreNotRemembered) {
  std::vector<std::string> texts;
  for (std::size_t i = 0; i < 2 * kLUMLogSourceTextCount; ++i) texts.push_back("text " + std::to_string(i));
  const auto readAll = [&] {
    int wrong = 0;
    for (const std::string& text : texts) wrong += LUMLogSourceText(text.c_str()) == text ? 0 : 1;
    EXPECT_EQ(wrong, 0);
  };
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) threads.emplace_back(readAll);
  for (std::thread& thread : threads) thread.join();
  readAll();
}

}  // namespace
