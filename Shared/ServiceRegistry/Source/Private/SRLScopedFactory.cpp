#include "Shared/ServiceRegistry/Source/Private/SRLScopedFactory.h"

#include "Shared/ServiceRegistry/Source/SRLRegistry.h"

rt::Ref<SRLMemoizingScope> SRLScopedFactory::openSharedScope(const SRLScopeTagSet& tags) {
  const rt::Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  return registry ? registry->scopeWithTags(tags) : nullptr;
}
