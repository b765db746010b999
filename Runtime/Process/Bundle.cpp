#include "Runtime/Process/Bundle.h"

#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Process/Private/SystemBundle.h"

// A host with an identifier defines this symbol, which replaces the definition here.
extern "C" [[gnu::weak]] constinit const char kMainBundleIdentifier[] = "";

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
  // The volatile keeps compilers from assuming what the text is.
  const char* volatile const built = kMainBundleIdentifier;
  const String identifier = *built != '\0' ? String::fromUTF8(built) : detail::systemBundleIdentifier();
  return identifier.isNull() ? ""_s : identifier;
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
