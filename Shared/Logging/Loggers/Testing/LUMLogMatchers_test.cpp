#include "Shared/Logging/Loggers/Testing/LUMLogMatchers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <string>
#include <string_view>

#include "Runtime/Values/Array.h"

namespace {

using namespace rt::literals;
using namespace LUMLogMatchers;
using rt::Number;
using rt::Ref;
using testing::AllOf;
using testing::AnyOf;
using testing::DoubleNear;
using testing::ElementsAre;
using testing::Ge;
using testing::Gt;
using testing::HasSubstr;
using testing::Lt;
using testing::Not;
using testing::PrintToString;
using testing::StartsWith;

Ref<LUMLogMessage> messageOf(LUMLogLevel level, const rt::String& text, const Ref<LUMLogMetadata>& metadata,
                             const rt::String& file = nullptr, std::uint64_t line = 0) {
  return LUMLogMessage::initWithLevel(level, text, text, file, nullptr, line, nullptr, nullptr, nullptr,
                                      nullptr, metadata);
}

const Ref<LUMLogMessage>& message() {
  static const Ref<LUMLogMessage> kept = messageOf(LUMLogLevelError, "no route to \"a\""_s,
                                                   LUMLogMetadata::metadataWithComponent("Importer"_s)
                                                       ->messageWithKey("tries"_s, Number::of(3))
                                                       ->messageWithKey("ratio"_s, Number::of(0.1))
                                                       ->messageWithKey("again"_s, Number::of(true))
                                                       ->messageWithKey("user"_s, "ann"_s)
                                                       ->messageWithKey("list"_s, rt::Array::of()),
                                                   "Network.cpp"_s, 7);
  return kept;
}

const Ref<LUMLogMessage>& emptyMessage() {
  static const Ref<LUMLogMessage> kept = messageOf(7, nullptr, nullptr);
  return kept;
}

// Returns what a failed test says about the message.
template <class Matcher>
std::string explanation(const Ref<LUMLogMessage>& found, const Matcher& matcher) {
  testing::StringMatchResultListener listener;
  EXPECT_FALSE(testing::ExplainMatchResult(matcher, found, &listener));
  return listener.str();
}

template <class Matcher>
std::string description(const Matcher& matcher, bool isNegated = false) {
  return testing::DescribeMatcher<const Ref<LUMLogMessage>&>(matcher, isNegated);
}

TEST(LUMLogMatchers, MatchTheText) {
  EXPECT_THAT(message(), HasText("no route to \"a\""));
  EXPECT_THAT(message(), HasText("no route to \"a\""_s));
  EXPECT_THAT(message(), HasText(StartsWith("no route")));
  EXPECT_THAT(message(), Not(HasText("no route")));
  EXPECT_THAT(emptyMessage(), Not(HasText("")));
  EXPECT_THAT(emptyMessage(), Not(HasText(testing::_)));
}

TEST(LUMLogMatchers, MatchTheLevel) {
  EXPECT_THAT(message(), HasLevel(LUMLogLevelError));
  EXPECT_THAT(message(), HasLevel(Ge(LUMLogLevelInfo)));
  EXPECT_THAT(message(), Not(HasLevel(LUMLogLevelInfo)));
}

TEST(LUMLogMatchers, MatchTheComponent) {
  EXPECT_THAT(message(), HasComponent("Importer"));
  EXPECT_THAT(message(), HasComponent(HasSubstr("port")));
  EXPECT_THAT(message(), Not(HasComponent("")));
  EXPECT_THAT(emptyMessage(), Not(HasComponent("")));
  EXPECT_THAT(emptyMessage(), Not(HasComponent(testing::_)));
}

TEST(LUMLogMatchers, MatchANumberByItsValue) {
  EXPECT_THAT(message(), HasField("tries", 3));
  EXPECT_THAT(message(), HasField("tries", 3U));
  EXPECT_THAT(message(), HasField("tries", 3.0F));
  EXPECT_THAT(message(), HasField("tries", AllOf(Gt(2), Lt(4), Not(4))));
  EXPECT_THAT(message(), HasField("ratio", 0.1));
  EXPECT_THAT(message(), HasField("ratio", DoubleNear(0.1, 0.01)));
  EXPECT_THAT(message(), HasField("again", true));
  EXPECT_THAT(message(), Not(HasField("tries", 4)));
  EXPECT_THAT(message(), Not(HasField("tries", Gt(3))));
  EXPECT_THAT(message(), Not(HasField("again", false)));
  EXPECT_THAT(message(), Not(HasField("tries", "3")));
  EXPECT_THAT(message(), Not(HasField("ratio", DoubleNear(0.2, 0.01))));
}

TEST(LUMLogMatchers, MatchOtherFieldsByTheirText) {
  EXPECT_THAT(message(), HasField("user", "ann"));
  EXPECT_THAT(message(), HasField("user", "ann"_s));
  EXPECT_THAT(message(), HasField("user", std::string("ann")));
  EXPECT_THAT(message(), HasField("user", AnyOf("bob", HasSubstr("nn"))));
  EXPECT_THAT(message(), HasField("list", "(\n)"));
  EXPECT_THAT(message(), Not(HasField("user", "bob")));
  EXPECT_THAT(message(), Not(HasField("user", 0)));
  EXPECT_THAT(message(), Not(HasField("user", Ge(0))));
  EXPECT_THAT(message(), Not(HasField("user", DoubleNear(0, 1))));
}

TEST(LUMLogMatchers, MatchAFieldThatIsThere) {
  EXPECT_THAT(message(), HasField("user", testing::_));
  EXPECT_THAT(message(), Not(HasField("place", testing::_)));
  EXPECT_THAT(emptyMessage(), Not(HasField("user", testing::_)));
}

TEST(LUMLogMatchers, SayWhatTheyExpect) {
  EXPECT_EQ(description(HasText(HasSubstr("route"))), R"(has a text that has substring "route")");
  EXPECT_EQ(description(HasText("a"), true), R"(has no text that is equal to "a")");
  EXPECT_EQ(description(HasLevel(LUMLogLevelError)), "has a level that is equal to 3");
  EXPECT_EQ(description(HasComponent("a")), R"(has a component that is equal to "a")");
  EXPECT_EQ(description(HasField("tries", Gt(2))), R"(has a field "tries" that is > 2)");
  EXPECT_EQ(description(HasField("user", "ann")), R"(has a field "user" that is equal to "ann")");
}

TEST(LUMLogMatchers, SayWhatIsMissing) {
  EXPECT_EQ(explanation(emptyMessage(), HasText("")), "which has no text");
  EXPECT_EQ(explanation(emptyMessage(), HasComponent("")), "which has no component");
  EXPECT_EQ(explanation(emptyMessage(), HasField("a", 1)), R"(which has no field "a")");
  EXPECT_EQ(explanation(message(), HasField("user", DoubleNear(0, 1))),
            R"(whose field "user" is not a number)");
}

TEST(LUMLogMatchers, SayWhichPartDoesNotMatch) {
  EXPECT_EQ(explanation(message(), HasText("a")), R"(whose text is "no route to \"a\"")");
  EXPECT_EQ(explanation(message(), HasLevel(4)), "whose level is 3");
  EXPECT_EQ(explanation(message(), HasComponent("a")), R"(whose component is "Importer")");
  EXPECT_EQ(explanation(message(), HasField("user", "bob")), R"(whose field "user" is "ann")");
  EXPECT_EQ(explanation(message(), HasField("ratio", DoubleNear(1, 0.1))),
            R"(whose field "ratio" is 0.1, which is -0.9 from 1)");
  EXPECT_EQ(explanation(message(), AllOf(HasLevel(3), HasField("tries", Gt(5)))),
            R"(whose field "tries" is 3)");
}

TEST(LUMLogMatchers, PrintAMessage) {
  EXPECT_EQ(PrintToString(message()), R"-(error [Importer] "no route to \"a\"" {again: 1, list: ()-"
                                      "\n"
                                      R"-(), ratio: 0.1, tries: 3, user: "ann"} at Network.cpp:7)-");
  EXPECT_EQ(PrintToString(*message()), PrintToString(message()));
  EXPECT_EQ(PrintToString(emptyMessage()), "level 7 without text");
  EXPECT_EQ(PrintToString(messageOf(LUMLogLevelInfo, ""_s, nullptr)), R"(info "")");
  EXPECT_EQ(PrintToString(Ref<LUMLogMessage>()), "no message");
}

TEST(LUMLogMatchers, PrintTheMessagesOfACapture) {
  const std::vector<Ref<LUMLogMessage>> messages = {emptyMessage(), messageOf(1, "a"_s, nullptr)};
  EXPECT_EQ(PrintToString(messages), R"({ level 7 without text, debug "a" })");
  EXPECT_THAT(messages, ElementsAre(HasLevel(7), AllOf(HasLevel(LUMLogLevelDebug), HasText("a"))));
}

}  // namespace
