#pragma once

/// A text that is safe to show and, if its type allows, to upload.
///
///     LUMSafeStringParameter::parameterWithString("kTagsID"_s, 1)->description();       // "kTagsID"
///
/// Threads: thread-safe, because it is immutable.
///
/// Not for: a text with a person's name, address or other private data.

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
  /// Makes a parameter of `string`, which may be null. Throws std::bad_alloc.
  static rt::Ref<LUMSafeStringParameter> parameterWithString(rt::String string, std::uint64_t type) {
    return initWithString(std::move(string), type);
  }
  static rt::Ref<LUMSafeStringParameter> initWithString(rt::String string, std::uint64_t type);

  std::uint64_t type() const override { return type_; }
  bool isUploadSafeType() const override { return isUploadSafe(type_); }

  /// Returns the text as given.
  const rt::String& stringValue() const noexcept { return stringValue_; }

  /// Returns whether `other` is a LUMSafeStringParameter with an equal type and text.
  bool isEqual(const rt::Object* other) const override;
  std::uint64_t hash() const override;

  /// Returns the text; null if it is null.
  rt::String description() const override;

 protected:
  LUMSafeStringParameter(rt::String string, std::uint64_t type) noexcept
      : type_(type), stringValue_(std::move(string)) {}

 private:
  const std::uint64_t type_;
  const rt::String stringValue_;
};
