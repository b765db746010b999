#pragma once

/// A number that is safe to show and, if its type says so, to upload.
///
///     LUMSafeNumberParameter::parameterWithNumber(rt::Number::of(4), 1)->description();  // "4"
///
/// Immutable: any thread may use it.
///
/// Not for: a number that tells who somebody is.

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
  /// A parameter of `number`, which may be null. Throws std::bad_alloc.
  static rt::Ref<LUMSafeNumberParameter> parameterWithNumber(rt::Ref<rt::Number> number, std::uint64_t type) {
    return initWithNumber(std::move(number), type);
  }
  static rt::Ref<LUMSafeNumberParameter> initWithNumber(rt::Ref<rt::Number> number, std::uint64_t type);

  std::uint64_t type() const override { return type_; }
  bool isUploadSafeType() const override { return isUploadSafe(type_); }

  /// As given.
  const rt::Ref<rt::Number>& numberValue() const noexcept { return numberValue_; }

  /// Whether `other` is such a parameter with an equal type and an equal value.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// The value's; null for null.
  rt::String description() const override;

 protected:
  LUMSafeNumberParameter(rt::Ref<rt::Number> number, std::uint64_t type) noexcept
      : type_(type), numberValue_(std::move(number)) {}

 private:
  const std::uint64_t type_;
  const rt::Ref<rt::Number> numberValue_;
};
