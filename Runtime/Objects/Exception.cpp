#include "Runtime/Objects/Exception.h"

#include <string>
#include <utility>

namespace rt {

namespace {

std::string whatOf(const String& name, const String& reason) {
  std::string text(name.view());
  text += ": ";
  text += reason.view();
  return text;
}

}  // namespace

Exception::Exception(String name, String reason)
    : std::runtime_error(whatOf(name, reason)), name_(std::move(name)), reason_(std::move(reason)) {}

InternalInconsistencyException::InternalInconsistencyException(String function, String file,
                                                               std::uint64_t lineNumber, String description)
    : Exception(String::overStatic(kName), std::move(description)),
      function_(std::move(function)),
      file_(std::move(file)),
      lineNumber_(lineNumber) {}

}  // namespace rt
