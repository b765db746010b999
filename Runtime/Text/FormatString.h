#pragma once

/// A literal format that the compiler has checked against the types of its arguments.
///
///     template <class... Arguments>
///     void report(rt::FormatString<std::type_identity_t<Arguments>...> format,
///                 const Arguments&... arguments);
///
///     report("%@ has %d entries", name, 3);
///     // report("%@ has %d entries", name);                does not compile: tooFewArguments
///     // report("%@ has %d entries"_s, name, "three");     does not compile: directiveTakesAnInteger
///
/// A mistake does not compile: the compiler says that it cannot call a function of `rt::formatMistake`. The
/// name of the function says what is wrong. Signed and unsigned integers are interchangeable. As in C, the
/// size of an integer must fit.
///
/// A format made from `"..."_s` returns that string without allocating. A format made from a plain literal
/// allocates each time `string()` is called.
///
/// Not for: formats that are known only at run time (`rt::formatV`, Runtime/Text/Format.h).

#include <cstddef>
#include <span>
#include <string_view>

#include "Runtime/Objects/String.h"
#include "Runtime/Text/FormatArguments.h"
#include "Runtime/Text/FormatDirective.h"

namespace rt {

/// The mistakes that a literal format can have. These functions are not constexpr, so a call to one of them
/// does not compile. They have no definitions.
namespace formatMistake {
void tooFewArguments();
void tooManyArguments();
void directiveIsUnknownOrIncomplete();
void directiveTakesAnObject();
void directiveTakesAnInteger();
void directiveTakesAnIntegerOfAnotherSize();
void directiveTakesARealNumber();
void directiveTakesALongDouble();
void directiveTakesADoubleButTheArgumentIsALongDouble();
void directiveTakesATextThatEndsWithNul();
void directiveTakesAWideTextThatEndsWithNul();
void directiveTakesAPointer();
void directiveThatWritesIsRefused();
void widthOrPrecisionTakesAnInt();
void positionsMustBeGivenToAllDirectivesOrNone();
void formatIsNotValidUTF8();
}  // namespace formatMistake

namespace detail {

/// Reads a format as the formatter does. Calls a function of `formatMistake` at the first mistake.
class FormatCheck {
 public:
  constexpr FormatCheck(std::string_view format, std::span<const ArgumentTraits> arguments)
      : format_(format), arguments_(arguments) {}

  constexpr void run() {
    if (!isValidUTF8(format_)) formatMistake::formatIsNotValidUTF8();
    for (std::size_t i = 0; i < format_.size();) {
      if (format_[i] != '%') {
        ++i;
        continue;
      }
      FormatDirective directive;
      const std::size_t length = parseFormatDirective(format_, i, directive);
      if (length == 0) formatMistake::directiveIsUnknownOrIncomplete();
      checkDirective(directive);
      i += length;
    }
    for (std::size_t i = next_; i < arguments_.size(); ++i) {
      if (i >= std::size(isUsed_) || !isUsed_[i]) formatMistake::tooManyArguments();
    }
  }

 private:
  constexpr void checkDirective(const FormatDirective& directive) {
    havePositions_ = havePositions_ || directive.hasPositions();
    haveNext_ = haveNext_ || directive.takesNext();
    if (havePositions_ && haveNext_) formatMistake::positionsMustBeGivenToAllDirectivesOrNone();
    checkNumber(directive.width);
    checkNumber(directive.precision);
    if (directive.argument() != FormatArgument::kNone) {
      checkArgument(directive, argumentAt(directive.position));
    }
  }

  constexpr void checkNumber(const FormatDirective::Number& number) {
    if (!number.isArgument) return;
    const ArgumentTraits argument = argumentAt(number.position);
    if (argument.passedAs != FormatArgument::kInt) formatMistake::widthOrPrecisionTakesAnInt();
  }

  static constexpr void checkArgument(const FormatDirective& directive, const ArgumentTraits& argument) {
    switch (directive.argument()) {
      case FormatArgument::kInt:
      case FormatArgument::kLong:
        if (argument.passedAs != FormatArgument::kInt && argument.passedAs != FormatArgument::kLong) {
          formatMistake::directiveTakesAnInteger();
        }
        if (argument.passedAs != directive.argument()) {
          formatMistake::directiveTakesAnIntegerOfAnotherSize();
        }
        break;
      case FormatArgument::kDouble:
        if (argument.passedAs == FormatArgument::kLongDouble) {
          formatMistake::directiveTakesADoubleButTheArgumentIsALongDouble();
        }
        if (argument.passedAs != FormatArgument::kDouble) formatMistake::directiveTakesARealNumber();
        break;
      case FormatArgument::kLongDouble:
        if (argument.passedAs != FormatArgument::kLongDouble) formatMistake::directiveTakesALongDouble();
        break;
      default:
        checkPointer(directive, argument);
    }
  }

  static constexpr void checkPointer(const FormatDirective& directive, const ArgumentTraits& argument) {
    const bool isText = argument.kind == ArgumentKind::kText;
    if (directive.conversion == 'n') formatMistake::directiveThatWritesIsRefused();
    if (directive.conversion == '@') {
      if (argument.kind != ArgumentKind::kObject && !argument.isNull) formatMistake::directiveTakesAnObject();
    } else if (directive.conversion == 'p') {
      if (argument.passedAs != FormatArgument::kPointer) formatMistake::directiveTakesAPointer();
    } else if (!argument.isNull && (!isText || argument.isWide != directive.isWide())) {
      if (directive.isWide()) formatMistake::directiveTakesAWideTextThatEndsWithNul();
      formatMistake::directiveTakesATextThatEndsWithNul();
    }
  }

  constexpr ArgumentTraits argumentAt(int position) {
    const std::size_t i = position == 0 ? next_++ : static_cast<std::size_t>(position) - 1;
    if (i >= arguments_.size()) formatMistake::tooFewArguments();
    if (position != 0) isUsed_[i] = true;
    return arguments_[i];
  }

  std::string_view format_;
  std::span<const ArgumentTraits> arguments_;
  std::size_t next_ = 0;
  bool havePositions_ = false;
  bool haveNext_ = false;
  bool isUsed_[FormatDirective::kMaximumPosition] = {};
};

}  // namespace detail

/// A format for arguments of these types. It is a constant, and its text lives as long as the program.
template <class... Arguments>
class FormatString {
 public:
  /// Checks a plain literal.
  template <std::size_t size>
  consteval FormatString(const char (&literal)[size]) : text_(literal, size - 1) {
    check();
  }

  /// Checks `"..."_s`, or a constant that was made from it.
  consteval FormatString(const String& literal) : text_(literal.view()), object_(literal.object()) {
    check();
  }

  constexpr std::string_view view() const noexcept { return text_; }

  /// Returns the text as a string. Allocates and may throw std::bad_alloc if the format was a plain literal.
  String string() const {
    return object_ != nullptr ? String::from(Ref<StringObject>(object_)) : String::overStatic(text_);
  }

 private:
  consteval void check() const {
    constexpr std::array<detail::ArgumentTraits, sizeof...(Arguments)> kTraits{
        detail::kArgumentTraits<Arguments>...};
    detail::FormatCheck(text_, kTraits).run();
  }

  std::string_view text_;
  StringObject* object_ = nullptr;
};

}  // namespace rt
