#pragma once

/// Exceptions that the runtime and the libraries built on it throw. An exception has a name, which tells the
/// kind of failure, and a reason for people.
///
///     throw rt::Exception("Assertion Failed!"_s, "Expected block to report an error!"_s);
///
///     try { ... } catch (const rt::Exception& exception) {
///       if (exception.name() == rt::InternalInconsistencyException::kName) ...
///     }
///
/// Exceptions are values. Copying an exception throws nothing.
///
/// Threads: any thread may read an exception.
///
/// Not for: failures of the operating system, which are std::system_error.

#include <cstdint>
#include <stdexcept>
#include <string_view>

#include "Runtime/Objects/String.h"

namespace rt {

class Exception : public std::runtime_error {
 public:
  /// Makes an exception whose `what()` is "name: reason". Null counts as empty there. Throws std::bad_alloc.
  Exception(String name, String reason);

  /// The name and the reason, as given to the constructor. Either may be null.
  const String& name() const noexcept { return name_; }
  const String& reason() const noexcept { return reason_; }

 private:
  String name_;
  String reason_;
};

/// Says that a program broke a rule of its own. A failed assertion throws this exception.
class InternalInconsistencyException : public Exception {
 public:
  static constexpr std::string_view kName = "InternalInconsistencyException";

  /// Makes an exception with the name `kName`. `description` becomes the reason. `lineNumber` counts from 1
  /// and is 0 if it is unknown.
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
