#pragma once

/// Handles programming errors. Each thread has a handler, which is called when an assertion fails on that
/// thread.
///
///     if (writer != nullptr) {
///       rt::AssertionHandler::currentHandler()->handleFailureInFunction(
///           "-[Logger setWriter:]"_s, "Shared/Logger"_s, 118, "no writer can be set."_s);
///     }
///
/// A test or a host may derive a handler of its own and set it for the thread:
///
///     class Recorder : public rt::Implements<Recorder, rt::AssertionHandler> { ... };
///     rt::AssertionHandler::setCurrentHandler(rt::make<Recorder>());
///
/// Not for: errors that can occur in a correct program.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE AssertionHandler : public Implements<AssertionHandler, Object> {
 public:
  /// Returns the calling thread's handler. Never null. A thread that has set no handler has the default one,
  /// an AssertionHandler that all threads share.
  static Ref<AssertionHandler> currentHandler();

  /// Sets the calling thread's handler. Null restores the default one. The thread releases the handler when
  /// it ends. Code that the ending thread runs after that cannot set a handler: the call does nothing.
  static void setCurrentHandler(Ref<AssertionHandler> handler);

  /// Handles the failure of an assertion in `function`, in `file` at `lineNumber`. Writes these and
  /// `description` to standard error, then throws an InternalInconsistencyException with all of them. A
  /// description of several lines is written as it is. "<Unknown Function>" and "<Unknown File>" replace
  /// null.
  ///
  /// The exception is also thrown if standard error is closed, has no reader, or does not take everything.
  /// The call waits for standard error for a second at most.
  ///
  /// An override may return. The code that found the failure then continues, as its own contract says.
  /// Threads: several threads may share a handler and call it at the same time.
  virtual void handleFailureInFunction(const String& function, const String& file, std::uint64_t lineNumber,
                                       const String& description);

  /// Handles a failure in the operation `selector` of `object`. Calls `handleFailureInFunction` with the
  /// function "-[ClassName selector]".
  virtual void handleFailureInMethod(const String& selector, const Object& object, const String& file,
                                     std::uint64_t lineNumber, const String& description);
};

}  // namespace rt
