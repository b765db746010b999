// No lock is held while factories, destructors and the delegate run. The lock of a pending instance does not
// count: forks do not wait for it.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <iterator>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Queues/MainQueue.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"

namespace {

using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Pair;
using testing::UnorderedElementsAre;

// The calls so far, and how many locks the thread of each held.
std::vector<std::pair<std::string, int>> runs;

int heldLocks() {
  return static_cast<int>(rt::detail::ForkGate::heldLocks());
}

void note(const char* what) {
  runs.emplace_back(what, heldLocks());
}

class Noted final : public rt::Implements<Noted, rt::Object> {
 public:
  explicit Noted(const char* end) : end_(end) {}
  ~Noted() override { note(end_); }

 private:
  const char* const end_;
};

constexpr SRLAPIInstanceType kType{.names = {.protocolName = nullptr, .className = "Noted"}};
constexpr SRLAPIRegistrationData innerAPI{
    .identifier = "Inner", .instanceType = kType, .scopeType = 0b1, .identifierLength = 5};

Ref<rt::Object> makeFresh(SRLScopeTagSet /*tags*/) {
  note("fresh");
  return rt::make<Noted>("end of fresh");
}
Ref<rt::Object> makeInner(SRLScopeTagSet /*tags*/) {
  note("inner");
  return rt::make<Noted>("end of inner");
}
Ref<rt::Object> makeOuter(SRLScopeTagSet tags) {
  note("outer");
  SRLRegistry::sharedInstance()->internalService(&innerAPI, tags);
  note("outer again");
  return rt::make<Noted>("end of outer");
}

constexpr SRLAPIRegistrationData freshAPI{
    .identifier = "Fresh", .instanceType = kType, .scopeType = 0b1, .identifierLength = 5};
constexpr SRLAPIRegistrationData outerAPI{
    .identifier = "Outer", .instanceType = kType, .scopeType = 0b1, .identifierLength = 5};
constexpr SRLAPIRegistrationData manyAPI{.identifier = "OfMany",
                                         .instanceType = kType,
                                         .scopeType = 0b1,
                                         .identifierLength = 6,
                                         .isMultibound = 1};
constexpr SRLImplementationRegistrationData fresh{.identifier = "Fresh",
                                                  .instanceType = {.className = "Noted"},
                                                  .factory = makeFresh,
                                                  .scopeType = 0b1,
                                                  .lifetime = 1};
constexpr SRLImplementationRegistrationData inner{
    .identifier = "Inner", .instanceType = {.className = "Noted"}, .factory = makeInner, .scopeType = 0b1};
constexpr SRLImplementationRegistrationData outer{
    .identifier = "Outer", .instanceType = {.className = "Noted"}, .factory = makeOuter, .scopeType = 0b1};
using Implementations = const SRLImplementationRegistrationData*;
constexpr Implementations kFresh[] = {&fresh, nullptr};
constexpr Implementations kInner[] = {&inner, nullptr};
constexpr Implementations kOuter[] = {&outer, nullptr};
constexpr Implementations kMany[] = {&fresh, &inner, nullptr};
constexpr _SRLBindingRegistrationData kBindings[] = {
    {&freshAPI, kFresh}, {&innerAPI, kInner}, {&outerAPI, kOuter}, {&manyAPI, kMany}};
static_assert(SRLAreBindingsSorted(kBindings));
const int configuration = 0;
const SRLBindingsModuleData module{
    .bindingsBegin = std::begin(kBindings),
    .bindingsEnd = std::end(kBindings),
    .addConfigurationFactories =
        [](SRLConfigurationFactories& factories) {
          note("configurations");
          factories[&configuration] = [] {
            note("configuration");
            return rt::make<Noted>("end of configuration");
          };
        },
};

class Delegate final : public rt::Implements<Delegate, rt::Object, SRLScopeLifecycleDelegate> {
 public:
  void didRemoveScopesWithTag(const Ref<rt::Object>& /*tag*/,
                              const std::vector<rt::Weak<rt::Object>>& /*instances*/) override {
    note("delegate");
  }
};

class SRLRegistryLocks : public testing::Test {
 protected:
  void SetUp() override {
    runs.clear();
    registry_ = SRLRegistry::initPrivate();
    registry_->internalRegisterBindings(std::array{&module});
    EXPECT_THAT(std::exchange(runs, {}), ElementsAre(Pair("configurations", 0)));
    before_ = SRLRegistry::setSharedInstance(registry_);
  }
  void TearDown() override {
    EXPECT_EQ(heldLocks(), 0);
    SRLRegistry::setSharedInstance(before_);
  }

  SRLScopeTagSet tags() const { return {{tag_.get()}}; }

  Ref<SRLRegistry> registry_;
  Ref<rt::Object> tag_ = rt::make<Noted>("end of tag");

 private:
  Ref<SRLRegistry> before_;
};

TEST_F(SRLRegistryLocks, AreNotHeldWhileNewInstancesAreMade) {
  registry_->internalService(&freshAPI, tags());
  registry_->internalOptionalService(&freshAPI, tags());
  EXPECT_THAT(runs, ElementsAre(Pair("fresh", 0), Pair("end of fresh", 0), Pair("fresh", 0),
                                Pair("end of fresh", 0)));
}

TEST_F(SRLRegistryLocks, AreNotHeldWhileScopedInstancesAreMade) {
  registry_->internalService(&outerAPI, tags());
  EXPECT_THAT(std::exchange(runs, {}),
              ElementsAre(Pair("outer", 0), Pair("inner", 0), Pair("outer again", 0)));
  // A copy makes scoped instances in the shared registry.
  const Ref<rt::Object> another = rt::make<Noted>("end of another tag");
  registry_->mutableCopy()->internalOptionalService(&outerAPI, {{another.get()}});
  EXPECT_THAT(runs, ElementsAre(Pair("outer", 0), Pair("inner", 0), Pair("outer again", 0)));
}

TEST_F(SRLRegistryLocks, AreNotHeldWhileInstancesOfAMultiBoundAPIAreMade) {
  registry_->internalMultiBoundService(&manyAPI, tags());
  EXPECT_THAT(runs, UnorderedElementsAre(Pair("fresh", 0), Pair("inner", 0), Pair("end of fresh", 0)));
}

TEST_F(SRLRegistryLocks, AreNotHeldWhileConfigurationsAreMade) {
  registry_->internalImplementationConfigForIdentifier(&configuration);
  EXPECT_THAT(runs, ElementsAre(Pair("configuration", 0)));
}

TEST_F(SRLRegistryLocks, AreNotHeldWhenScopesEnd) {
  registry_->internalService(&outerAPI, tags());
  registry_->internalService(&outerAPI, {{registry_.get()}});
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry_->setScopeLifecycleDelegate(delegate);
  runs.clear();
  registry_->removeScopesWithTag(std::exchange(tag_, nullptr));
  EXPECT_THAT(runs, UnorderedElementsAre(Pair("end of inner", 0), Pair("end of outer", 0),
                                         Pair("delegate", 0), Pair("end of tag", 0)));
  registry_->removeScopesWithTag(registry_);
}

TEST_F(SRLRegistryLocks, AreNotHeldWhenARegistryEnds) {
  registry_->internalService(&outerAPI, tags());
  tag_ = nullptr;
  SRLRegistry::setSharedInstance(nullptr);
  runs.clear();
  registry_ = nullptr;
  EXPECT_THAT(runs,
              UnorderedElementsAre(Pair("end of inner", 0), Pair("end of outer", 0), Pair("end of tag", 0)));
}

TEST_F(SRLRegistryLocks, AreNotHeldWhenARegistryEndsOnAnotherThread) {
  registry_->internalService(&outerAPI, tags());
  SRLRegistry::setSharedInstance(nullptr);
  runs.clear();
  std::thread([this] { registry_ = nullptr; }).join();
  EXPECT_THAT(runs, IsEmpty());
  rt::MainQueue::drain();
  EXPECT_THAT(runs, UnorderedElementsAre(Pair("end of inner", 0), Pair("end of outer", 0)));
}

}  // namespace
