// A library that contains the runtime and uses only a lock of it.
#include "Runtime/Locks/UnfairLock.h"

namespace {

constinit rt::UnfairLock lock;

}  // namespace

extern "C" [[gnu::visibility("default")]] void useInLibrary() {
  const rt::LockGuard guard(lock);
}
