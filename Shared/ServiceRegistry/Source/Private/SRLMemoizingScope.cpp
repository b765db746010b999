#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"

#include <utility>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScopeIvars.h"

using namespace rt::literals;

namespace {
constexpr const char* kFile = "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope";
}

rt::Ref<SRLMemoizingScope> SRLMemoizingScope::init() {
  return rt::Ref<SRLMemoizingScope>::adopt(new SRLMemoizingScope());
}

rt::Ref<rt::Object> SRLMemoizingScope::makeOrAwaitInstance(const void* identifier, bool* instanceCreated,
                                                           const FactoryReference& factory) {
  SRLMemoizingScopeIvars& ivars = *ivars_;
  rt::Ref<SRLPendingCreation> creation;
  bool isCreator = false;
  {
    const rt::LockGuard guard(ivars.lock);
    // It may have been made since.
    if (const auto found = ivars.instances.find(identifier); found != ivars.instances.end())
      return found->second;
    if (const auto found = ivars.pendingCreations.find(identifier); found != ivars.pendingCreations.end()) {
      creation = found->second;
    } else {
      creation = rt::make<SRLPendingCreation>();
      ivars.pendingCreations.emplace(identifier, creation);
      creation->begin();
      isCreator = true;
    }
  }
  if (instanceCreated != nullptr) *instanceCreated = isCreator;

  if (!isCreator) {
    creation->wait();
    {
      const rt::LockGuard guard(ivars.lock);
      if (const auto found = ivars.instances.find(identifier); found != ivars.instances.end())
        return found->second;
    }
    PECReport({kFile, "-[SRLMemoizingScope instanceForIdentifier:instanceCreated:factoryBlock:]"},
              "We blocked waiting on instance creation but no instance was created."_s);
    return nullptr;
  }

  rt::Ref<rt::Object> instance = factory.call(factory.factory);
  // Destroyed when no lock is held any more.
  rt::Ref<rt::Object> replaced;
  {
    const rt::LockGuard guard(ivars.lock);
    replaced = std::exchange(ivars.instances[identifier], instance);
    ivars.pendingCreations.erase(identifier);
  }
  creation->end();
  return instance;
}

rt::Ref<rt::Array> SRLMemoizingScope::instances() const {
  std::vector<rt::Ref<rt::Object>> instances;
  {
    const rt::LockGuard guard(ivars_->lock);
    instances.reserve(ivars_->instances.size());
    for (const auto& [identifier, instance] : ivars_->instances) {
      if (instance) instances.push_back(instance);
    }
  }
  return rt::make<rt::Array>(std::move(instances));
}
