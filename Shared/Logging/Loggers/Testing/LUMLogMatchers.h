#pragma once

/// Matchers of GoogleTest for messages, which also print well when a test fails.
///
///     using namespace LUMLogMatchers;
///     using testing::AllOf, testing::ElementsAre, testing::Gt, testing::HasSubstr;
///
///     const LUMLogCapture capture;
///     LUMLogAt(LUMLogLevelError, metadata, "no route to %@"_s, host, LUMLogField("tries", 3));
///     EXPECT_THAT(capture.messages(),
///                 ElementsAre(AllOf(HasLevel(LUMLogLevelError), HasComponent("Importer"),
///                                   HasText(HasSubstr("no route")), HasField("tries", Gt(2)))));
///
/// Each takes a value or a matcher. Each matches an `rt::Ref<LUMLogMessage>` that is not null, such as
/// LUMLogCapture keeps.
///
/// A host adds the target MountPoint::LoggingTesting to its tests, and links GoogleTest (1.12 or later)
/// itself.
///
/// Not for: anything but tests.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <compare>
#include <concepts>
#include <map>
#include <ostream>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/StringObject.h"
#include "Runtime/Values/Dictionary.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogLevel.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "Shared/Logging/LUMLogMetadata.h"
#include "Shared/Logging/Loggers/LUMLogCapture.h"  // IWYU pragma: export

namespace LUMLogMatchersDetail {

inline std::string textOf(const rt::String& string) {
  return std::string(string.view());
}

inline std::string nameOf(LUMLogLevel level) {
  switch (level) {
    case LUMLogLevelDebug:
      return "debug";
    case LUMLogLevelInfo:
      return "info";
    case LUMLogLevelError:
      return "error";
    case LUMLogLevelFault:
      return "fault";
    default:
      return "level " + std::to_string(level);
  }
}

/// The value of a field. It compares as a number or as a text, whichever the other value is. The text of an
/// object is its description. A number is not equal to any text, but has one for matchers of texts.
class FieldValue {
 public:
  explicit FieldValue(const rt::Object& object)
      : number_(rt::cast<rt::Number>(const_cast<rt::Object*>(&object))),
        isString_(rt::cast<rt::StringObject>(&object) != nullptr),
        text_(textOf(object.description())) {}

  bool isNumber() const { return number_ != nullptr; }
  operator std::string() const { return text_; }
  explicit operator double() const { return number_ ? number_->realValue() : 0; }

  friend bool operator==(const FieldValue& value, const std::convertible_to<std::string_view> auto& text) {
    return !value.isNumber() && value.text_ == std::string_view(text);
  }
  template <class Arithmetic>
    requires std::is_arithmetic_v<Arithmetic>
  friend bool operator==(const FieldValue& value, Arithmetic number) {
    return (value <=> number) == 0;
  }
  template <class Arithmetic>
    requires std::is_arithmetic_v<Arithmetic>
  friend std::partial_ordering operator<=>(const FieldValue& value, Arithmetic number) {
    if (!value.isNumber()) return std::partial_ordering::unordered;
    using Stored = std::conditional_t<std::is_floating_point_v<Arithmetic>, double, Arithmetic>;
    return value.number_->compare(rt::Number(static_cast<Stored>(number)));
  }

  friend void PrintTo(const FieldValue& value, std::ostream* stream) {
    if (value.isString_) {
      testing::internal::UniversalPrint(value.text_, stream);
    } else {
      *stream << value.text_;
    }
  }

 private:
  const rt::Ref<rt::Number> number_;
  const bool isString_;
  const std::string text_;
};

// Some matchers, such as those of real numbers, match a `double` and nothing that converts to it.
template <class Matcher>
inline constexpr bool matchesOnlyReals =
    std::is_convertible_v<Matcher, testing::Matcher<double>> && !std::is_arithmetic_v<Matcher> &&
    !std::is_convertible_v<Matcher, testing::Matcher<const FieldValue&>>;

template <class Matcher>
using FieldMatched = std::conditional_t<matchesOnlyReals<Matcher>, double, const FieldValue&>;

template <class Matcher>
auto fieldMatcher(const Matcher& matcher) {
  if constexpr (std::convertible_to<Matcher, std::string_view>) {
    // GoogleTest prints the address of a C string.
    return testing::MatcherCast<FieldMatched<Matcher>>(std::string(std::string_view(matcher)));
  } else {
    return testing::MatcherCast<FieldMatched<Matcher>>(matcher);
  }
}

// Returns the metadata's component, which may be null.
inline rt::String componentOf(const LUMLogMessage& message) {
  return message.logMetadata() ? message.logMetadata()->component() : nullptr;
}

// Returns the value of a field, or null.
inline const rt::Object* fieldOf(const LUMLogMessage& message, std::string_view name) {
  if (!message.logMetadata()) return nullptr;
  return message.logMetadata()->properties()->objectForKey(rt::String::fromUTF8(name));
}

template <class Type, class Matcher>
std::string described(const char* what, bool isNegated, const Matcher& matcher) {
  return (isNegated ? std::string("has no ") : std::string("has a ")) + what + " that " +
         testing::DescribeMatcher<Type>(matcher);
}

// Returns whether `value` matches, and says what it is: a test that fails says which part did not match.
template <class Matcher, class Value>
bool explained(const std::string& what, const Matcher& matcher, const Value& value,
               testing::MatchResultListener* listener) {
  testing::StringMatchResultListener reason;
  const bool isMatch = testing::ExplainMatchResult(matcher, value, &reason);
  *listener << "whose " << what << " is " << testing::PrintToString(value);
  if (!reason.str().empty()) *listener << ", " << reason.str();
  return isMatch;
}

}  // namespace LUMLogMatchersDetail

namespace LUMLogMatchers {

/// Matches a message whose text matches. A null text matches nothing.
MATCHER_P(HasText, matcher, LUMLogMatchersDetail::described<std::string>("text", negation, matcher)) {
  const rt::String& text = arg->formattedString();
  if (text) {
    return LUMLogMatchersDetail::explained("text", matcher, LUMLogMatchersDetail::textOf(text),
                                           result_listener);
  }
  *result_listener << "which has no text";
  return false;
}

/// Matches a message whose level matches.
MATCHER_P(HasLevel, matcher, LUMLogMatchersDetail::described<LUMLogLevel>("level", negation, matcher)) {
  return LUMLogMatchersDetail::explained("level", matcher, arg->level(), result_listener);
}

/// Matches a message whose component matches. Does not match one without a component.
MATCHER_P(HasComponent, matcher,
          LUMLogMatchersDetail::described<std::string>("component", negation, matcher)) {
  const rt::String component = LUMLogMatchersDetail::componentOf(*arg);
  if (component) {
    return LUMLogMatchersDetail::explained("component", matcher, LUMLogMatchersDetail::textOf(component),
                                           result_listener);
  }
  *result_listener << "which has no component";
  return false;
}

/// Matches a message with a field of this name whose value matches. A number matches by its value, any other
/// value by its text or its description. Properties of the metadata are fields, too.
MATCHER_P2(HasField, name, matcher,
           LUMLogMatchersDetail::described<LUMLogMatchersDetail::FieldMatched<matcher_type>>(
               ("field \"" + std::string(name) + '"').c_str(), negation,
               LUMLogMatchersDetail::fieldMatcher(matcher))) {
  const std::string field = "field \"" + std::string(name) + '"';
  const rt::Object* const object = LUMLogMatchersDetail::fieldOf(*arg, name);
  if (object == nullptr) {
    *result_listener << "which has no " << field;
    return false;
  }
  const LUMLogMatchersDetail::FieldValue value(*object);
  if constexpr (LUMLogMatchersDetail::matchesOnlyReals<matcher_type>) {
    if (value.isNumber()) {
      return LUMLogMatchersDetail::explained(field, matcher, static_cast<double>(value), result_listener);
    }
    *result_listener << "whose " << field << " is not a number";
    return false;
  } else {
    return LUMLogMatchersDetail::explained(field, LUMLogMatchersDetail::fieldMatcher(matcher), value,
                                           result_listener);
  }
}

}  // namespace LUMLogMatchers

/// Prints a message for GoogleTest: the level, the component, the text, the fields and the place.
///
///     | error [Importer] "no route to a" {tries: 3, user: "ann"} at Network.cpp:7
inline void PrintTo(const LUMLogMessage& message, std::ostream* stream) {
  *stream << LUMLogMatchersDetail::nameOf(message.level());
  if (const rt::String component = LUMLogMatchersDetail::componentOf(message))
    *stream << " [" << component.view() << ']';
  if (message.formattedString()) {
    *stream << ' ' << testing::PrintToString(LUMLogMatchersDetail::textOf(message.formattedString()));
  } else {
    *stream << " without text";
  }
  std::map<std::string, const rt::Object*> fields;
  if (message.logMetadata()) {
    for (const auto& [key, value] : *message.logMetadata()->properties()) {
      if (!rt::isEqual(key, rt::Ref<rt::Object>(LUMLogMetadata::kComponentKey)))
        fields.emplace(LUMLogMatchersDetail::textOf(key->description()), value.get());
    }
  }
  const char* separator = " {";
  for (const auto& [name, value] : fields) {
    *stream << std::exchange(separator, ", ") << name << ": ";
    PrintTo(LUMLogMatchersDetail::FieldValue(*value), stream);
  }
  if (!fields.empty()) *stream << '}';
  if (!message.file().isEmpty()) *stream << " at " << message.file().view() << ':' << message.line();
}

inline void PrintTo(const rt::Ref<LUMLogMessage>& message, std::ostream* stream) {
  if (message) {
    PrintTo(*message, stream);
  } else {
    *stream << "no message";
  }
}
