// Tests a service registry when allocations fail. Each request throws or returns its instance, and no
// instance is made twice.

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <iterator>
#include <new>
#include <string>
#include <utility>

#include "Runtime/Archive/KeyedArchiver.h"
#include "Runtime/Archive/KeyedUnarchiver.h"
#include "Shared/Async/Provider/AVOProvider.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Entities/Metadata/SRLScopeTagSetCodableWrapper.h"
#include "Shared/ServiceRegistry/Source/Profiling/Private/SRLPProfilingEnabled.h"
#include "Shared/ServiceRegistry/Source/Profiling/SRLProfilingStorage.h"
#include "Shared/ServiceRegistry/Source/SRLProviderFromFunction.h"
#include "Shared/ServiceRegistry/Source/SRLScopeLifecycleDelegate.h"
#include "tests/support/AllocationFailure.h"
#include "tests/support/TestReports.h"
#include "tests/support/WithoutMemory.h"

// The test is built twice: with and without profiling.
bool SRLPProfilingSwitch() {
  return SWITCH_ANSWER;
}

namespace {

using namespace rt::literals;
using rt::Ref;
using WithoutMemory::tryEachAllocation;

// Profiling keeps its measurements, so growth is expected.
constexpr auto kGrowth = SWITCH_ANSWER ? WithoutMemory::Growth::kIsWanted : WithoutMemory::Growth::kIsLeak;

class Thing final : public rt::Implements<Thing, rt::Object> {};

int scopedMade = 0;
int othersMade = 0;

// Allocations in factories do not fail, because a factory that throws leaves its instance pending by design.
Ref<rt::Object> makeScoped(SRLScopeTagSet /*tags*/) {
  const AllocationFailure::Pause pause;
  ++scopedMade;
  return rt::make<Thing>();
}
Ref<rt::Object> makeAnother(SRLScopeTagSet /*tags*/) {
  const AllocationFailure::Pause pause;
  ++othersMade;
  return rt::make<Thing>();
}

constexpr SRLAPIInstanceType kType{.names = {.protocolName = nullptr, .className = "Thing"}};
constexpr SRLAPIRegistrationData scopedAPI{
    .identifier = "Scoped", .instanceType = kType, .scopeType = 0b11, .identifierLength = 6};
constexpr SRLAPIRegistrationData freshAPI{
    .identifier = "Fresh", .instanceType = kType, .scopeType = 0b01, .identifierLength = 5};
constexpr SRLAPIRegistrationData unboundAPI{
    .identifier = "Unbound", .instanceType = kType, .identifierLength = 7};
constexpr SRLAPIRegistrationData manyAPI{
    .identifier = "Many", .instanceType = kType, .scopeType = 0b01, .identifierLength = 4, .isMultibound = 1};
// Other records of the API `manyAPI`.
constexpr SRLAPIRegistrationData otherManyAPIs[] = {manyAPI, manyAPI};
constexpr SRLAPIRegistrationData unknownAPI{
    .identifier = "Unknown", .instanceType = kType, .identifierLength = 7};
constexpr SRLImplementationRegistrationData scoped{.identifier = "ScopedThing",
                                                   .instanceType = {.className = "Thing"},
                                                   .factory = makeScoped,
                                                   .scopeType = 0b01};
constexpr SRLImplementationRegistrationData another{.identifier = "AnotherThing",
                                                    .instanceType = {.className = "Thing"},
                                                    .factory = makeAnother,
                                                    .scopeType = 0b01,
                                                    .lifetime = 1};
using Implementations = const SRLImplementationRegistrationData*;
constexpr Implementations kNone[] = {nullptr};
constexpr Implementations kScoped[] = {&scoped, nullptr};
constexpr Implementations kFresh[] = {&another, nullptr};
constexpr Implementations kMany[] = {&scoped, &another, nullptr};
constexpr _SRLBindingRegistrationData kBindings[] = {
    {&manyAPI, kMany}, {&freshAPI, kFresh}, {&scopedAPI, kScoped}, {&unboundAPI, kNone}};
static_assert(SRLAreBindingsSorted(kBindings));
constexpr SRLBindingsModuleData kModule{.bindingsBegin = std::begin(kBindings),
                                        .bindingsEnd = std::end(kBindings)};

class Delegate final : public rt::Implements<Delegate, rt::Object, SRLScopeLifecycleDelegate> {
 public:
  void didRemoveScopesWithTag(const Ref<rt::Object>& /*tag*/,
                              const std::vector<rt::Weak<rt::Object>>& instances) override {
    ++removals;
    outlived = 0;
    for (const auto& instance : instances) outlived += instance.lock() ? 1 : 0;
  }
  int removals = 0;
  int outlived = 0;
};

// Returns the result of `request`. Repeats the request once if it throws for want of memory: the registry
// must still work.
template <class Request>
auto persistently(Request request) {
  try {
    return request();
  } catch (const std::bad_alloc&) {
    return request();
  }
}

// Replaces the shared registry with one that has the module's bindings.
class Shared {
 public:
  Shared() {
    const AllocationFailure::Pause pause;
    registry->internalRegisterBindings(std::array{&kModule});
    before_ = SRLRegistry::setSharedInstance(registry);
    scopedMade = 0;
    othersMade = 0;
  }
  Shared(const Shared&) = delete;
  Shared& operator=(const Shared&) = delete;
  ~Shared() { SRLRegistry::setSharedInstance(before_); }

  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();

 private:
  Ref<SRLRegistry> before_;
};

// The registry registers the bindings on request and then knows them.
TEST(WithoutMemory, RegistersBindings) {
  tryEachAllocation(
      [] {
        const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
        registry->internalRegisterBindings(std::array{&kModule});
        const auto knows = [&](const SRLAPIRegistrationData& api) {
          return persistently([&] { return registry->internalHasImplementationForService(&api); });
        };
        EXPECT_TRUE(knows(scopedAPI));
        EXPECT_TRUE(knows(freshAPI));
        EXPECT_FALSE(knows(unboundAPI));
        EXPECT_FALSE(knows(unknownAPI));
        EXPECT_TRUE(persistently([&] { return registry->mutableCopy(); }));
        EXPECT_TRUE(persistently([&] { return registry->description(); }));
      },
      kGrowth);
}

// A request by another record of an API begins to register implementations. When it failed, those that it had
// registered used to stay, and the rest was missing for ever. What was registered before the request must
// stay.
TEST(WithoutMemory, UndoesAFailedRegistrationForAnotherRecord) {
  tryEachAllocation(
      [] {
        const Shared shared;
        SRLRegistry& registry = *shared.registry;
        const Ref<rt::Object> account = "account"_s.object();
        const SRLScopeTagSet one{{account.get()}};
        const auto ask = [&](const SRLAPIRegistrationData& other) {
          try {
            EXPECT_FALSE(registry.internalHasImplementationForService(&other));
          } catch (const std::bad_alloc&) {  // NOLINT(bugprone-empty-catch): it is asked only once
          }
        };
        ask(otherManyAPIs[0]);
        const Ref<rt::Array> many =
            persistently([&] { return registry.internalMultiBoundService(&manyAPI, one); });
        ASSERT_TRUE(many);
        EXPECT_EQ(many->count(), 2U);

        ask(otherManyAPIs[1]);
        const AllocationFailure::Pause pause;
        EXPECT_NE(registry.description().view().find("Many = "), std::string_view::npos);
      },
      kGrowth);
}

// If a scope had no memory to store a new instance, the instance used to be lost and to count as pending for
// ever. If the first request of an API for many ran out of memory, some implementations used to be missing
// for ever.
TEST(WithoutMemory, ResolvesServices) {
  tryEachAllocation(
      [] {
        const Shared shared;
        SRLRegistry& registry = *shared.registry;
        const Ref<rt::Object> account = "account"_s.object();
        const Ref<rt::Object> window = "window"_s.object();
        const SRLScopeTagSet two{{account.get(), window.get()}};
        const SRLScopeTagSet one{{account.get()}};
        const Ref<Delegate> delegate = rt::make<Delegate>();
        persistently([&] { return registry.setScopeLifecycleDelegate(delegate), true; });

        const Ref<rt::Object> first = persistently([&] { return registry.internalService(&scopedAPI, two); });
        EXPECT_TRUE(first);
        EXPECT_EQ(persistently([&] { return registry.internalOptionalService(&scopedAPI, two); }), first);
        EXPECT_EQ(scopedMade, 1);
        const Ref<rt::Object> fresh = persistently([&] { return registry.internalService(&freshAPI, one); });
        EXPECT_TRUE(fresh);
        EXPECT_FALSE(persistently([&] { return registry.internalOptionalService(&unboundAPI, {}); }));
        EXPECT_FALSE(persistently([&] { return registry.internalOptionalService(&unknownAPI, {}); }));
        const Ref<rt::Array> many =
            persistently([&] { return registry.internalMultiBoundService(&manyAPI, one); });
        ASSERT_TRUE(many);
        EXPECT_EQ(many->count(), 2U);
        EXPECT_EQ(scopedMade, 1);

        const Ref<SRLMemoizingScope> scope = persistently([&] { return registry.scopeWithTags(one); });
        EXPECT_EQ(persistently([&] { return scope->instances(); })->count(), 1U);
        EXPECT_EQ(delegate->removals, 0);
        // If this throws, either the scopes still exist, or they are removed and the delegate was not told.
        persistently([&] { return registry.removeScopesWithTag(account), true; });
        EXPECT_LE(delegate->removals, 1);
        EXPECT_TRUE(persistently([&] { return registry.internalService(&scopedAPI, two); }) != first);
        EXPECT_EQ(scopedMade, 2);
      },
      kGrowth);
}

TEST(WithoutMemory, ResolvesServicesByIdentifier) {
  tryEachAllocation(
      [] {
        const Shared shared;
        SRLRegistry& registry = *shared.registry;
        const Ref<SRLScopeTagSetCodableWrapper> tags = persistently(
            [&] { return SRLScopeTagSetCodableWrapper::initWithTags(rt::Array::of("account"_s)); });
        const std::vector<std::byte> archived =
            persistently([&] { return rt::KeyedArchiver::archivedDataWithRootObject(tags); });
        const Ref<SRLScopeTagSetCodableWrapper> same = persistently([&] {
          return rt::KeyedUnarchiver::unarchivedObjectOfClass<SRLScopeTagSetCodableWrapper>(archived);
        });
        ASSERT_TRUE(same);
        EXPECT_TRUE(same->isEqual(tags.get()));
        for (int i = 0; i < 2; ++i) {
          EXPECT_TRUE(persistently([&] { return registry.eg_internalService("Fresh"_s, same); }));
          EXPECT_TRUE(persistently([&] { return registry.eg_internalOptionalService("Fresh"_s, same); }));
          EXPECT_EQ(
              persistently([&] { return registry.eg_internalMultiBoundService("Many"_s, same); })->count(),
              2U);
          EXPECT_TRUE(
              persistently([&] { return registry.eg_internalHasImplementationForService("Scoped"_s); }));
          EXPECT_FALSE(persistently([&] { return registry.eg_internalOptionalService("Unknown"_s, same); }));
        }
        EXPECT_EQ(scopedMade, 1);
      },
      kGrowth);
}

TEST(WithoutMemory, ProvidesObjects) {
  tryEachAllocation(
      [] {
        const Ref<AVOProvider> provider = AVOProvider::providerWithObject("object"_s.object());
        EXPECT_TRUE(provider->get());
        EXPECT_TRUE(SRLProviderFromFunction([]() -> Ref<rt::Object> { return "made"_s.object(); })->get());
      },
      kGrowth);
}

// A request that has no memory for its report throws.
TEST(WithoutMemory, ReportsMisuse) {
  TestReports reports;
  tryEachAllocation(
      [&] {
        reports.messages();
        const Shared shared;
        SRLRegistry& registry = *shared.registry;
        EXPECT_FALSE(persistently([&] { return registry.internalService(&unknownAPI, {}); }));
        EXPECT_FALSE(persistently([&] { return registry.internalService(&unboundAPI, {}); }));
        EXPECT_FALSE(persistently([&] { return registry.eg_internalService("Unknown"_s, nullptr); }));
        persistently([&] { return registry.removeScopesWithTag(nullptr), true; });
        EXPECT_FALSE(persistently([&] { return AVOProvider::initWithBlock(nullptr); }));
      },
      kGrowth);
}

}  // namespace
