#pragma once

// Keeps failures inside logging away from the code that logs.

#include <utility>

#ifdef __GLIBCXX__
#include <cxxabi.h>
#endif

/// Runs `body` and drops what it throws. Cancellation of the thread passes through: where cancellation is an
/// exception, the system ends a program that drops it.
template <class Body>
void ZEBDropExceptions(Body&& body) {
  try {
    std::forward<Body>(body)();
#ifdef __GLIBCXX__
  } catch (const abi::__forced_unwind&) {
    throw;
#endif
  } catch (...) {  // NOLINT(bugprone-empty-catch): the line that failed is lost
  }
}
