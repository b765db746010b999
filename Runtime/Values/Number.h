#pragma once

/// A number as an object: an integer of up to 64 bits, a real number, or a boolean.
///
///     rt::Ref<rt::Number> count = rt::Number::of(3);
///     count->integerValue();                                          // 3
///     rt::isEqual(count, rt::Number::of(3.0));                        // true: equality is by value
///
/// Numbers are equal if their values are, whatever their kinds: true, 1 and 1.0 are equal. Comparing an
/// integer with a real number rounds neither. Not-a-number equals itself.
///
/// Threads: thread-safe. Numbers are immutable.
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
    /// An integer that a std::int64_t can hold, whatever type it was made from.
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

  /// Returns a new number. Throws std::bad_alloc.
  static Ref<Number> of(std::integral auto value) { return make<Number>(value); }
  static Ref<Number> of(double value) { return make<Number>(value); }

  Kind kind() const noexcept { return kind_; }

  /// Returns the value as a signed integer. An unsigned integer keeps its 64 bits. A real number loses its
  /// fraction; out of range it gives the nearest integer in range. Not-a-number gives 0.
  std::int64_t integerValue() const noexcept;

  /// Returns the value as an unsigned integer. A signed integer keeps its 64 bits. Real numbers are converted
  /// as by `integerValue`.
  std::uint64_t unsignedValue() const noexcept;

  /// Returns the real number that is nearest to the value.
  double realValue() const noexcept;

  /// Returns whether the value is other than 0. True for not-a-number.
  bool booleanValue() const noexcept;

  /// Compares this value with the other. Not-a-number equals itself and is less than all other values.
  std::strong_ordering compare(const Number& other) const noexcept;

  bool isEqual(const Object* other) const override;
  std::uint64_t hash() const override;

  /// Returns the value as a decimal without an exponent, such as "-3" or "0.1". Reading it back gives the
  /// same value. True and false give "1" and "0". Values that are not finite give "nan", "inf" and "-inf".
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
