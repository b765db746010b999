// A shared library that contains the runtime and uses it in an exported function.
#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Queues/Queue.h"

using namespace rt::literals;

namespace {

constinit rt::UnfairLock lock;
constinit int uses RT_GUARDED_BY(lock) = 0;

void count() {
  const rt::LockGuard guard(lock);
  ++uses;
}

}  // namespace

extern "C" [[gnu::visibility("default")]] int useInLibrary() {
  count();
  static rt::Queue* const queue = rt::make<rt::Queue>("library"_s).detach();
  return queue->sync([] { return rt::currentThreadIdentifier() != 0 ? 1 : 0; });
}

extern "C" [[gnu::visibility("default")]] void* stateOfLibrary() {
  return &rt::detail::currentThread;
}
