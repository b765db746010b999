#pragma once

/// An argument of a log message that gives away nothing about anybody: a message keeps it by itself, beside
/// the text that it is printed into.
///
///     const auto key = LUMSafeStringParameter::parameterWithString("greeting"_s, 1);
///     LUMLogAt(LUMLogLevelError, "%@ cannot be %@"_s, key, value);       // `value` is in the text only
///
/// Two classes conform, LUMSafeStringParameter and LUMSafeNumberParameter. A message keeps what is of a class
/// with a name that begins with one of theirs.
///
/// Not for: hiding the other arguments, which the text shows too.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"

struct RT_VISIBLE LUMSafeParameter : rt::Protocol<LUMSafeParameter> {
  /// What the value is, in the caller's own numbers.
  virtual std::uint64_t type() const = 0;

  /// Whether the value may be uploaded: it may if its type is 1, 2, 3 or 4.
  virtual bool isUploadSafeType() const = 0;

 protected:
  ~LUMSafeParameter() = default;

  static constexpr bool isUploadSafe(std::uint64_t type) noexcept { return type - 1 < 4; }
};
