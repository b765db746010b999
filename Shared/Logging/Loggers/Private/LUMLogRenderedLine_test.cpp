#include "Shared/Logging/Loggers/Private/LUMLogRenderedLine.h"

#include <gtest/gtest.h>

#include <string>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/Loggers/LUMLogLineFormatter.h"
#include "tests/support/AllocationCount.h"

namespace {

using namespace rt::literals;

class Text : public rt::Implements<Text, rt::Object, LUMLogLineFormatter> {
 public:
  static constexpr std::string_view kClassName = "Text";
  void appendLine(LUMLogLine& line, const LUMLogMessage& message) const override {
    line.append(message.formattedString().view());
  }
};

class Strings : public rt::Implements<Strings, rt::Object, LUMLogFormatter> {
 public:
  static constexpr std::string_view kClassName = "Strings";
  rt::String formattedLogMessage(const LUMLogMessage& message) const override {
    return message.formattedString();
  }
};

// Its line is longer each time.
class Growing : public rt::Implements<Growing, rt::Object, LUMLogLineFormatter> {
 public:
  static constexpr std::string_view kClassName = "Growing";
  void appendLine(LUMLogLine& line, const LUMLogMessage& /*message*/) const override {
    length_ += 3000;
    line.append(length_, 'x');
  }

 private:
  mutable std::size_t length_ = 0;
};

rt::Ref<LUMLogMessage> messageOf(const rt::String& text) {
  return LUMLogMessage::initWithLevel(LUMLogLevelInfo, text, text, nullptr, nullptr, 0, ""_s, ""_s, nullptr,
                                      nullptr, nullptr);
}

TEST(LUMLogRenderedLine, HasTheLineAndItsEnd) {
  const rt::Ref<LUMLogMessage> message = messageOf("text"_s);
  EXPECT_EQ(LUMLogRenderedLine(Text(), *message, "\n").text(), "text\n");
  EXPECT_EQ(LUMLogRenderedLine(Strings(), *message, "\n").text(), "text\n");
  EXPECT_EQ(LUMLogRenderedLine(Text(), *messageOf(""_s), "\n").text(), "\n");
}

TEST(LUMLogRenderedLine, IsEmptyIfTheFormatterReturnsNull) {
  EXPECT_EQ(LUMLogRenderedLine(Strings(), *messageOf(nullptr), "\n").text(), "");
}

TEST(LUMLogRenderedLine, MayBeLong) {
  constexpr std::size_t kCapacity = LUMLogRenderedLine::kInlineCapacity;
  for (const std::size_t length : {kCapacity - 1, kCapacity, 10 * kCapacity}) {
    const std::string text(length, 'x');
    const rt::Ref<LUMLogMessage> message = messageOf(rt::String::fromUTF8Repaired(text));
    EXPECT_EQ(LUMLogRenderedLine(Text(), *message, "\n").text(), text + "\n");
    EXPECT_EQ(LUMLogRenderedLine(Strings(), *message, "\n").text(), text + "\n");
  }
}

// The second rendering, for which there is room as for the first, is longer.
TEST(LUMLogRenderedLine, EndsAlsoIfTheLineGrowsMeanwhile) {
  const LUMLogRenderedLine line(Growing(), *messageOf("text"_s), "\n");
  EXPECT_EQ(line.text().size(), 3001U);
  EXPECT_TRUE(line.text().ends_with("x\n"));
}

TEST(LUMLogRenderedLine, AllocatesNothingForAShortLine) {
  const rt::Ref<LUMLogMessage> message = messageOf("text"_s);
  const Text formatter;
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const AllocationCount count;
  const LUMLogRenderedLine line(formatter, *message, "\n");
  EXPECT_EQ(count.allocations(), 0);
  EXPECT_EQ(line.text(), "text\n");
}

TEST(LUMLogLineFormatter, ReturnsTheLineAsAString) {
  EXPECT_EQ(Text().formattedLogMessage(*messageOf("text"_s)), "text");
}

}  // namespace
