#include "Runtime/Values/Number.h"

#include <array>
#include <bit>
#include <charconv>
#include <cmath>
#include <functional>
#include <limits>

namespace rt {

namespace {

constexpr double kTwoTo63 = 9223372036854775808.0;
constexpr double kTwoTo64 = 18446744073709551616.0;

std::strong_ordering compareReals(double first, double second) noexcept {
  if (std::isnan(first) && std::isnan(second)) return std::strong_ordering::equal;
  if (std::isnan(first)) return std::strong_ordering::less;
  if (std::isnan(second)) return std::strong_ordering::greater;
  if (first == second) return std::strong_ordering::equal;
  return first < second ? std::strong_ordering::less : std::strong_ordering::greater;
}

// Compares an integer with a real number and rounds neither. `integer` has the 64 bits of the integer.
std::strong_ordering compareWithReal(std::uint64_t integer, bool isNegative, double real) noexcept {
  if (std::isnan(real) || real < -kTwoTo63) return std::strong_ordering::greater;
  if (real >= kTwoTo64) return std::strong_ordering::less;
  const double whole = std::trunc(real);
  std::strong_ordering order = isNegative ? std::strong_ordering::less : std::strong_ordering::greater;
  if (whole < 0) {
    if (isNegative) order = static_cast<std::int64_t>(integer) <=> static_cast<std::int64_t>(whole);
  } else if (!isNegative) {
    order = integer <=> static_cast<std::uint64_t>(whole);
  }
  return order != 0 ? order : compareReals(whole, real);
}

}  // namespace

std::int64_t Number::integerValue() const noexcept {
  if (kind_ != Kind::kReal) return static_cast<std::int64_t>(integer_);
  if (std::isnan(real_)) return 0;
  if (real_ >= kTwoTo63) return std::numeric_limits<std::int64_t>::max();
  if (real_ < -kTwoTo63) return std::numeric_limits<std::int64_t>::min();
  return static_cast<std::int64_t>(real_);
}

std::uint64_t Number::unsignedValue() const noexcept {
  if (kind_ != Kind::kReal) return integer_;
  if (std::isnan(real_) || real_ <= 0) return 0;
  if (real_ >= kTwoTo64) return std::numeric_limits<std::uint64_t>::max();
  return static_cast<std::uint64_t>(real_);
}

double Number::realValue() const noexcept {
  if (kind_ == Kind::kReal) return real_;
  if (kind_ == Kind::kUnsigned) return static_cast<double>(integer_);
  return static_cast<double>(static_cast<std::int64_t>(integer_));
}

bool Number::booleanValue() const noexcept {
  return kind_ == Kind::kReal ? real_ != 0 : integer_ != 0;
}

std::strong_ordering Number::compare(const Number& other) const noexcept {
  if (kind_ == Kind::kReal && other.kind_ == Kind::kReal) return compareReals(real_, other.real_);
  if (kind_ == Kind::kReal) return 0 <=> other.compare(*this);
  const bool isNegative = kind_ == Kind::kSigned && integer_ > kLargestSigned;
  if (other.kind_ == Kind::kReal) return compareWithReal(integer_, isNegative, other.real_);
  const bool isOtherNegative = other.kind_ == Kind::kSigned && other.integer_ > kLargestSigned;
  if (isNegative && !isOtherNegative) return std::strong_ordering::less;
  if (isOtherNegative && !isNegative) return std::strong_ordering::greater;
  return integer_ <=> other.integer_;
}

bool Number::isEqual(const Object* other) const {
  const auto* number = cast<Number>(other);
  return number != nullptr && compare(*number) == 0;
}

std::uint64_t Number::hash() const {
  std::uint64_t bits = integer_;
  if (kind_ == Kind::kReal) {
    // A real number has the hash of the integer that it equals. All values that are not a number have one
    // hash.
    if (real_ == std::trunc(real_) && real_ >= -kTwoTo63 && real_ < kTwoTo64) {
      bits = real_ < 0 ? static_cast<std::uint64_t>(static_cast<std::int64_t>(real_))
                       : static_cast<std::uint64_t>(real_);
    } else {
      bits =
          std::bit_cast<std::uint64_t>(std::isnan(real_) ? std::numeric_limits<double>::quiet_NaN() : real_);
    }
  }
  return std::hash<std::uint64_t>()(bits);
}

String Number::description() const {
  // The longest text is that of the negative real number nearest to 0: "-0.", 323 zeros and up to 17 digits.
  std::array<char, 400> text{};
  char* const end = text.data() + text.size();
  char* last = nullptr;
  if (kind_ == Kind::kReal) {
    // C++ libraries do not agree on its text.
    if (std::isnan(real_)) return String::fromUTF8("nan");
    last = std::to_chars(text.data(), end, real_, std::chars_format::fixed).ptr;
  } else if (kind_ == Kind::kUnsigned) {
    last = std::to_chars(text.data(), end, integer_).ptr;
  } else {
    last = std::to_chars(text.data(), end, static_cast<std::int64_t>(integer_)).ptr;
  }
  return String::fromUTF8({text.data(), static_cast<std::size_t>(last - text.data())});
}

}  // namespace rt
