#pragma once

// How logging keeps what goes wrong in it to itself.

#include <utility>

#ifdef __GLIBCXX__
#include <cxxabi.h>
#endif

/// Runs `body`; what it throws is dropped. The cancellation of the thread passes: where that is an exception,
/// too, the system ends programs that drop it.
template <class Body>
void ZEBDropExceptions(Body&& body) {
  try {
    std::forward<Body>(body)();
#ifdef __GLIBCXX__
  } catch (const abi::__forced_unwind&) {
    throw;
#endif
  } catch (...) {  // NOLINT(bugprone-empty-catch): a line that cannot be logged is lost
  }
}
