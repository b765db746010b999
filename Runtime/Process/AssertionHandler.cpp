#include "Runtime/Process/AssertionHandler.h"

#include <chrono>
#include <string>

#include "Runtime/Base/StandardError.h"
#include "Runtime/Objects/Exception.h"
#include "Runtime/Process/ThreadReference.h"

namespace rt {

namespace {

using CurrentHandler = ThreadReference<AssertionHandler, struct CurrentHandlerTag>;

// How long a failure may block its thread if nobody reads standard error.
constexpr std::chrono::seconds kLongestWait{1};

}  // namespace

Ref<AssertionHandler> AssertionHandler::currentHandler() {
  // Never destroyed: assertions may fail in code that runs at exit.
  static AssertionHandler* const defaultHandler = make<AssertionHandler>().detach();
  AssertionHandler* const own = CurrentHandler::get();
  return own != nullptr ? own : defaultHandler;
}

void AssertionHandler::setCurrentHandler(Ref<AssertionHandler> handler) {
  CurrentHandler::set(std::move(handler));
}

void AssertionHandler::handleFailureInFunction(const String& function, const String& file,
                                               std::uint64_t lineNumber, const String& description) {
  const String knownFunction = function.isNull() ? "<Unknown Function>"_s : function;
  const String knownFile = file.isNull() ? "<Unknown File>"_s : file;
  std::string line = "Assertion failed in ";
  line.append(knownFunction.view()).append(", ").append(knownFile.view()).append(":");
  line.append(std::to_string(lineNumber)).append(": ").append(description.view()).append("\n");
  StandardError::write(line, kLongestWait);
  throw InternalInconsistencyException(knownFunction, knownFile, lineNumber, description);
}

void AssertionHandler::handleFailureInMethod(const String& selector, const Object& object, const String& file,
                                             std::uint64_t lineNumber, const String& description) {
  std::string function = "-[";
  function.append(object.classInfo().name).append(" ").append(selector.view()).append("]");
  handleFailureInFunction(String::fromUTF8Repaired(function), file, lineNumber, description);
}

}  // namespace rt
