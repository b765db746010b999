// A library that brings the runtime and uses nothing of it but a lock.
#include "Runtime/Locks/UnfairLock.h"

namespace {

constinit rt::UnfairLock lock;

}  // namespace

extern "C" [[gnu::visibility("default")]] void useInLibrary() {
  const rt::LockGuard guard(lock);
}
