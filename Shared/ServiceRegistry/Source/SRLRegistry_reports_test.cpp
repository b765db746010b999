// Which reports a registry makes with its lock held, and which without it.

#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <string>
#include <vector>

#include "Runtime/Locks/UnfairLock.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/TestServices.h"

namespace {

using namespace TestServices;
using namespace rt::literals;
using rt::Ref;

class SRLRegistryReports : public ServicesTest {
 protected:
  // Returns, for each report that `request` makes, whether the lock of `asked` was held.
  static std::vector<bool> locksHeld(SRLRegistry& asked, const std::function<void()>& request) {
    std::vector<bool> held;
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock([&](const Ref<PECErrorDescription>&) {
      const bool isFree = asked.lock()->unfair_lock_.tryLock();
      if (isFree) asked.lock()->unfair_lock_.unlock();
      held.push_back(!isFree);
    });
    request();
    return held;
  }
};

const std::vector<bool> kFreeOnce = {false};
const std::vector<bool> kHeldOnce = {true};

TEST_F(SRLRegistryReports, AreMadeWithoutTheLockOutsideOfLookUps) {
  const auto wrapper = SRLScopeTagSetCodableWrapper::initWithTagSet({});
  const std::function<void()> requests[] = {
      [this] { registry->internalService(&nullAPI, {}); },
      [this] { registry->internalMultiBoundService(&manyAPI, tags); },
      [this] { registry->internalMultiBoundService(nullptr, tags); },
      [this] { registry->internalHasImplementationForService(nullptr); },
      [this] { registry->internalService(&freshAPI, tagSet(account)); },
      [this] { registry->internalService(&scopedAPI, tagSet(account)); },
      [this] { registry->removeScopesWithTag(nullptr); },
      [this] { registry->apiIdentifierFromString(nullptr); },
      [this] { registry->eg_internalService("Scoped"_s, nullptr); },
      [this] { registry->eg_internalOptionalService("Scoped"_s, nullptr); },
      [this] { registry->eg_internalMultiBoundService("Many"_s, nullptr); },
      [&] { registry->eg_internalService("Nobody's"_s, wrapper); },
      [this] { registry->eg_internalHasImplementationForService("Nobody's"_s); },
  };
  for (std::size_t i = 0; i < std::size(requests); ++i) {
    EXPECT_EQ(locksHeld(*registry, requests[i]), kFreeOnce) << i;
    // The same request again, when instances may exist.
    EXPECT_EQ(locksHeld(*registry, requests[i]), kFreeOnce) << i;
  }
}

TEST_F(SRLRegistryReports, AreMadeWithTheLockIfALookUpFails) {
  EXPECT_EQ(locksHeld(*registry, [this] { registry->internalService(&unboundAPI, {}); }), kHeldOnce);
  EXPECT_EQ(locksHeld(*registry, [this] { registry->internalService(&unknownAPI, {}); }), kHeldOnce);
  const Ref<SRLRegistry> early = SRLRegistry::initPrivate();
  EXPECT_EQ(locksHeld(*early, [&] { early->internalService(&scopedAPI, tags); }), kHeldOnce);
  EXPECT_EQ(locksHeld(*registry,
                      [this] {
                        const rt::LockGuard guard(*registry->lock());
                        registry->implementationForSingleBoundService(nullptr);
                      }),
            kHeldOnce);
  // There are two reports: the API is null, and nothing is bound to it.
  EXPECT_EQ(locksHeld(*registry, [this] { registry->internalService(nullptr, {}); }),
            (std::vector<bool>{true, true}));
}

// The registry that is registering its modules, for a module's callback.
SRLRegistry* inTheMaking = nullptr;

TEST_F(SRLRegistryReports, AreMadeWithTheLockIfALookUpComesTooEarly) {
  const SRLBindingsModuleData module{.bindingsBegin = kModule.bindingsBegin,
                                     .bindingsEnd = kModule.bindingsEnd,
                                     .addConfigurationFactories = [](SRLConfigurationFactories&) {
                                       inTheMaking->internalService(&globalAPI, {});
                                       inTheMaking->internalOptionalService(&globalAPI, {});
                                       inTheMaking->internalMultiBoundService(&noneOfManyAPI, {});
                                     }};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  inTheMaking = other.get();
  EXPECT_EQ(locksHeld(*other, [&] { other->internalRegisterBindings(std::array{&module}); }),
            (std::vector<bool>{true, true, true}));
}

}  // namespace
