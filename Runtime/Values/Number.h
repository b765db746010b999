#pragma once

/// A number as an object: an integer of up to 64 bits, a real number, or a truth value.
///
///     rt::Ref<rt::Number> count = rt::Number::of(3);
///     count->integerValue();                                          // 3
///     rt::isEqual(count, rt::Number::of(3.0));                        // true: equality is by value
///
/// Numbers are equal when their values are, whatever they were made from: true, 1 and 1.0 are. Integers and
/// real numbers are compared exactly, not by rounding one of them. Not-a-number equals itself. Immutable:
/// any thread may use it.
///
/// Not for: arithmetic.

#include <compare>
#include <concepts>
#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE Number final : public Implements<Number, Object> {
 public:
  enum class Kind : std::uint8_t {
    kBoolean,
    /// An integer that a std::int64_t can hold, whatever it was made from.
    kSigned,
    /// An integer that only a std::uint64_t can hold.
    kUnsigned,
    kReal,
  };

  explicit Number(bool value) noexcept : kind_(Kind::kBoolean), integer_(value ? 1 : 0) {}
  explicit Number(double value) noexcept : kind_(Kind::kReal), real_(value) {}
  template <std::integral Integer>
    requires(sizeof(Integer) <= sizeof(std::uint64_t))
  explicit Number(Integer value) noexcept
      : kind_(value > 0 && static_cast<std::uint64_t>(value) > kLargestSigned ? Kind::kUnsigned
                                                                              : Kind::kSigned),
        integer_(static_cast<std::uint64_t>(value)) {}

  /// A new number. Throws std::bad_alloc.
  static Ref<Number> of(std::integral auto value) { return make<Number>(value); }
  static Ref<Number> of(double value) { return make<Number>(value); }

  Kind kind() const noexcept { return kind_; }

  /// The value as a signed integer. Of a real number without its fraction, or the nearest there is, and 0
  /// for not-a-number; of an unsigned integer with the same 64 bits.
  std::int64_t integerValue() const noexcept;

  /// The same as an unsigned integer: of a signed one with the same 64 bits.
  std::uint64_t unsignedValue() const noexcept;

  /// The nearest real number.
  double realValue() const noexcept;

  /// Whether the value is other than 0.
  bool booleanValue() const noexcept;

  /// How this value compares with the other. Not-a-number is equal to itself and less than all others.
  std::strong_ordering compare(const Number& other) const noexcept;

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;

  /// The value as a plain decimal, without an exponent, that reads back as the same value: "-3", "0.1";
  /// "1" and "0" for true and false; "nan", "inf", "-inf".
  String description() const override;

 private:
  static constexpr std::uint64_t kLargestSigned = 0x7FFFFFFFFFFFFFFF;

  Kind kind_;
  union {
    std::uint64_t integer_;
    double real_;
  };
};

}  // namespace rt
