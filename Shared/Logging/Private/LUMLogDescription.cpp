#include "Shared/Logging/Private/LUMLogDescription.h"

#ifdef __GLIBCXX__
#include <cxxabi.h>
#endif

#include <utility>

using namespace rt::literals;

rt::String LUMLogDescriptionOf(const rt::Object& object) {
  try {
    rt::String description = object.description();
    return description ? std::move(description) : "(null)"_s;
#ifdef __GLIBCXX__
  } catch (const abi::__forced_unwind&) {
    // Cancellation of the thread, which must not be stopped.
    throw;
#endif
  } catch (...) {
    return "(no description)"_s;
  }
}
