#include "Runtime/Text/Description.h"

#include <array>
#include <charconv>
#include <cmath>
#include <cstddef>

namespace rt::detail {

namespace {

constexpr std::int64_t kSecondsPerDay = 86'400;

constexpr std::int64_t floorDivide(std::int64_t dividend, std::int64_t divisor) noexcept {
  const std::int64_t quotient = dividend / divisor;
  return dividend % divisor < 0 ? quotient - 1 : quotient;
}

struct Date {
  std::int64_t year;
  unsigned month;
  unsigned day;
};

// Returns the date of the Gregorian calendar that is `days` after 1970-01-01. Counts in eras of 400 years,
// which begin on the first of March, so that a leap day is the last of its year.
Date dateOf(std::int64_t days) noexcept {
  constexpr std::int64_t kDaysPerEra = 146'097;
  constexpr std::int64_t kDaysTo1970 = 719'468;  // Since 0000-03-01.
  const std::int64_t shifted = days + kDaysTo1970;
  const std::int64_t era = floorDivide(shifted, kDaysPerEra);
  const auto dayOfEra = static_cast<unsigned>(shifted - era * kDaysPerEra);
  const unsigned yearOfEra = (dayOfEra - dayOfEra / 1460 + dayOfEra / 36'524 - dayOfEra / 146'096) / 365;
  const unsigned dayOfYear = dayOfEra - (365 * yearOfEra + yearOfEra / 4 - yearOfEra / 100);
  const unsigned monthFromMarch = (5 * dayOfYear + 2) / 153;
  const unsigned day = dayOfYear - (153 * monthFromMarch + 2) / 5 + 1;
  const unsigned month = monthFromMarch < 10 ? monthFromMarch + 3 : monthFromMarch - 9;
  return {yearOfEra + era * 400 + (month <= 2 ? 1 : 0), month, day};
}

// Appends a number, a real one with the fewest digits that are read as the same number.
template <class Number>
void appendDigits(StringBuilder& builder, Number value) {
  constexpr std::size_t kLongest = 32;
  char* const text = builder.prepare(kLongest);
  builder.commit(static_cast<std::size_t>(std::to_chars(text, text + kLongest, value).ptr - text));
}

// Appends a number that is not negative, with zeros before it up to a width.
void appendPadded(StringBuilder& builder, std::int64_t value, int width) {
  for (std::int64_t limit = 10; width > 1; --width, limit *= 10) {
    if (value < limit) {
      builder.append(static_cast<std::size_t>(width - 1), '0');
      break;
    }
  }
  appendDigits(builder, value);
}

// Appends a point and the digits of a fraction of a second: all that it has, and as many as its denominator
// has zeros, but at most nine.
void appendFraction(StringBuilder& builder, std::int64_t fraction, std::int64_t denominator) {
  if (denominator == 1) return;
  builder.append('.');
  for (std::int64_t part = 1, digits = 0; (part < denominator || fraction != 0) && digits < 9;
       part *= 10, ++digits) {
    fraction *= 10;
    builder.append(static_cast<char>('0' + fraction / denominator));
    fraction %= denominator;
  }
}

}  // namespace

void appendInteger(StringBuilder& builder, std::int64_t value) {
  appendDigits(builder, value);
}

void appendUnsigned(StringBuilder& builder, std::uint64_t value) {
  appendDigits(builder, value);
}

void appendReal(StringBuilder& builder, double value) {
  // C++ libraries do not agree on its text.
  if (std::isnan(value)) {
    builder.append("nan");
  } else {
    appendDigits(builder, value);
  }
}

void appendText(StringBuilder& builder, std::string_view bytes) {
  builder.append(String::fromUTF8Repaired(bytes).view());
}

void appendUnit(StringBuilder& builder, std::int64_t numerator, std::int64_t denominator) {
  struct Unit {
    std::int64_t numerator;
    std::int64_t denominator;
    std::string_view name;
  };
  constexpr std::array kUnits = {Unit{1, 1'000'000'000, "ns"}, Unit{1, 1'000'000, "\u00B5s"},
                                 Unit{1, 1'000, "ms"},         Unit{1, 1, "s"},
                                 Unit{60, 1, "min"},           Unit{3'600, 1, "h"},
                                 Unit{kSecondsPerDay, 1, "d"}};
  for (const Unit& unit : kUnits) {
    if (unit.numerator == numerator && unit.denominator == denominator) {
      builder.append(unit.name);
      return;
    }
  }
  builder.append('[');
  appendInteger(builder, numerator);
  if (denominator != 1) {
    builder.append('/');
    appendInteger(builder, denominator);
  }
  builder.append("]s");
}

void appendSystemTime(StringBuilder& builder, std::int64_t count, std::int64_t numerator,
                      std::int64_t denominator) {
  // The product of a count and a long period may be too large for a number. Nobody means such a time.
  std::int64_t seconds = 0;
  if (__builtin_mul_overflow(count / denominator, numerator, &seconds)) {
    appendInteger(builder, count);
    appendUnit(builder, numerator, denominator);
    return;
  }
  const std::int64_t rest = count % denominator * numerator;
  seconds += floorDivide(rest, denominator);
  const std::int64_t fraction = rest - floorDivide(rest, denominator) * denominator;
  const std::int64_t days = floorDivide(seconds, kSecondsPerDay);
  const std::int64_t ofDay = seconds - days * kSecondsPerDay;
  const Date date = dateOf(days);
  if (date.year < 0) builder.append('-');
  appendPadded(builder, date.year < 0 ? -date.year : date.year, 4);
  builder.append('-');
  appendPadded(builder, date.month, 2);
  builder.append('-');
  appendPadded(builder, date.day, 2);
  builder.append('T');
  appendPadded(builder, ofDay / 3600, 2);
  builder.append(':');
  appendPadded(builder, ofDay / 60 % 60, 2);
  builder.append(':');
  appendPadded(builder, ofDay % 60, 2);
  appendFraction(builder, fraction, denominator);
  builder.append('Z');
}

}  // namespace rt::detail
