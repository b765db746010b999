#include "Runtime/Process/Bundle.h"

#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Process/SystemBundle.h"

namespace rt::Bundle {

namespace {

constinit UnfairLock lock;
// Never destroyed: code that runs at exit may still read the identifier.
constinit Object* chosen RT_GUARDED_BY(lock) = nullptr;

}  // namespace

String mainIdentifier() {
  {
    const LockGuard guard(lock);
    if (chosen != nullptr) return String::from(chosen);
  }
  const String built = detail::systemBundleIdentifier();
  return built.isNull() ? ""_s : built;
}

void setMainIdentifier(const String& identifier) {
  Ref<Object> previous = identifier;
  {
    const LockGuard guard(lock);
    Object* const next = previous.detach();
    previous = Ref<Object>::adopt(chosen);
    chosen = next;
  }
}

}  // namespace rt::Bundle
