// Compares the formatter with snprintf for formats that C defines. For other formats, checks that the
// formatter keeps its contract.
#include <fuzzer/FuzzedDataProvider.h>

#include <algorithm>
#include <array>
#include <clocale>
#include <cstdarg>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Runtime/Base/UTF8.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Text/Format.h"

// The fuzzer builds formats at run time.
#pragma clang diagnostic ignored "-Wformat-nonliteral"

namespace {

void require(bool condition, const std::string& format, std::string_view expected = {},
             std::string_view actual = {}) {
  if (condition) return;
  std::fprintf(stderr, "format:   %s\nexpected: %.*s\nactual:   %.*s\n", format.c_str(), int(expected.size()),
               expected.data(), int(actual.size()), actual.data());
  std::abort();
}

rt::String ours(const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  rt::String text = rt::formatV(format, arguments);
  va_end(arguments);
  return text;
}

std::string theirs(const char* format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
  std::va_list again;
  va_copy(again, arguments);
  const int length = std::vsnprintf(nullptr, 0, format, arguments);
  va_end(arguments);
  if (length < 0) std::abort();
  std::string text(static_cast<std::size_t>(length) + 1, '\0');
  std::vsnprintf(text.data(), text.size(), format, again);
  va_end(again);
  text.pop_back();
  return text;
}

template <class... Arguments>
void compare(const std::string& format, Arguments... arguments) {
  const rt::String expected = rt::String::fromUTF8Repaired(theirs(format.c_str(), arguments...));
  const rt::String actual = ours(format.c_str(), arguments...);
  require(actual == expected, format, expected, actual);
}

// Builds random directives that C defines.
class DirectiveMaker {
 public:
  explicit DirectiveMaker(FuzzedDataProvider& data) : data_(data) {}

  // Returns a width or precision: "", a number, or "*" for the next argument. Stores that argument's value.
  std::string number(int& argument, bool& isArgument) {
    isArgument = false;
    switch (data_.ConsumeIntegralInRange(0, 2)) {
      case 0:
        return "";
      case 1:
        // C guarantees no larger widths.
        return std::to_string(
            data_.ConsumeIntegralInRange(1, data_.ConsumeBool() ? 40 : rt::kMaximumFieldWidth));
      default:
        isArgument = true;
        argument = data_.ConsumeIntegralInRange(-200, 200);
        return "*";
    }
  }

  std::string flags(std::string_view allowed) {
    std::string text;
    const unsigned bits = data_.ConsumeIntegral<std::uint8_t>();
    for (std::size_t i = 0; i < allowed.size(); ++i) {
      if ((bits >> i) & 1) text += allowed[i];
    }
    return text;
  }

  char oneOf(std::string_view conversions) {
    return conversions[data_.ConsumeIntegralInRange<std::size_t>(0, conversions.size() - 1)];
  }

  // Calls `compare` with the directive, its value, and its width and precision if they are arguments.
  template <class T>
  void check(const std::string& flags, bool hasPrecision, const std::string& length, char conversion,
             T value) {
    int width = 0;
    int precision = 0;
    bool isWidthArgument = false;
    bool isPrecisionArgument = false;
    std::string format = "a%" + flags + number(width, isWidthArgument);
    if (hasPrecision) format += "." + number(precision, isPrecisionArgument);
    format += length + conversion + "%%z";
    if (isWidthArgument && isPrecisionArgument) return compare(format, width, precision, value);
    if (isWidthArgument) return compare(format, width, value);
    if (isPrecisionArgument) return compare(format, precision, value);
    compare(format, value);
  }

 private:
  FuzzedDataProvider& data_;
};

void checkInteger(FuzzedDataProvider& data) {
  DirectiveMaker maker(data);
  const char conversion = maker.oneOf("diuoxX");
  const bool isSigned = conversion == 'd' || conversion == 'i';
  const std::string flags = maker.flags(isSigned ? "-+ 0'" : conversion == 'u' ? "-0'" : "-#0");
  const bool hasPrecision = data.ConsumeBool();
  const auto value = data.ConsumeIntegral<long long>();
  static constexpr std::array<const char*, 9> kLengths{"", "h", "hh", "l", "ll", "j", "z", "t", "q"};
  const std::string length = kLengths[data.ConsumeIntegralInRange<std::size_t>(0, kLengths.size() - 1)];
  if (length.empty() || length[0] == 'h')
    return maker.check(flags, hasPrecision, length, conversion, int(value));
  maker.check(flags, hasPrecision, length, conversion, value);
}

void checkReal(FuzzedDataProvider& data) {
  DirectiveMaker maker(data);
  const char conversion = maker.oneOf("fFeEgGaA");
  const std::string flags = maker.flags("-+ #0'");
  const bool hasPrecision = data.ConsumeBool();
  std::uint64_t bits = data.ConsumeIntegral<std::uint64_t>();
  double value = 0;
  std::memcpy(&value, &bits, sizeof value);
  if (data.ConsumeBool()) {
    return maker.check(flags, hasPrecision, "L", conversion, static_cast<long double>(value) / 3);
  }
  maker.check(flags, hasPrecision, data.ConsumeBool() ? "l" : "", conversion, value);
}

// Returns `text` cut to a precision, without an incomplete character at its end.
std::string_view cut(std::string_view text, std::size_t precision) {
  if (text.size() < precision) return text;
  text = text.substr(0, precision);
  for (std::size_t i = 1; i <= 3 && i <= text.size(); ++i) {
    const std::string_view tail = text.substr(text.size() - i);
    // The tail is the beginning of a character if some bytes after it make it one.
    for (const std::string_view rest : {"\x80", "\xBF", "\x80\x80", "\xBF\xBF", "\x80\x80\x80",
                                        "\xBF\xBF\xBF", "\x90\x80\x80", "\xA0\x80"}) {
      const std::string whole = std::string(tail) + std::string(rest);
      if (rt::isValidUTF8(whole) && !rt::isValidUTF8(tail) && rt::nextUTF8(whole).length == whole.size()) {
        return text.substr(0, text.size() - i);
      }
    }
  }
  return text;
}

void checkText(FuzzedDataProvider& data) {
  DirectiveMaker maker(data);
  const std::string flags = maker.flags("-");
  if (data.ConsumeBool()) return maker.check(flags, false, "", 'c', data.ConsumeIntegral<int>());
  const bool hasPrecision = data.ConsumeBool();
  const std::size_t precision = data.ConsumeIntegralInRange<std::size_t>(0, 20);
  const std::string text = data.ConsumeRandomLengthString(40);
  if (!hasPrecision) return maker.check(flags, false, "", 's', text.c_str());
  const std::string_view whole = text.c_str();
  const std::string expected = theirs("<%s>", std::string(cut(whole, precision)).c_str());
  const rt::String repaired = rt::String::fromUTF8Repaired(expected);
  // If the text is as long as the precision, no NUL follows. So the formatter must not read further.
  std::vector<char> bytes(whole.substr(0, precision).begin(), whole.substr(0, precision).end());
  if (bytes.size() < precision) bytes.push_back('\0');
  const std::string format = "<%." + std::to_string(precision) + "s>";
  const rt::String actual = ours(format.c_str(), bytes.data());
  require(actual == repaired, format, repaired, actual);
}

void checkWide(FuzzedDataProvider& data) {
  DirectiveMaker maker(data);
  const std::string flags = maker.flags("-");
  std::wstring text;
  const std::size_t count = data.ConsumeIntegralInRange<std::size_t>(0, 12);
  for (std::size_t i = 0; i < count; ++i) {
    const auto character = data.ConsumeIntegralInRange<std::uint32_t>(1, 0x10FFFF);
    text += static_cast<wchar_t>(character >= 0xD800 && character < 0xE000 ? 0xE9 : character);
  }
  if (data.ConsumeBool() && !text.empty()) {
    const bool isC = data.ConsumeBool();
    return maker.check(flags, false, isC ? "" : "l", isC ? 'C' : 'c', static_cast<wint_t>(text[0]));
  }
  const bool isS = data.ConsumeBool();
  maker.check(flags, data.ConsumeBool(), isS ? "" : "l", isS ? 'S' : 's', text.c_str());
}

// Checks formats whose directives take the arguments of one list by position, any number of times.
void checkPositions(FuzzedDataProvider& data) {
  DirectiveMaker maker(data);
  std::string format;
  const auto add = [&](int position) {
    std::string width;
    if (data.ConsumeBool())
      width = data.ConsumeBool() ? "*1$" : std::to_string(data.ConsumeIntegralInRange(1, 50));
    std::string precision;
    if (data.ConsumeBool()) precision = data.ConsumeBool() ? ".*2$" : ".7";
    const std::string start = "[%" + std::to_string(position) + "$";
    switch (position) {
      case 1:
      case 2:
        format += start + maker.flags("-0") + width + precision + maker.oneOf("diux") + ']';
        break;
      case 3:
        format += start + maker.flags("-0") + width + precision + (data.ConsumeBool() ? "l" : "j") +
                  maker.oneOf("diuxX") + ']';
        break;
      case 4:
        format += start + maker.flags("-+ #0") + width + precision + maker.oneOf("fFeEgGaA") + ']';
        break;
      case 5:
        format += start + maker.flags("-+ #0") + width + precision + 'L' + maker.oneOf("fFeEgGaA") + ']';
        break;
      default:
        format += start + maker.flags("-") + width + precision + 's' + ']';
        break;
    }
  };
  const std::size_t count = data.ConsumeIntegralInRange<std::size_t>(0, 8);
  for (std::size_t i = 0; i < count; ++i) add(data.ConsumeIntegralInRange(1, 6));
  for (int position = 1; position <= 6; ++position) add(position);
  // Not negative: with positions and "0", this C library would fill with zeros on the right.
  const int width = data.ConsumeIntegralInRange(0, 60);
  const int precision = data.ConsumeIntegralInRange(-60, 60);
  compare(format, width, precision, data.ConsumeIntegral<long>(), data.ConsumeFloatingPoint<double>(),
          static_cast<long double>(data.ConsumeFloatingPoint<double>()), "some text");
}

// Checks any bytes as a format. All arguments are zero, whatever type they are read as.
void checkAnything(FuzzedDataProvider& data) {
  // A directive with three arguments has five bytes ("%*.*d"), so there are enough arguments for 80 bytes.
  const std::string format = data.ConsumeRandomLengthString(80);
  rt::String text;
  const auto call = [&](auto... zeros) { text = ours(format.c_str(), zeros...); };
  [&]<std::size_t... i>(std::index_sequence<i...>) {
    call((static_cast<void>(i), 0.0)..., (static_cast<void>(i), 0L)..., (static_cast<void>(i), 0L)...,
         (static_cast<void>(i), 0L)..., (static_cast<void>(i), 0L)...);
  }(std::make_index_sequence<16>());
  const std::size_t formatLength = std::string_view(format.c_str()).size();
  require(text != nullptr && rt::isValidUTF8(text), format);
  require(text.length() <= 4 * formatLength + formatLength / 2 * rt::kMaximumFieldWidth, format);
  if (std::string_view(format.c_str()).find('%') == std::string_view::npos) {
    require(text == rt::String::fromUTF8Repaired(format.c_str()), format);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  // Our formatter always writes wide characters as UTF-8. snprintf goes by the locale.
  static const char* const kLocale = std::setlocale(LC_CTYPE, "C.UTF-8");
  if (kLocale == nullptr) std::abort();
  FuzzedDataProvider data(bytes, size);
  switch (data.ConsumeIntegralInRange(0, 5)) {
    case 0:
      checkInteger(data);
      break;
    case 1:
      checkReal(data);
      break;
    case 2:
      checkText(data);
      break;
    case 3:
      checkWide(data);
      break;
    case 4:
      checkPositions(data);
      break;
    default:
      checkAnything(data);
  }
  return 0;
}
