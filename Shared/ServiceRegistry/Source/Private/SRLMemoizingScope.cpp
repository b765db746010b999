// A look-up that finds its instance allocates nothing. A factory is passed as a reference to a callable
// object, because a block would be allocated for each request. The rest is in `makeOrAwaitInstance`, so that
// a hit needs no stack frame for it.
//
// A creation is reused for the next one in its scope, unless a thread has waited for it. That thread may not
// have woken up yet, and would then wait for the next creation too.
//
// A creation's lock is a `LongLock`, so a fork does not wait for a factory. In the child of a fork, an
// instance that another thread was making counts as not begun. The first thread that requests it makes it. A
// factory that requests its own instance ends the program with a line that says so. Otherwise it would wait
// for itself.
//
// A factory that throws leaves its creation pending, because nothing says whether it can be called again. Its
// lock is released, so that no thread waits: requests report this and return null.
//
// Memory for an instance is allocated when its creation begins, before its factory runs. So nothing can fail
// between making an instance and storing it. Such an instance could neither be returned nor be made again.

#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"

#include <cstdio>
#include <cstdlib>
#include <utility>
#include <vector>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Libraries/Util/ErrorHandler/PECReport.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScopeIvars.h"

using namespace rt::literals;

namespace {

constexpr const char* kFile = "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope";

SRLPendingCreation* beginCreation(SRLMemoizingScopeIvars& ivars, const void* identifier)
    RT_REQUIRES(ivars.lock) {
  SRLPendingCreation* creation = nullptr;
  if (const auto found = ivars.pendingCreations.find(identifier); found != ivars.pendingCreations.end()) {
    creation = found->second.get();  // Abandoned by a fork.
  } else if (auto entry = std::move(ivars.spareCreation)) {
    entry.key() = identifier;
    creation = entry.mapped().get();
    ivars.pendingCreations.insert(std::move(entry));
  } else {
    creation = ivars.pendingCreations.emplace(identifier, rt::make<SRLPendingCreation>()).first->second.get();
  }
  creation->begin();
  return creation;
}

void endCreation(SRLMemoizingScopeIvars& ivars, const void* identifier) RT_REQUIRES(ivars.lock) {
  auto entry = ivars.pendingCreations.extract(identifier);
  entry.mapped()->end();
  // Waiting threads use an entry until they have woken up, so it is not reused.
  if (!entry.mapped()->isAwaited()) ivars.spareCreation = std::move(entry);
}

// A callback must not wait for the instance. The thread that makes it may be waiting, too: for this callback
// to return, so that it can report an error.
[[noreturn]] void endInCallback(const void* identifier) noexcept {
  std::fprintf(stderr,
               "SRLMemoizingScope: an error callback asks for the instance for %p, which is being made; "
               "callbacks must not\n",
               identifier);
  std::abort();
}

}  // namespace

rt::Ref<SRLMemoizingScope> SRLMemoizingScope::init() {
  return rt::Ref<SRLMemoizingScope>::adopt(new SRLMemoizingScope());
}

rt::Ref<rt::Object> SRLMemoizingScope::makeOrAwaitInstance(const void* identifier, bool* instanceCreated,
                                                           rt::FunctionView<rt::Ref<rt::Object>()> factory) {
  SRLMemoizingScopeIvars& ivars = *ivars_;
  rt::Ref<SRLPendingCreation> awaited;
  SRLPendingCreation* begun = nullptr;
  decltype(ivars.instances)::Node entry;
  {
    const rt::LockGuard guard(ivars.lock);
    // Another thread may have made it since the look-up without the lock.
    if (const auto* made = ivars.instances.find(identifier)) return made->second;
    if (const auto found = ivars.pendingCreations.find(identifier);
        found != ivars.pendingCreations.end() && !found->second->isAbandoned()) {
      awaited = found->second;
      awaited->expectWaiter();
    } else {
      // Allocates before the factory runs, so that storing the instance cannot fail.
      entry = ivars.instances.prepare(identifier, ivars.pendingCreations.size() + 1);
      begun = beginCreation(ivars, identifier);
    }
  }
  if (instanceCreated != nullptr) *instanceCreated = !awaited;

  if (awaited) {
    if (PECErrorHandler::isCallingBack()) [[unlikely]]
      endInCallback(identifier);
    awaited->wait();
    {
      const rt::LockGuard guard(ivars.lock);
      if (const auto* made = ivars.instances.find(identifier)) return made->second;
    }
    PECReport({kFile, "-[SRLMemoizingScope instanceForIdentifier:instanceCreated:factoryBlock:]"},
              "We blocked waiting on instance creation but no instance was created."_s);
    return nullptr;
  }

  rt::Ref<rt::Object> instance;
  try {
    instance = factory();
  } catch (...) {
    // The instance stays pending, but no thread waits for it any more.
    begun->end();
    throw;
  }
  entry.mapped() = instance;
  const rt::LockGuard guard(ivars.lock);
  // No other thread has made it, since it would have waited.
  ivars.instances.insert(std::move(entry));
  endCreation(ivars, identifier);
  return instance;
}

rt::Ref<rt::Array> SRLMemoizingScope::instances() const {
  std::vector<rt::Ref<rt::Object>> instances;
  {
    const rt::LockGuard guard(ivars_->lock);
    const auto& entries = ivars_->instances.entries();
    instances.reserve(entries.size());
    for (const auto& [identifier, instance] : entries) {
      if (instance) instances.push_back(instance);
    }
  }
  return rt::make<rt::Array>(std::move(instances));
}
