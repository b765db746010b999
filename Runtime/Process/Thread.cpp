#include "Runtime/Process/Thread.h"

#include <pthread.h>

#include "Runtime/Process/SystemThreadName.h"
#include "Runtime/Process/ThreadReference.h"

namespace rt::Thread {

namespace {

using Name = ThreadReference<StringObject, struct NameTag>;

// Whether `Name` has been set on this thread, perhaps to null.
constinit thread_local bool isKnown = false;

}  // namespace

String currentName() {
  if (!isKnown) {
    Name::set(Ref<StringObject>(detail::systemThreadName().object()));
    isKnown = true;
  }
  return String::from(Ref<StringObject>(Name::get()));
}

void setCurrentName(const String& name) {
  Name::set(Ref<StringObject>(name.object()));
  isKnown = true;
  detail::setSystemThreadName(name);
}

const void* currentHandle() noexcept {
  static_assert(sizeof(pthread_t) == sizeof(const void*));
  return reinterpret_cast<const void*>(pthread_self());
}

}  // namespace rt::Thread
