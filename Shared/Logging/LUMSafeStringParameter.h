#pragma once

/// A text that is safe to show and, if its type says so, to upload.
///
///     LUMSafeStringParameter::parameterWithString("kTagsID"_s, 1)->description();       // "kTagsID"
///
/// Immutable: any thread may use it.
///
/// Not for: a text with a name, an address or anything else of a person's.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMSafeParameter.h"

class RT_VISIBLE LUMSafeStringParameter
    : public rt::Implements<LUMSafeStringParameter, rt::Object, LUMSafeParameter> {
 public:
  /// A parameter of `string`, which may be null. Throws std::bad_alloc.
  static rt::Ref<LUMSafeStringParameter> parameterWithString(rt::String string, std::uint64_t type) {
    return initWithString(std::move(string), type);
  }
  static rt::Ref<LUMSafeStringParameter> initWithString(rt::String string, std::uint64_t type);

  std::uint64_t type() const override { return type_; }
  bool isUploadSafeType() const override { return isUploadSafe(type_); }

  /// As given.
  const rt::String& stringValue() const noexcept { return stringValue_; }

  /// Whether `other` is such a parameter with an equal type and an equal value.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// The value's; null for null.
  rt::String description() const override;

 protected:
  LUMSafeStringParameter(rt::String string, std::uint64_t type) noexcept
      : type_(type), stringValue_(std::move(string)) {}

 private:
  const std::uint64_t type_;
  const rt::String stringValue_;
};
