// Operations that need the registry's lock, without it. Each macro selects one mistake.
#include "Shared/ServiceRegistry/ServiceRegistry.h"

void bind(SRLRegistry& registry, const SRLAPIRegistrationData& api) {
  const rt::LockGuard guard(*registry.lock());
  registry.internalRegisterServiceAPI(&api, nullptr);
}

#ifdef NO_LOCK
void bindWithoutLock(SRLRegistry& registry, const SRLAPIRegistrationData& api) {
  registry.internalRegisterServiceAPI(&api, nullptr);
}
#endif
#ifdef ANOTHER_LOCK
void bindWithAnotherLock(SRLRegistry& registry, SRLRegistry& other, const SRLAPIRegistrationData& api) {
  const rt::LockGuard guard(*other.lock());
  registry.internalRegisterServiceAPI(&api, nullptr);
}
#endif
