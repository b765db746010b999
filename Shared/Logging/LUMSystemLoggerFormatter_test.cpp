#include "Shared/Logging/LUMSystemLoggerFormatter.h"

#include <gtest/gtest.h>

#include "Shared/Logging/LUMLog.h"

namespace {

using namespace rt::literals;
using rt::Ref;

Ref<LUMLogMessage> messageIn(const rt::String& function, const rt::String& text) {
  return LUMLogMessage::initWithLevel(LUMLogLevelInfo, "%@"_s, text, "a/b.cpp"_s, function, 7, nullptr,
                                      nullptr, nullptr, nullptr, nullptr);
}

TEST(LUMSystemLoggerFormatter, PutsTheFunctionBeforeTheText) {
  const Ref<LUMSystemLoggerFormatter> formatter = LUMSystemLoggerFormatter::init();
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn("int main()"_s, "started"_s)), "int main(): started");
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn("f"_s, ""_s)), "f: ");
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn("%@"_s, "100 %"_s)), "%@: 100 %");
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn("f"_s, nullptr)), "f: (null)");
}

TEST(LUMSystemLoggerFormatter, GivesTheTextAloneWithoutAFunction) {
  const Ref<LUMSystemLoggerFormatter> formatter = LUMSystemLoggerFormatter::init();
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn(""_s, "started"_s)), "started");
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn(nullptr, "started"_s)), "started");
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn(nullptr, ""_s)), "");
  EXPECT_EQ(formatter->formattedLogMessage(*messageIn(nullptr, nullptr)), nullptr);
}

}  // namespace
