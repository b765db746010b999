#pragma once

/// Where programming errors end: each thread has a handler that is told of the assertions that fail on it.
///
///     if (writer != nullptr) {
///       rt::AssertionHandler::currentHandler()->handleFailureInFunction(
///           "-[Logger setWriter:]"_s, "Shared/Logger"_s, 118, "no writer can be set."_s);
///     }
///
/// A test or a host that wants to hear of them derives a handler and makes it the thread's:
///
///     class Recorder : public rt::Implements<Recorder, rt::AssertionHandler> { ... };
///     rt::AssertionHandler::setCurrentHandler(rt::make<Recorder>());
///
/// Not for: failures that a correct program can meet.

#include <cstdint>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/String.h"

namespace rt {

class RT_VISIBLE AssertionHandler : public Implements<AssertionHandler, Object> {
 public:
  /// The calling thread's handler; never null. A thread that has set none has the default one, which is
  /// an AssertionHandler itself and shared by all threads.
  static Ref<AssertionHandler> currentHandler();

  /// Makes `handler` the calling thread's until the thread ends; null brings the default one back. Does
  /// nothing in destructors of the thread's own variables that run after the handler was given up.
  static void setCurrentHandler(Ref<AssertionHandler> handler);

  /// Told that an assertion failed in `function`, in `file` at `lineNumber`. Writes all of it to standard
  /// error, the description as it stands, however many lines it has, and throws an
  /// InternalInconsistencyException with it, also where standard error is closed, has lost its reader or
  /// takes nothing for a second. "<Unknown Function>" and "<Unknown File>" stand for null.
  ///
  /// One that overrides this may return: then whoever found the failure goes on after it, as its own
  /// description says. It may be called by any thread that it is the handler of, at once.
  virtual void handleFailureInFunction(const String& function, const String& file, std::uint64_t lineNumber,
                                       const String& description);
};

}  // namespace rt
