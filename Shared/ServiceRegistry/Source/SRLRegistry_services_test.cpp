// Requests for services: required, optional and multi-bound ones.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <string>
#include <vector>

#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Values/Number.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/TestServices.h"

namespace {

using namespace TestServices;
using rt::Ref;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

constexpr const char* kService = "-[SRLRegistry internalService:scopeTags:]";
constexpr const char* kOptional = "-[SRLRegistry internalOptionalService:scopeTags:]";
constexpr const char* kMultiBound = "-[SRLRegistry internalMultiBoundService:scopeTags:]";

std::string priorTo(const std::string& api) {
  return "A service injector was called prior to service bindings being registered.\n\nService: " + api;
}
std::string noBinding(const std::string& api) {
  return "No binding was found for required, single-bound service: " + api;
}

class SRLRegistryServices : public ServicesTest {
 protected:
  // Returns the description of the implementation that is bound to a single-bound API.
  std::string metadataOf(const SRLAPIRegistrationData& api) {
    const rt::LockGuard guard(*registry->lock());
    return std::string(registry->implementationForSingleBoundService(&api)->description());
  }
};

SRLScopeTagSet tagsOf(const Ref<rt::Object>& object) {
  return rt::cast<Thing>(object.get())->tags;
}

TEST_F(SRLRegistryServices, WithLifetimeOneAreNewEachTime) {
  const Ref<rt::Object> first = registry->internalService(&freshAPI, tags);
  const Ref<rt::Object> second = registry->internalService(&freshAPI, tags);
  ASSERT_TRUE(first && second);
  EXPECT_NE(first, second);
  EXPECT_EQ(tagsOf(first).tags, tagSet(window).tags);
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, WithLifetimeZeroAreMadeOncePerScope) {
  const Ref<rt::Object> first = registry->internalService(&scopedAPI, tags);
  ASSERT_TRUE(first);
  EXPECT_EQ(tagsOf(first).tags, tagSet(account).tags);
  EXPECT_EQ(registry->internalService(&scopedAPI, tags), first);
  // The implementation's scope ignores the window. Equal tags find the same instance.
  const Ref<rt::Object> otherWindow = rt::Number::of(2);
  const Ref<rt::Object> equalAccount = rt::String::fromUTF8("account").object();
  EXPECT_EQ(registry->internalService(&scopedAPI, tagSet(equalAccount, otherWindow)), first);
  EXPECT_NE(registry->internalService(&scopedAPI, tagSet(otherWindow, window)), first);
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, OfNoScopeLiveInTheScopeWithoutTags) {
  const Ref<rt::Object> thing = registry->internalService(&globalAPI, {});
  ASSERT_TRUE(thing);
  EXPECT_EQ(registry->internalService(&globalAPI, {}), thing);
  const Ref<rt::Array> instances = registry->scopeWithTags({})->instances();
  ASSERT_EQ(instances->count(), 1U);
  EXPECT_EQ(instances->at(0), thing.get());
}

TEST_F(SRLRegistryServices, CanBeRequestedByFactories) {
  const Ref<rt::Object> nest = registry->internalService(&nestedAPI, tags);
  ASSERT_TRUE(rt::cast<Nest>(nest.get()) != nullptr);
  EXPECT_EQ(rt::cast<Nest>(nest.get())->inner, registry->internalService(&scopedAPI, tags));
}

TEST_F(SRLRegistryServices, GetNoTagsIfTheTagsDoNotFitTheScope) {
  const Ref<rt::Object> thing = registry->internalService(&freshAPI, tagSet(account));
  EXPECT_THAT(reports.texts(), ElementsAre("The tag set must contain all API scope tags."));
  ASSERT_TRUE(thing);
  EXPECT_EQ(tagsOf(thing).tags, SRLScopeTagSet().tags);
}

// Their scope is then the one without tags, which all such requests share.
TEST_F(SRLRegistryServices, AreSharedIfTheTagsDoNotFitTheScope) {
  const std::string report = "The tag set must contain all API scope tags.";
  const Ref<rt::Object> thing = registry->internalService(&scopedAPI, tagSet(account));
  EXPECT_THAT(reports.texts(), ElementsAre(report));
  ASSERT_TRUE(thing);
  EXPECT_EQ(tagsOf(thing).tags, SRLScopeTagSet().tags);
  EXPECT_TRUE(registry->scopeWithTags({})->instances()->contains(thing.get()));
  EXPECT_EQ(registry->internalService(&scopedAPI, tagSet(account)), thing);
  EXPECT_THAT(reports.texts(), ElementsAre(report));
  EXPECT_EQ(registry->internalOptionalService(&scopedAPI, {}), thing);
  EXPECT_THAT(reports.texts(), ElementsAre(report));
  EXPECT_NE(registry->internalService(&scopedAPI, tags), thing);
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, ThatAreRequiredAreReportedIfNothingIsBound) {
  for (int i = 0; i < 2; ++i) {
    EXPECT_FALSE(registry->internalService(&unboundAPI, {}));
    EXPECT_FALSE(registry->internalService(&unknownAPI, {}));
    EXPECT_THAT(reportsOf(kService), ElementsAre(noBinding("Unbound"), noBinding("Unknown")));
  }
}

TEST_F(SRLRegistryServices, ThatAreRequiredAreReportedBeforeThereAreModules) {
  EXPECT_FALSE(SRLRegistry::initPrivate()->internalService(&scopedAPI, tags));
  EXPECT_THAT(reportsOf(kService), ElementsAre(priorTo("Scoped")));
}

TEST_F(SRLRegistryServices, ThatAreOptionalMayBeMissing) {
  EXPECT_FALSE(registry->internalOptionalService(&unboundAPI, {}));
  EXPECT_FALSE(registry->internalOptionalService(&unknownAPI, {}));
  EXPECT_FALSE(registry->internalOptionalService(&nullAPI, {}));
  EXPECT_FALSE(SRLRegistry::initPrivate()->internalOptionalService(&scopedAPI, tags));
  EXPECT_FALSE(SRLRegistry::initPrivate()->internalMultiBoundService(&manyAPI, tags));
  EXPECT_EQ(registry->internalOptionalService(&scopedAPI, tags), registry->internalService(&scopedAPI, tags));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

// The registry that is registering its modules, for a module's callback.
SRLRegistry* inTheMaking = nullptr;

TEST_F(SRLRegistryServices, AreReportedWhileModulesAreBeingRegistered) {
  const SRLBindingsModuleData module{
      .bindingsBegin = kModule.bindingsBegin,
      .bindingsEnd = kModule.bindingsEnd,
      .addConfigurationFactories = [](SRLConfigurationFactories&) {
        const Ref<rt::Object> tag = rt::Number::of(1);
        EXPECT_FALSE(inTheMaking->internalService(&scopedAPI, tagSet(tag, tag)));
        EXPECT_FALSE(inTheMaking->internalOptionalService(&scopedAPI, tagSet(tag, tag)));
        EXPECT_FALSE(inTheMaking->internalMultiBoundService(&manyAPI, tagSet(tag, tag)));
        EXPECT_FALSE(inTheMaking->internalHasImplementationForService(&scopedAPI));
      }};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  inTheMaking = other.get();
  other->internalRegisterBindings(std::array{&module});
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 3U);
  EXPECT_EQ(text(*messages[0]), priorTo("Scoped"));
  EXPECT_EQ(messages[0]->function(), kService);
  EXPECT_EQ(text(*messages[1]), priorTo("Scoped"));
  EXPECT_EQ(messages[1]->function(), kOptional);
  EXPECT_EQ(text(*messages[2]), priorTo("Many"));
  EXPECT_EQ(messages[2]->function(), kMultiBound);
  // The registry does not remember that these requests found nothing.
  EXPECT_TRUE(other->internalService(&scopedAPI, tags));
  EXPECT_TRUE(other->internalMultiBoundService(&manyAPI, tags));
}

TEST_F(SRLRegistryServices, ThatAreRequiredAreReportedIfTheyAreNull) {
  const std::string report =
      "Implementation of Thing, bound to required service Null, returned nil.\nImplementation metadata: " +
      metadataOf(nullAPI) + "\nSee docs/registry.md#initializer-return-nil.";
  EXPECT_FALSE(registry->internalService(&nullAPI, {}));
  EXPECT_THAT(reportsOf(kService), ElementsAre(report));
  // The scope keeps the null. Each request reports it.
  EXPECT_FALSE(registry->internalService(&nullAPI, {}));
  EXPECT_THAT(reportsOf(kService), ElementsAre(report));
  EXPECT_EQ(nullsMade, 1);
}

TEST_F(SRLRegistryServices, OfAMultiBoundAPIComeWithoutNulls) {
  const Ref<rt::Array> things = registry->internalMultiBoundService(&manyAPI, tags);
  const std::vector<std::string> texts = reportsOf(kMultiBound);
  ASSERT_EQ(texts.size(), 1U);
  EXPECT_THAT(texts[0], testing::MatchesRegex(
                            "Implementation of Thing, bound to multi-bound service Many, returned nil.\n"
                            "Implementation metadata: SRLImplementation<0x[0-9a-f]+, identifier: NullThing, "
                            "instanceType: Thing, lifetime: 0, scopeType: 0, configuration: None>\n"
                            "See docs/registry.md#initializer-return-nil\\."));
  ASSERT_TRUE(things);
  ASSERT_EQ(things->count(), 2U);
  EXPECT_TRUE(things->contains(registry->scopeWithTags(tagSet(account))->instances()->at(0)));

  const Ref<rt::Array> again = registry->internalMultiBoundService(&manyAPI, tags);
  ASSERT_EQ(again->count(), 2U);
  int same = 0;
  for (const Ref<rt::Object>& thing : *again) same += things->contains(thing.get()) ? 1 : 0;
  EXPECT_EQ(same, 1);
}

TEST_F(SRLRegistryServices, OfAMultiBoundAPIMayBeEmptyOrUnknown) {
  const Ref<rt::Array> none = registry->internalMultiBoundService(&noneOfManyAPI, {});
  ASSERT_TRUE(none);
  EXPECT_TRUE(none->isEmpty());
  EXPECT_FALSE(registry->internalMultiBoundService(&unknownManyAPI, {}));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

// The request puts the single-bound API into both tables.
TEST_F(SRLRegistryServices, OfASingleBoundAPIAreNotFoundAsMultiBound) {
  EXPECT_FALSE(registry->internalMultiBoundService(&scopedAPI, tags));
  EXPECT_FALSE(registry->internalMultiBoundService(&scopedAPI, tags));
  EXPECT_TRUE(registry->internalService(&scopedAPI, tags));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, OfAMultiBoundAPIAreNotFoundAsSingleBound) {
  EXPECT_FALSE(registry->internalService(&manyAPI, tags));
  EXPECT_THAT(reportsOf(kService), ElementsAre(noBinding("Many")));
}

TEST_F(SRLRegistryServices, HaveAnImplementationIfOneIsBound) {
  EXPECT_TRUE(registry->internalHasImplementationForService(&scopedAPI));
  EXPECT_TRUE(registry->internalHasImplementationForService(&scopedAPI));
  EXPECT_TRUE(registry->internalHasImplementationForService(&nullAPI));
  EXPECT_FALSE(registry->internalHasImplementationForService(&unboundAPI));
  EXPECT_FALSE(registry->internalHasImplementationForService(&unknownAPI));
  EXPECT_FALSE(registry->internalHasImplementationForService(&manyAPI));
  EXPECT_FALSE(registry->internalHasImplementationForService(&manyAPI));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, ReportANullAPI) {
  {
    const rt::LockGuard guard(*registry->lock());
    EXPECT_FALSE(registry->implementationForSingleBoundService(nullptr));
  }
  EXPECT_THAT(reportsOf("-[SRLRegistry implementationForSingleBoundService:]"),
              ElementsAre("|apiIdentifier| cannot be nil!"));
  EXPECT_FALSE(registry->internalMultiBoundService(nullptr, tags));
  EXPECT_THAT(reportsOf(kMultiBound), ElementsAre("|apiIdentifier| cannot be nil!"));
  EXPECT_FALSE(registry->internalHasImplementationForService(nullptr));
  EXPECT_THAT(reportsOf("-[SRLRegistry internalHasImplementationForService:]"),
              ElementsAre("|apiIdentifier| cannot be nil!"));
  // The caller violates a precondition here. The result is a report, not a crash.
  EXPECT_FALSE(registry->internalService(nullptr, tags));
  EXPECT_THAT(reports.texts(), ElementsAre("|apiIdentifier| cannot be nil!", noBinding("(null)")));
}

TEST_F(SRLRegistryServices, HaveTheImplementationThatIsBound) {
  const rt::LockGuard guard(*registry->lock());
  EXPECT_FALSE(registry->implementationForSingleBoundService(&unknownAPI));
  EXPECT_FALSE(registry->implementationForSingleBoundService(&unboundAPI));
  const Ref<SRLImplementation> implementation = registry->implementationForSingleBoundService(&freshAPI);
  ASSERT_TRUE(implementation);
  EXPECT_EQ(implementation->lifetime(), 1U);
  EXPECT_EQ(implementation->scopeType(), 0b10U);
  EXPECT_EQ(registry->implementationForSingleBoundService(&freshAPI), implementation);
}

// The refused implementation is not looked at again.
TEST_F(SRLRegistryServices, AreMissingIfTheirImplementationWasRefused) {
  static constexpr SRLImplementationRegistrationData notAThing{
      .identifier = "NotAThing", .instanceType = {.className = "String"}, .factory = makeThing};
  static constexpr Implementations list[] = {&notAThing, nullptr};
  static constexpr SRLAPIRegistrationData api{
      .identifier = "Refused", .instanceType = kThingType, .identifierLength = 7};
  static constexpr _SRLBindingRegistrationData bindings[] = {{&api, list}};
  const SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings)};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  other->internalRegisterBindings(std::array{&module});
  EXPECT_FALSE(other->internalService(&api, {}));
  EXPECT_THAT(reports.texts(),
              ElementsAre("Implementation String should conform to Thing", noBinding("Refused")));
  EXPECT_FALSE(other->internalService(&api, {}));
  EXPECT_THAT(reports.texts(), ElementsAre(noBinding("Refused")));
}

// Another record with the same identifier is another API. Nothing is bound to it.
TEST_F(SRLRegistryServices, AreIdentifiedByTheRecordNotByItsText) {
  static constexpr SRLAPIRegistrationData twin{
      .identifier = "Global", .instanceType = kThingType, .identifierLength = 6};
  EXPECT_FALSE(registry->internalService(&twin, {}));
  EXPECT_THAT(reportsOf(kService), ElementsAre(noBinding("Global")));
  EXPECT_TRUE(registry->internalService(&globalAPI, {}));
  EXPECT_FALSE(registry->internalHasImplementationForService(&twin));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, ThatExistCostNoAllocation) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  const Ref<rt::Object> thing = registry->internalService(&scopedAPI, tags);
  const AllocationCount count;
  EXPECT_EQ(registry->internalService(&scopedAPI, tags), thing);
  EXPECT_EQ(registry->internalOptionalService(&scopedAPI, tags), thing);
  EXPECT_EQ(count.allocations(), 0);
}

// The instance is one allocation. The scope's entry for it is another.
TEST_F(SRLRegistryServices, ThatAreNewCostNoFurtherAllocations) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  registry->internalService(&freshAPI, tags);
  const AllocationCount fresh;
  registry->internalService(&freshAPI, tags);
  EXPECT_EQ(fresh.allocations(), 1);

  registry->internalService(&nestedAPI, tags);
  registry->removeScopesWithTag(window);
  registry->internalService(&scopedAPI, tagSet(window, window));
  registry->scopeWithTags(tags)->instanceForIdentifier(nullptr, nullptr, [] { return nullptr; });
  const AllocationCount scoped;
  registry->internalService(&nestedAPI, tags);
  EXPECT_EQ(scoped.allocations(), 2);
}

TEST_F(SRLRegistryServices, ThatAreUnknownCostNoAllocationAgain) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  EXPECT_FALSE(registry->internalOptionalService(&unknownAPI, {}));
  EXPECT_FALSE(registry->internalMultiBoundService(&unknownManyAPI, {}));
  const AllocationCount count;
  EXPECT_FALSE(registry->internalOptionalService(&unknownAPI, {}));
  EXPECT_FALSE(registry->internalHasImplementationForService(&unknownAPI));
  EXPECT_FALSE(registry->internalMultiBoundService(&unknownManyAPI, {}));
  EXPECT_EQ(count.allocations(), 0);
}

// A real module never changes. This one does, to show that it is not searched again.
TEST_F(SRLRegistryServices, ThatAreUnknownAreSearchedForInModulesOnce) {
  std::string identifier = "Elsewise";
  const SRLAPIRegistrationData inModule{
      .identifier = identifier.c_str(), .instanceType = kThingType, .identifierLength = 8};
  const _SRLBindingRegistrationData bindings[] = {{&inModule, kGlobal}};
  const SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings)};
  const SRLAPIRegistrationData api{
      .identifier = "Midnight", .instanceType = kThingType, .identifierLength = 8};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  other->internalRegisterBindings(std::array{&module});
  const auto hasBound = [&] { return other->description().contains("GlobalThing"); };
  EXPECT_FALSE(other->internalOptionalService(&api, {}));
  identifier = "Midnight";
  EXPECT_FALSE(other->internalOptionalService(&api, {}));
  EXPECT_FALSE(other->internalMultiBoundService(&api, {}));
  EXPECT_FALSE(hasBound());
  {
    const rt::LockGuard guard(*other->lock());
    EXPECT_TRUE(other->lazilyRegisterBindingsForAPI(&api));
  }
  EXPECT_TRUE(hasBound());
}

// A registry without modules does not remember which APIs are unknown.
TEST_F(SRLRegistryServices, AreSearchedForAgainOnceThereAreModules) {
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  EXPECT_FALSE(other->internalOptionalService(&globalAPI, {}));
  EXPECT_FALSE(other->internalHasImplementationForService(&freshAPI));
  EXPECT_FALSE(other->internalMultiBoundService(&manyAPI, tags));
  other->internalRegisterBindings(std::array{&kModule});
  EXPECT_TRUE(other->internalOptionalService(&globalAPI, {}));
  EXPECT_TRUE(other->internalHasImplementationForService(&freshAPI));
  EXPECT_TRUE(other->internalMultiBoundService(&manyAPI, tags));
}

TEST_F(SRLRegistryServices, ThatAreUnknownMayBeBoundByHand) {
  for (int i = 0; i < 2; ++i) {
    EXPECT_FALSE(registry->internalService(&unknownAPI, {}));
    EXPECT_THAT(reportsOf(kService), ElementsAre(noBinding("Unknown")));
    EXPECT_FALSE(registry->internalMultiBoundService(&unknownManyAPI, {}));
  }
  const Ref<SRLImplementation> implementation = SRLImplementation::initWithIdentifier(
      "ByHand", SRLClassType::initWithClass(&rt::classInfo<Thing>()), /*lifetime=*/1, /*scope=*/0,
      [](const SRLScopeTagSet& given, bool*) { return makeThing(given); }, nullptr);
  {
    const rt::LockGuard guard(*registry->lock());
    EXPECT_FALSE(registry->lazilyRegisterBindingsForAPI(&unknownAPI));
    registry->internalRegisterServiceAPI(&unknownAPI, implementation);
    registry->internalRegisterServiceAPI(&unknownManyAPI, implementation);
  }
  EXPECT_TRUE(registry->internalService(&unknownAPI, {}));
  EXPECT_TRUE(registry->internalHasImplementationForService(&unknownAPI));
  ASSERT_TRUE(registry->internalMultiBoundService(&unknownManyAPI, {}));
  EXPECT_EQ(registry->internalMultiBoundService(&unknownManyAPI, {})->count(), 1U);
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, MayThrowAndLeaveTheRegistryUsable) {
  EXPECT_THROW(registry->internalService(&throwingAPI, {}), Failure);
  EXPECT_THROW(registry->internalOptionalService(&throwingAPI, {}), Failure);
  EXPECT_TRUE(registry->internalService(&globalAPI, {}));
}

// Makes a thing, or throws as long as the test wants that.
bool shallThrow = false;
Ref<rt::Object> makeThingAtTimes(SRLScopeTagSet given) {
  if (shallThrow) throw Failure();
  return makeThing(given);
}

// The instance stays pending as long as its scope exists. Requesting it again used to end the program.
TEST_F(SRLRegistryServices, ThatAreScopedAndThrowCanBeMadeInTheNextScope) {
  static constexpr SRLImplementationRegistrationData implementation{.identifier = "AtTimes",
                                                                    .instanceType = {.className = "Thing"},
                                                                    .factory = makeThingAtTimes,
                                                                    .scopeType = 0b01};
  static constexpr Implementations list[] = {&implementation, nullptr};
  static constexpr SRLAPIRegistrationData api{
      .identifier = "AtTimes", .instanceType = kThingType, .scopeType = 0b01, .identifierLength = 7};
  static constexpr _SRLBindingRegistrationData bindings[] = {{&api, list}};
  const SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings)};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  other->internalRegisterBindings(std::array{&module});
  SRLRegistry::setSharedInstance(other);
  shallThrow = true;
  EXPECT_THROW(other->internalService(&api, tagSet(account)), Failure);
  shallThrow = false;
  EXPECT_TRUE(other->internalService(&api, tagSet(window)));
  EXPECT_FALSE(other->internalOptionalService(&api, tagSet(account)));
  EXPECT_THAT(reports.texts(),
              ElementsAre("We blocked waiting on instance creation but no instance was created."));
  EXPECT_FALSE(other->internalService(&api, tagSet(account)));
  EXPECT_THAT(reports.texts(),
              ElementsAre("We blocked waiting on instance creation but no instance was created.",
                          HasSubstr("bound to required service AtTimes, returned nil.")));
  other->removeScopesWithTag(account);
  EXPECT_TRUE(other->internalService(&api, tagSet(account)));
}

// Makes a nest and ends the scopes of its account.
Ref<rt::Object> makeNestAndEndScopes(SRLScopeTagSet given) {
  SRLRegistry::sharedInstance()->removeScopesWithTag(given.tags[0]);
  return rt::make<Nest>(given, nullptr);
}

// One of the factories ends the scope. The instances after it used to come from the old scope, and the
// delegate was told that they had outlived it.
TEST_F(SRLRegistryServices, OfAMultiBoundAPIDoNotComeFromAScopeThatOneOfThemEnded) {
  static constexpr SRLImplementationRegistrationData ending{.identifier = "Ending",
                                                            .instanceType = {.className = "Nest"},
                                                            .factory = makeNestAndEndScopes,
                                                            .scopeType = 0b01,
                                                            .lifetime = 1};
  static constexpr std::array kNames = {"A", "B", "C", "D", "E", "F", "G", "H"};
  static std::array<SRLImplementationRegistrationData, kNames.size()> kept;
  static std::array<Implementations, kNames.size() + 2> list{};
  for (std::size_t i = 0; i < kNames.size(); ++i) {
    kept.at(i) = scopedThing;
    kept.at(i).identifier = kNames.at(i);
    list.at(i) = &kept.at(i);
  }
  list.at(kNames.size()) = &ending;
  static constexpr SRLAPIRegistrationData api{.identifier = "Ended",
                                              .instanceType = kThingType,
                                              .scopeType = 0b01,
                                              .identifierLength = 5,
                                              .isMultibound = 1};
  static const _SRLBindingRegistrationData bindings[] = {{&api, list.data()}};
  const SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings)};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  other->internalRegisterBindings(std::array{&module});
  SRLRegistry::setSharedInstance(other);

  const Ref<rt::Array> before = other->internalMultiBoundService(&api, tagSet(account));
  const Ref<rt::Array> things = other->internalMultiBoundService(&api, tagSet(account));
  ASSERT_EQ(things->count(), list.size() - 1);
  const Ref<rt::Array> live = other->scopeWithTags(tagSet(account))->instances();
  std::size_t countAfterEnd = 0;
  bool hasEnded = false;
  for (const Ref<rt::Object>& thing : *things) {
    EXPECT_EQ(live->contains(thing.get()), hasEnded);
    if (hasEnded) {
      EXPECT_FALSE(before->contains(thing.get()));
      ++countAfterEnd;
    }
    hasEnded = hasEnded || rt::cast<Nest>(thing.get()) != nullptr;
  }
  EXPECT_EQ(live->count(), countAfterEnd);
  ASSERT_GT(countAfterEnd, 0U) << "the one that ends the scope must not be the last; give it another name";
}

SRLRegistry* boundWhileAsked = nullptr;
extern const SRLAPIRegistrationData growingAPI;

Ref<rt::Object> makeThingAndBindAnother(SRLScopeTagSet tags) {
  const Ref<SRLImplementation> another = SRLImplementation::initWithIdentifier(
      "Another", nullptr, 1, 0,
      [](const SRLScopeTagSet& given, bool*) -> Ref<rt::Object> { return rt::make<Thing>(given); }, nullptr);
  const rt::LockGuard guard(*boundWhileAsked->lock());
  boundWhileAsked->internalRegisterServiceAPI(&growingAPI, another);
  return rt::make<Thing>(tags);
}

constexpr SRLImplementationRegistrationData growing{.identifier = "Growing",
                                                    .instanceType = {.className = "Thing"},
                                                    .factory = makeThingAndBindAnother,
                                                    .lifetime = 1};
constexpr SRLAPIRegistrationData growingAPI{
    .identifier = "Growing", .instanceType = kThingType, .identifierLength = 7, .isMultibound = 1};

// An implementation that a factory binds to the API counts from the next request on.
TEST_F(SRLRegistryServices, OfAMultiBoundAPIAreThoseBoundAtTheTimeOfTheRequest) {
  static constexpr Implementations list[] = {&growing, nullptr};
  static constexpr _SRLBindingRegistrationData bindings[] = {{&growingAPI, list}};
  const SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings)};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  other->internalRegisterBindings(std::array{&module});
  boundWhileAsked = other.get();
  EXPECT_EQ(other->internalMultiBoundService(&growingAPI, {})->count(), 1U);
  EXPECT_EQ(other->internalMultiBoundService(&growingAPI, {})->count(), 2U);
  EXPECT_EQ(other->internalMultiBoundService(&growingAPI, {})->count(), 2U);
  EXPECT_THAT(reports.texts(), IsEmpty());
}

TEST_F(SRLRegistryServices, ThatAreScopedLiveInTheSharedRegistry) {
  const Ref<SRLRegistry> copy = registry->mutableCopy();
  const Ref<rt::Object> thing = copy->internalService(&scopedAPI, tags);
  EXPECT_EQ(registry->internalService(&scopedAPI, tags), thing);
  EXPECT_TRUE(copy->scopeWithTags(tagSet(account))->instances()->isEmpty());
  EXPECT_EQ(registry->scopeWithTags(tagSet(account))->instances()->count(), 1U);

  // The registry that is shared at the time of the request counts.
  SRLRegistry::setSharedInstance(copy);
  EXPECT_NE(registry->internalService(&scopedAPI, tags), thing);
  SRLRegistry::setSharedInstance(nullptr);
  EXPECT_FALSE(registry->internalOptionalService(&scopedAPI, tags));
}

TEST_F(SRLRegistryServices, TellWhetherTheyAreNew) {
  const SRLFactoryBlock fresh = registry->scopedBlockForFactory(makeThing, &freshThing, 0b11, 0b10, 1);
  const SRLFactoryBlock scoped = registry->scopedBlockForFactory(makeThing, &scopedThing, 0b11, 0b01, 0);
  // Any lifetime but 1 means one instance per scope.
  const SRLFactoryBlock odd = registry->scopedBlockForFactory(makeThing, &scopedThing, 0b11, 0b01, 2);
  bool isNew = false;
  EXPECT_TRUE(fresh(tags, &isNew));
  EXPECT_TRUE(isNew);
  EXPECT_TRUE(fresh(tags, nullptr));
  isNew = false;
  const Ref<rt::Object> thing = scoped(tags, &isNew);
  EXPECT_TRUE(isNew);
  isNew = false;
  EXPECT_EQ(scoped(tags, &isNew), thing);
  EXPECT_EQ(odd(tags, &isNew), thing);
  EXPECT_EQ(scoped(tags, nullptr), thing);
  EXPECT_FALSE(isNew);
}

}  // namespace
