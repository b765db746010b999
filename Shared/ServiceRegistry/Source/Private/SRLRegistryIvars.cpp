#include "Shared/ServiceRegistry/Source/Private/SRLRegistryIvars.h"

SRLRegistryIvars::SRLRegistryIvars(const SRLRegistryIvars& other)
    : singleBindings(other.singleBindings), multiBindings(other.multiBindings) {
  bindingsModules = other.bindingsModules;
  configFactories = other.configFactories;
  bindingsState = other.bindingsState;
}

SRLRegistryIvars::~SRLRegistryIvars() {
  for (const auto& [key, scope] : scopes.entries()) SRLScopeTagSetRelease(key.tags);
}
