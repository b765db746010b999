#pragma once

/// What the runtime and the libraries on it throw: a name that says what kind of failure it is, and a
/// reason for people.
///
///     throw rt::Exception("Assertion Failed!"_s, "Expected block to report an error!"_s);
///
///     try { ... } catch (const rt::Exception& exception) {
///       if (exception.name() == rt::InternalInconsistencyException::kName) ...
///     }
///
/// Exceptions are values; copying one throws nothing. Any thread may read one.
///
/// Not for: what the operating system answers, which is a std::system_error.

#include <cstdint>
#include <stdexcept>
#include <string_view>

#include "Runtime/Objects/String.h"

namespace rt {

class Exception : public std::runtime_error {
 public:
  /// `what()` becomes "name: reason". Null counts as empty there. Throws std::bad_alloc.
  Exception(String name, String reason);

  /// As given.
  const String& name() const noexcept { return name_; }
  const String& reason() const noexcept { return reason_; }

 private:
  String name_;
  String reason_;
};

/// That a program broke a rule of its own: what an assertion that fails raises.
class InternalInconsistencyException : public Exception {
 public:
  static constexpr std::string_view kName = "InternalInconsistencyException";

  /// The name is `kName` and the reason is the description. `lineNumber` counts from 1; 0 when unknown.
  InternalInconsistencyException(String function, String file, std::uint64_t lineNumber, String description);

  const String& function() const noexcept { return function_; }
  const String& file() const noexcept { return file_; }
  std::uint64_t lineNumber() const noexcept { return lineNumber_; }
  const String& description() const noexcept { return reason(); }

 private:
  String function_;
  String file_;
  std::uint64_t lineNumber_;
};

}  // namespace rt
