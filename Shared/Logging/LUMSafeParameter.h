#pragma once

/// An argument of a log message that contains nothing private. The message keeps it by itself, besides
/// printing it in the text.
///
///     const auto key = LUMSafeStringParameter::parameterWithString("greeting"_s, 1);
///     LUMLogAt(LUMLogLevelError, "%@ cannot be %@"_s, key, value);       // `value` is in the text only
///
/// Two classes conform: LUMSafeStringParameter and LUMSafeNumberParameter. A message recognises an argument
/// by its class, whose name must begin with one of these two names.
///
/// Not for: hiding the other arguments, which appear in the text too.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE LUMSafeParameter : rt::Protocol<LUMSafeParameter> {
  /// Returns the kind of value, as a number that the caller defines.
  virtual std::uint64_t type() const = 0;

  /// Returns whether the value may be uploaded, which types 1 to 4 allow.
  virtual bool isUploadSafeType() const = 0;

 protected:
  ~LUMSafeParameter() = default;

  static constexpr bool isUploadSafe(std::uint64_t type) noexcept { return type - 1 < 4; }
};
