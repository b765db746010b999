// The registry as an object: the shared registry, copies, the description, and destruction. The other
// SRLRegistry_*_test.cpp test bindings and services.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <string>
#include <thread>
#include <utility>

#include "Runtime/Locks/Private/ThreadIdentifier.h"
#include "Runtime/Queues/MainQueue.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/TestBindings.h"
#include "tests/support/WholeReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr const char* kFile = "Shared/ServiceRegistry/Source/SRLRegistry";
constexpr const char* kService = "-[SRLRegistry internalService:scopeTags:]";

std::string addressOf(const rt::Object* object) {
  char text[32];
  std::snprintf(text, sizeof text, "%p", static_cast<const void*>(object));
  return text;
}
std::string descriptionOf(const Ref<SRLImplementation>& implementation) {
  return std::string(implementation->description().view());
}

// What an object notes about its destruction.
struct End {
  bool hasCome = false;
  bool wasOnMainThread = false;
};
class Mortal final : public rt::Implements<Mortal, rt::Object> {
 public:
  explicit Mortal(End* end) : end_(end) {}
  ~Mortal() override { *end_ = {.hasCome = true, .wasOnMainThread = rt::isMainThread()}; }

 private:
  End* const end_;
};

class Delegate final : public rt::Implements<Delegate, rt::Object, SRLScopeLifecycleDelegate> {
 public:
  void didRemoveScopesWithTag(const Ref<rt::Object>&, const std::vector<rt::Weak<rt::Object>>&) override {}
};

TEST(SRLRegistrySharedInstance, IsTheSameAtEveryCall) {
  const Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  ASSERT_NE(registry, nullptr);
  EXPECT_EQ(SRLRegistry::sharedInstance(), registry);
}

// This program has no module. The shared registry has completed its registration nevertheless.
TEST(SRLRegistrySharedInstance, HasItsModulesFromTheStart) {
  TestReports reports;
  EXPECT_EQ(SRLRegistry::sharedInstance()->internalService(&testClockAPI, {}), nullptr);
  EXPECT_THAT(
      wholeReports(reports),
      ElementsAre(WholeReport{
          kFile, kService, "No binding was found for required, single-bound service: Clock", {"Clock"}}));
}

TEST(SRLRegistrySharedInstance, CanBeReplaced) {
  const Ref<SRLRegistry> first = SRLRegistry::sharedInstance();
  const Ref<SRLRegistry> second = SRLRegistry::initPrivate();
  EXPECT_EQ(SRLRegistry::setSharedInstance(second), first);
  EXPECT_EQ(SRLRegistry::sharedInstance(), second);
  EXPECT_EQ(SRLRegistry::setSharedInstance(nullptr), second);
  EXPECT_EQ(SRLRegistry::sharedInstance(), nullptr);
  EXPECT_EQ(SRLRegistry::setSharedInstance(first), nullptr);
  EXPECT_EQ(SRLRegistry::sharedInstance(), first);
}

TEST(SRLRegistrySharedInstance, IsRetained) {
  End end;
  Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  registry->scopeWithTags({})->instanceForIdentifier(&end, nullptr, [&] { return rt::make<Mortal>(&end); });
  const Ref<SRLRegistry> first = SRLRegistry::setSharedInstance(registry);
  registry = nullptr;
  EXPECT_FALSE(end.hasCome);
  registry = SRLRegistry::setSharedInstance(first);
  EXPECT_FALSE(end.hasCome);
  registry = nullptr;
  EXPECT_TRUE(end.hasCome);
}

// Neither function takes the registry's own lock.
TEST(SRLRegistrySharedInstance, CanBeReadAndSetWithItsLockHeld) {
  const Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  const rt::LockGuard guard(*registry->lock());
  EXPECT_EQ(SRLRegistry::sharedInstance(), registry);
  EXPECT_EQ(SRLRegistry::setSharedInstance(registry), registry);
}

// A second registration would end the program.
TEST(SRLRegistryInitialize, DoesNothingForASubclass) {
  class Subclass : public rt::Implements<Subclass, SRLRegistry> {};
  TestReports reports;
  SRLRegistry::initialize(rt::classInfo<Subclass>());
  EXPECT_THAT(wholeReports(reports), IsEmpty());
}

TEST(SRLRegistry, IsEmptyAtFirst) {
  TestReports reports;
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  EXPECT_NE(registry, SRLRegistry::initPrivate());
  EXPECT_TRUE(registry->registeredAPIIdentifiers()->isEmpty());
  EXPECT_EQ(registry->apiIdentifierFromString("Clock"_s), nullptr);
  EXPECT_EQ(registry->internalImplementationConfigForIdentifier(&testClockAPI), nullptr);
  EXPECT_EQ(registry->scopeLifecycleDelegate(), nullptr);
  // Only a request for a required service is reported as too early.
  EXPECT_EQ(registry->internalOptionalService(&testClockAPI, {}), nullptr);
  EXPECT_EQ(registry->internalMultiBoundService(&testClocksAPI, {}), nullptr);
  EXPECT_THAT(wholeReports(reports), IsEmpty());
  EXPECT_EQ(registry->internalService(&testClockAPI, {}), nullptr);
  EXPECT_THAT(
      wholeReports(reports),
      ElementsAre(WholeReport{
          kFile,
          kService,
          "A service injector was called prior to service bindings being registered.\n\nService: Clock",
          {"Clock"}}));
}

TEST(SRLRegistry, HasAConfigurationScopeOfItsOwn) {
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  ASSERT_NE(registry->configScope(), nullptr);
  EXPECT_EQ(registry->configScope(), registry->configScope());
  EXPECT_NE(registry->configScope(), SRLRegistry::initPrivate()->configScope());
  EXPECT_NE(registry->configScope(), registry->scopeWithTags({}));
}

TEST(SRLRegistryDescription, OfAnEmptyRegistry) {
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  EXPECT_EQ(registry->description().view(), "<SRLRegistry: " + addressOf(registry.get()) +
                                                ">\nSingle bindings:\n{\n}\nMulti bindings:\n{\n}");
}

TEST(SRLRegistryDescription, ListsTheBindings) {
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  const Ref<SRLImplementation> single = implementationOf<TestWallClock>("single");
  const Ref<SRLImplementation> multi = implementationOf<TestSundial>("multi");
  {
    const rt::LockGuard guard(*registry->lock());
    registry->internalRegisterServiceAPI(&testClockAPI, single);
    registry->internalRegisterServiceAPI(&testClocksAPI, multi);
  }
  EXPECT_EQ(registry->description().view(),
            "<SRLRegistry: " + addressOf(registry.get()) + ">\nSingle bindings:\n{\n    Clock = " +
                descriptionOf(single) + ";\n}\nMulti bindings:\n{\n    Clocks = {(\n        " +
                descriptionOf(multi) + "\n    )};\n}");
}

TEST(SRLRegistryDescription, LeavesOutASingleBoundAPIThatIsUnbound) {
  const TestModule module({{&testClockAPI, testNoClocks}, {&testClocksAPI, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  EXPECT_EQ(boundTo(testClockAPI, registry), nullptr);
  EXPECT_EQ(countBoundTo(testClocksAPI, registry), 0);
  EXPECT_EQ(registry->description().view(),
            "<SRLRegistry: " + addressOf(registry.get()) +
                ">\nSingle bindings:\n{\n}\nMulti bindings:\n{\n    Clocks = {(\n    )};\n}");
}

// The description has only the APIs that were requested.
TEST(SRLRegistryDescription, LeavesOutAPIsThatWereNotRequestedYet) {
  const TestModule module({{&testClockAPI, testWallClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  EXPECT_THAT(std::string(registry->description().view()), testing::HasSubstr("Single bindings:\n{\n}\n"));
  const Ref<SRLImplementation> bound = boundTo(testClockAPI, registry);
  EXPECT_THAT(std::string(registry->description().view()),
              testing::HasSubstr("{\n    Clock = " + descriptionOf(bound) + ";\n}"));
}

TEST(SRLRegistryMutableCopy, SharesImplementations) {
  const TestModule module({{&testClockAPI, testWallClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  const Ref<SRLImplementation> bound = boundTo(testClockAPI, registry);
  ASSERT_NE(bound, nullptr);
  EXPECT_EQ(boundTo(testClockAPI, registry->mutableCopy()), bound);
}

TEST(SRLRegistryMutableCopy, ChangesIndependently) {
  const TestModule module({{&testClockAPI, testWallClocks}, {&testClocksAPI, testWallClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  const Ref<SRLImplementation> bound = boundTo(testClockAPI, registry);
  ASSERT_EQ(countBoundTo(testClocksAPI, registry), 1);
  const Ref<SRLRegistry> copy = registry->mutableCopy();
  const Ref<SRLImplementation> other = implementationOf<TestSundial>("other");
  {
    const rt::LockGuard guard(*copy->lock());
    copy->internalRegisterImplementation(other, &testClockAPI, /*allowOverridingExistingBinding=*/true);
    copy->internalRegisterServiceAPI(&testClocksAPI, other);
  }
  EXPECT_EQ(boundTo(testClockAPI, copy), other);
  EXPECT_EQ(boundTo(testClockAPI, registry), bound);
  EXPECT_EQ(countBoundTo(testClocksAPI, copy), 2);
  EXPECT_EQ(countBoundTo(testClocksAPI, registry), 1);
}

TEST(SRLRegistryMutableCopy, HasTheModules) {
  const TestModule module({{&testClockAPI, testWallClocks}});
  const Ref<SRLRegistry> copy = registryWith({&module})->mutableCopy();
  EXPECT_EQ(copy->apiIdentifierFromString("Clock"_s), &testClockAPI);
  EXPECT_NE(boundTo(testClockAPI, copy), nullptr);
}

TEST(SRLRegistryMutableCopy, HasTheStateOfTheOriginal) {
  TestReports reports;
  registryWith({})->mutableCopy()->internalService(&testClockAPI, {});
  EXPECT_THAT(reports.texts(), ElementsAre("No binding was found for required, single-bound service: Clock"));
  const Ref<SRLRegistry> copy = SRLRegistry::initPrivate()->mutableCopy();
  copy->internalService(&testClockAPI, {});
  EXPECT_THAT(reports.texts(),
              ElementsAre("A service injector was called prior to service bindings being registered.\n\n"
                          "Service: Clock"));
  // The copy of a registry without modules can register some.
  const TestModule module({{&testClockAPI, testWallClocks}});
  const SRLBindingsModuleData* const modules[] = {module.data()};
  copy->internalRegisterBindings(modules);
  EXPECT_NE(boundTo(testClockAPI, copy), nullptr);
}

const int configuration = 0;

TEST(SRLRegistryMutableCopy, HasTheFactoriesButItsOwnConfigurations) {
  const TestModule module({}, [](SRLConfigurationFactories& factories) {
    factories[&configuration] = [] { return rt::make<TestStone>(); };
  });
  const Ref<SRLRegistry> registry = registryWith({&module});
  const Ref<SRLRegistry> copy = registry->mutableCopy();
  const Ref<rt::Object> ofCopy = copy->internalImplementationConfigForIdentifier(&configuration);
  ASSERT_NE(ofCopy, nullptr);
  EXPECT_NE(registry->internalImplementationConfigForIdentifier(&configuration), ofCopy);
  EXPECT_EQ(copy->internalImplementationConfigForIdentifier(&configuration), ofCopy);
}

TEST(SRLRegistryMutableCopy, HasNoScopesNorDelegate) {
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);
  const Ref<SRLMemoizingScope> scope = registry->scopeWithTags({});
  const Ref<SRLRegistry> copy = registry->mutableCopy();
  EXPECT_EQ(registry->scopeLifecycleDelegate(), delegate);
  EXPECT_EQ(copy->scopeLifecycleDelegate(), nullptr);
  EXPECT_NE(copy->scopeWithTags({}), scope);
  EXPECT_EQ(registry->scopeWithTags({}), scope);
  EXPECT_NE(copy->configScope(), registry->configScope());
}

TEST(SRLRegistryMutableCopy, HasALockOfItsOwn) {
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  const Ref<SRLRegistry> copy = registry->mutableCopy();
  EXPECT_NE(copy->lock(), registry->lock());
  const rt::LockGuard guard(*registry->lock());
  EXPECT_TRUE(copy->registeredAPIIdentifiers()->isEmpty());
}

// A registry with a bound implementation, and with an instance in a scope.
class SRLRegistryEnd : public testing::Test {
 protected:
  SRLRegistryEnd() {
    registry_->scopeWithTags({})->instanceForIdentifier(&instanceEnd_, nullptr,
                                                        [this] { return rt::make<Mortal>(&instanceEnd_); });
    Ref<SRLImplementation> implementation = SRLImplementation::initWithIdentifier(
        "implementation", nullptr, 1, 0,
        [kept = Ref<rt::Object>(rt::make<Mortal>(&factoryEnd_))](const SRLScopeTagSet&, bool*) {
          return kept;
        },
        nullptr);
    const rt::LockGuard guard(*registry_->lock());
    registry_->internalRegisterServiceAPI(&testClockAPI, implementation);
  }

  End instanceEnd_;
  End factoryEnd_;
  Ref<SRLRegistry> registry_ = SRLRegistry::initPrivate();
};

TEST_F(SRLRegistryEnd, ReleasesAllAtOnceOnTheMainThread) {
  registry_ = nullptr;
  EXPECT_TRUE(instanceEnd_.hasCome);
  EXPECT_TRUE(factoryEnd_.hasCome);
  EXPECT_EQ(rt::MainQueue::drain(), 0U);
}

TEST_F(SRLRegistryEnd, ReleasesOnTheMainQueueFromAnotherThread) {
  std::thread([this] { registry_ = nullptr; }).join();
  EXPECT_FALSE(instanceEnd_.hasCome);
  EXPECT_FALSE(factoryEnd_.hasCome);
  EXPECT_EQ(rt::MainQueue::drain(), 1U);
  EXPECT_TRUE(instanceEnd_.hasCome && instanceEnd_.wasOnMainThread);
  EXPECT_TRUE(factoryEnd_.hasCome && factoryEnd_.wasOnMainThread);
}

TEST_F(SRLRegistryEnd, ReleasesConfigurationsAtOnceOnAnyThread) {
  End end;
  registry_->configScope()->instanceForIdentifier(&end, nullptr, [&] { return rt::make<Mortal>(&end); });
  std::thread([this] { registry_ = nullptr; }).join();
  EXPECT_TRUE(end.hasCome);
  EXPECT_FALSE(end.wasOnMainThread);
  EXPECT_FALSE(instanceEnd_.hasCome);
  rt::MainQueue::drain();
}

TEST_F(SRLRegistryEnd, ReleasesTheTagsOfItsScopes) {
  End end;
  {
    const Ref<rt::Array> tags = rt::Array::of(Ref<rt::Object>(rt::make<Mortal>(&end)));
    registry_->scopeWithTags(SRLScopeTagSetCreateWithTags(tags.get()));
    // The second call does not retain the tags again.
    registry_->scopeWithTags(SRLScopeTagSetCreateWithTags(tags.get()));
  }
  EXPECT_FALSE(end.hasCome);
  registry_ = nullptr;
  EXPECT_TRUE(end.hasCome);
}

// Notes, when it is destroyed, whether another object was destroyed before.
class Witness final : public rt::Implements<Witness, rt::Object> {
 public:
  Witness(const End* other, bool* isLater) : other_(other), isLater_(isLater) {}
  ~Witness() override { *isLater_ = other_->hasCome; }

 private:
  const End* const other_;
  bool* const isLater_;
};

TEST_F(SRLRegistryEnd, ReleasesTheTagsBeforeTheInstances) {
  End end;
  bool isLater = false;
  {
    const Ref<rt::Object> tag = rt::make<Mortal>(&end);
    registry_->scopeWithTags({{tag.get()}})->instanceForIdentifier(&end, nullptr, [&] {
      return rt::make<Witness>(&end, &isLater);
    });
  }
  registry_ = nullptr;
  EXPECT_TRUE(isLater);
}

}  // namespace
