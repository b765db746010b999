#pragma once

/// Parses one directive of a format, such as "%-5.*2$ld". The formatter and the check at compile time share
/// this grammar.
///
///     | %[POSITION$][FLAGS][WIDTH][.PRECISION][LENGTH]CONVERSION
///     |
///     | POSITION    1 to 64: the argument, counted from 1; the next argument if there is no position
///     | FLAGS       any of - + space # 0 '
///     | WIDTH       a number, or * for an int argument, or *POSITION$
///     | PRECISION   the same; 0 if nothing follows the dot
///     | LENGTH      h hh l ll j z t q L, if the conversion allows it
///     | CONVERSION  d i u o x X   integer: int, or 64 bits with l ll j z t q L
///     |             f F e E g G a A   double; long double with L
///     |             c, s          byte, and bytes that end with NUL; wide with l
///     |             C, S          wide character, and wide characters that end with NUL
///     |             p             pointer
///     |             @             object, or null
///     |             n             pointer, which is ignored: nothing is printed or written
///     |             %             a percent sign; takes no argument
///
/// Not for: formatting, which is in Runtime/Text/Format.h.

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace rt {

/// The type that a directive reads from the argument list. It suffices for stepping over the argument.
enum class FormatArgument : std::uint8_t { kNone, kInt, kLong, kDouble, kLongDouble, kPointer };

struct FormatDirective {
  /// The largest position. A larger one makes the directive invalid.
  static constexpr int kMaximumPosition = 64;
  /// The `value` of a width or precision that has no number in the format.
  static constexpr int kNone = -1;

  enum Flag : std::uint8_t {
    kLeft = 1,
    kSign = 2,
    kSpace = 4,
    kAlternate = 8,
    kZero = 16,
    kGroup = 32,
  };
  // kLongLong stands for ll, j, z, t and q, which all mean 64 bits.
  enum class Length : std::uint8_t { kDefault, kByte, kShort, kLong, kLongLong, kLongDouble };

  /// A width or precision.
  struct Number {
    /// The number, at most INT_MAX, or `kNone`.
    int value = kNone;
    /// Whether an argument gives the number.
    bool isArgument = false;
    /// The position of that argument. 0 means the next argument.
    int position = 0;
  };

  int position = 0;
  std::uint8_t flags = 0;
  Number width;
  Number precision;
  Length length = Length::kDefault;
  char conversion = '\0';

  constexpr FormatArgument argument() const noexcept {
    switch (conversion) {
      case 'd':
      case 'i':
      case 'u':
      case 'o':
      case 'x':
      case 'X':
        return length >= Length::kLong ? FormatArgument::kLong : FormatArgument::kInt;
      case 'c':
      case 'C':
        return FormatArgument::kInt;
      case 'f':
      case 'F':
      case 'e':
      case 'E':
      case 'g':
      case 'G':
      case 'a':
      case 'A':
        return length == Length::kLongDouble ? FormatArgument::kLongDouble : FormatArgument::kDouble;
      case '%':
        return FormatArgument::kNone;
      default:
        return FormatArgument::kPointer;
    }
  }

  /// Returns whether the directive prints a wide character or wide text.
  constexpr bool isWide() const noexcept {
    return conversion == 'C' || conversion == 'S' || length == Length::kLong;
  }

  /// `hasPositions` returns whether the directive takes an argument by position. `takesNext` returns whether
  /// it takes an argument without a position.
  constexpr bool hasPositions() const noexcept {
    return position != 0 || width.position != 0 || precision.position != 0;
  }
  constexpr bool takesNext() const noexcept {
    return (argument() != FormatArgument::kNone && position == 0) ||
           (width.isArgument && width.position == 0) || (precision.isArgument && precision.position == 0);
  }
};

/// Reads the directive that begins with the "%" at `format[start]`. Returns its length in bytes. Returns 0 if
/// it is unknown or incomplete, or if a position is out of range.
constexpr std::size_t parseFormatDirective(std::string_view format, std::size_t start,
                                           FormatDirective& directive) noexcept;

namespace detail {

class FormatDirectiveParser {
 public:
  constexpr FormatDirectiveParser(std::string_view format, std::size_t start) noexcept
      : format_(format), next_(start + 1) {}

  constexpr std::size_t next() const noexcept { return next_; }

  constexpr bool parse(FormatDirective& directive) noexcept {
    // Most directives are a conversion and nothing else.
    if (suits(Length::kDefault, peek())) {
      directive.conversion = format_[next_++];
      return true;
    }
    if (!parsePosition(directive.position)) return false;
    while (const std::uint8_t flag = flagOf(peek())) {
      directive.flags |= flag;
      ++next_;
    }
    if (!parseNumber(directive.width)) return false;
    if (peek() == '.') {
      ++next_;
      if (!parseNumber(directive.precision)) return false;
      if (directive.precision.value == FormatDirective::kNone) directive.precision.value = 0;
    }
    directive.length = parseLength();
    directive.conversion = peek();
    if (directive.conversion == '%') directive.position = 0;  // "%%" takes no argument
    if (next_++ >= format_.size()) return false;
    return suits(directive.length, directive.conversion);
  }

 private:
  using Length = FormatDirective::Length;

  constexpr char peek(std::size_t ahead = 0) const noexcept {
    return next_ + ahead < format_.size() ? format_[next_ + ahead] : '\0';
  }

  static constexpr std::uint8_t flagOf(char c) noexcept {
    switch (c) {
      case '-':
        return FormatDirective::kLeft;
      case '+':
        return FormatDirective::kSign;
      case ' ':
        return FormatDirective::kSpace;
      case '#':
        return FormatDirective::kAlternate;
      case '0':
        return FormatDirective::kZero;
      case '\'':
        return FormatDirective::kGroup;
      default:
        return 0;
    }
  }

  // Returns the number of digits at `next_`. Sets `value` if there are any, to at most INT_MAX.
  constexpr std::size_t digits(int& value) const noexcept {
    constexpr int kLargest = 0x7FFFFFFF;
    std::size_t count = 0;
    for (; peek(count) >= '0' && peek(count) <= '9'; ++count) {
      const int digit = peek(count) - '0';
      if (count == 0) value = 0;
      value = value > (kLargest - digit) / 10 ? kLargest : (value * 10) + digit;
    }
    return count;
  }

  // Reads "N$", if it is there. Returns false if N is out of range.
  constexpr bool parsePosition(int& position) noexcept {
    int value = 0;
    const std::size_t count = digits(value);
    if (count == 0 || peek(count) != '$') return true;
    next_ += count + 1;
    position = value;
    return value >= 1 && value <= FormatDirective::kMaximumPosition;
  }

  constexpr bool parseNumber(FormatDirective::Number& number) noexcept {
    if (peek() == '*') {
      ++next_;
      number.isArgument = true;
      return parsePosition(number.position);
    }
    next_ += digits(number.value);
    return true;
  }

  constexpr Length parseLength() noexcept {
    const char c = peek();
    switch (c) {
      case 'h':
      case 'l': {
        const bool isDouble = peek(1) == c;
        next_ += isDouble ? 2 : 1;
        if (c == 'h') return isDouble ? Length::kByte : Length::kShort;
        return isDouble ? Length::kLongLong : Length::kLong;
      }
      case 'j':
      case 'z':
      case 't':
      case 'q':
        ++next_;
        return Length::kLongLong;
      case 'L':
        ++next_;
        return Length::kLongDouble;
      default:
        return Length::kDefault;
    }
  }

  static constexpr bool suits(Length length, char conversion) noexcept {
    switch (conversion) {
      case 'd':
      case 'i':
      case 'u':
      case 'o':
      case 'x':
      case 'X':
      case 'n':
      case '%':
        return true;
      case 'f':
      case 'F':
      case 'e':
      case 'E':
      case 'g':
      case 'G':
      case 'a':
      case 'A':
        return length == Length::kDefault || length == Length::kLong || length == Length::kLongDouble;
      case 'c':
      case 's':
        return length == Length::kDefault || length == Length::kLong;
      case 'C':
      case 'S':
      case 'p':
      case '@':
        return length == Length::kDefault;
      default:
        return false;
    }
  }

  std::string_view format_;
  std::size_t next_;
};

}  // namespace detail

constexpr std::size_t parseFormatDirective(std::string_view format, std::size_t start,
                                           FormatDirective& directive) noexcept {
  detail::FormatDirectiveParser parser(format, start);
  directive = {};
  return parser.parse(directive) ? parser.next() - start : 0;
}

}  // namespace rt
