#pragma once

/// Describes an error to an error callback: the origin of the report and its text.
///
///     PECErrorHandler::sharedInstance()->registerErrorHandlerBlock(
///         [](const rt::Ref<PECErrorDescription>& error) { show(error->errorMessage()); });
///
/// Threads: like a plain variable, for one thread at a time.
///
/// Not for: errors that can occur in a correct program.

#include <cstdint>
#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/String.h"

class RT_VISIBLE PECErrorDescription : public rt::Implements<PECErrorDescription, rt::Object> {
 public:
  PECErrorDescription() = default;

  /// Return and set the source file, as given in the report.
  const rt::String& filePath() const noexcept { return filePath_; }
  void setFilePath(rt::String filePath) noexcept { filePath_ = std::move(filePath); }

  /// Return and set the function or operation that made the report.
  const rt::String& functionName() const noexcept { return functionName_; }
  void setFunctionName(rt::String functionName) noexcept { functionName_ = std::move(functionName); }

  std::uint64_t lineNumber() const noexcept { return lineNumber_; }
  void setLineNumber(std::uint64_t lineNumber) noexcept { lineNumber_ = lineNumber; }

  /// Return and set the format, without arguments. It is the same for all reports from one place.
  const rt::String& rawFormatString() const noexcept { return rawFormatString_; }
  void setRawFormatString(rt::String rawFormatString) noexcept {
    rawFormatString_ = std::move(rawFormatString);
  }

  /// Return and set the formatted text.
  const rt::String& errorMessage() const noexcept { return errorMessage_; }
  void setErrorMessage(rt::String errorMessage) noexcept { errorMessage_ = std::move(errorMessage); }

 private:
  rt::String filePath_;
  rt::String functionName_;
  std::uint64_t lineNumber_ = 0;
  rt::String rawFormatString_;
  rt::String errorMessage_;
};
