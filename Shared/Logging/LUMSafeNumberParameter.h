#pragma once

/// A number that is safe to show and, if its type allows, to upload.
///
///     LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(4), 1)->description();  // "4"
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: a number that identifies a person.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMSafeParameter.h"

class RT_VISIBLE LUMSafeNumberParameter
    : public rt::Implements<LUMSafeNumberParameter, rt::Object, LUMSafeParameter> {
 public:
  /// Makes a parameter of `number`, which may be null. Throws std::bad_alloc.
  static rt::Ref<LUMSafeNumberParameter> parameterWithNumber(rt::Ref<rt::Number> number, std::uint64_t type) {
    return initWithNumber(std::move(number), type);
  }
  static rt::Ref<LUMSafeNumberParameter> initWithNumber(rt::Ref<rt::Number> number, std::uint64_t type);

  std::uint64_t type() const override { return type_; }
  bool isUploadSafeType() const override { return isUploadSafe(type_); }

  /// Returns the number as given.
  const rt::Ref<rt::Number>& numberValue() const noexcept { return numberValue_; }

  /// Returns whether `other` is a LUMSafeNumberParameter with an equal type and number.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// Returns the number's description; null if the number is null.
  rt::String description() const override;

 protected:
  LUMSafeNumberParameter(rt::Ref<rt::Number> number, std::uint64_t type) noexcept
      : type_(type), numberValue_(std::move(number)) {}

 private:
  const std::uint64_t type_;
  const rt::Ref<rt::Number> numberValue_;
};
