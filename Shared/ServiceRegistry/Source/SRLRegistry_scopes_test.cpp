// The scopes of services, their end, and requests by identifier.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <iterator>
#include <utility>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "Runtime/Values/Number.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLClassType.h"
#include "tests/support/TestServices.h"

namespace {

using namespace TestServices;
using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

class SRLRegistryScopes : public ServicesTest {};

class Delegate final : public rt::Implements<Delegate, rt::Object, SRLScopeLifecycleDelegate> {
 public:
  void didRemoveScopesWithTag(const Ref<rt::Object>& tag,
                              const std::vector<rt::Weak<rt::Object>>& serviceInstances) override {
    tags.push_back(tag);
    instanceCount = serviceInstances.size();
    survivors.clear();
    for (const rt::Weak<rt::Object>& instance : serviceInstances) {
      if (const Ref<rt::Object> survivor = instance.lock()) survivors.push_back(survivor);
    }
  }

  std::vector<Ref<rt::Object>> tags;
  std::size_t instanceCount = 0;
  std::vector<Ref<rt::Object>> survivors;
};

// Runs an action when it is destroyed.
class Farewell final : public rt::Implements<Farewell, rt::Object> {
 public:
  explicit Farewell(std::function<void()> action) : action_(std::move(action)) {}
  ~Farewell() override { action_(); }

 private:
  const std::function<void()> action_;
};

TEST_F(SRLRegistryScopes, AreIdentifiedByTheirTags) {
  const Ref<SRLMemoizingScope> scope = registry->scopeWithTags(tags);
  ASSERT_TRUE(scope);
  EXPECT_EQ(registry->scopeWithTags(tagSet(rt::String::fromUTF8("account").object(), window)), scope);
  EXPECT_NE(registry->scopeWithTags(tagSet(window, account)), scope);
  EXPECT_NE(registry->scopeWithTags(tagSet(account)), scope);
  EXPECT_NE(registry->scopeWithTags({}), scope);
  EXPECT_EQ(registry->scopeWithTags({}), registry->scopeWithTags({}));
  EXPECT_NE(registry->scopeWithTags({}), registry->configScope());
}

TEST_F(SRLRegistryScopes, RetainTheirTagsUntilTheyEnd) {
  Ref<rt::Object> tag = rt::make<Farewell>([] {});
  const rt::Weak<rt::Object> weak = tag;
  registry->scopeWithTags(tagSet(tag, account));
  registry->scopeWithTags(tagSet(tag, account));
  registry->scopeWithTags(tagSet(tag));
  tag = nullptr;
  EXPECT_TRUE(weak.lock());
  registry->removeScopesWithTag(account);
  EXPECT_TRUE(weak.lock());
  registry->removeScopesWithTag(weak.lock());
  EXPECT_FALSE(weak.lock());
}

TEST_F(SRLRegistryScopes, EndByAnyOfTheirTags) {
  const Ref<rt::Object> other = rt::Number::of(1);
  const std::vector<std::pair<SRLScopeTagSet, bool>> cases = {
      {tagSet(account), true}, {tagSet(window, account), true}, {tagSet(account, window), true},
      {tagSet(window), false}, {tagSet(other), false},          {tagSet(), false}};
  std::vector<Ref<SRLMemoizingScope>> scopes;
  for (const auto& [set, isRemoved] : cases) scopes.push_back(registry->scopeWithTags(set));
  registry->removeScopesWithTag(rt::String::fromUTF8("account").object());
  for (std::size_t i = 0; i < cases.size(); ++i) {
    EXPECT_EQ(registry->scopeWithTags(cases[i].first) != scopes[i], cases[i].second) << i;
  }
}

TEST_F(SRLRegistryScopes, ReleaseTheirInstances) {
  Ref<rt::Object> thing = registry->internalService(&scopedAPI, tags);
  const rt::Weak<rt::Object> weak = thing;
  thing = nullptr;
  EXPECT_TRUE(weak.lock());
  registry->removeScopesWithTag(account);
  EXPECT_FALSE(weak.lock());
  EXPECT_TRUE(registry->internalService(&scopedAPI, tags));
  EXPECT_THAT(reports.texts(), IsEmpty());
}

// A request finds its scope after requests for other scopes, and after scopes have ended.
TEST_F(SRLRegistryScopes, AreFoundInAlternation) {
  const SRLScopeTagSet others = tagSet(window, window);
  const Ref<rt::Object> first = registry->internalService(&scopedAPI, tags);
  const Ref<rt::Object> second = registry->internalService(&scopedAPI, others);
  const Ref<rt::Object> third = registry->internalService(&globalAPI, {});
  for (int i = 0; i < 3; ++i) {
    EXPECT_EQ(registry->internalService(&scopedAPI, tags), first);
    EXPECT_EQ(registry->internalService(&scopedAPI, tags), first);
    EXPECT_EQ(registry->internalService(&scopedAPI, others), second);
    EXPECT_EQ(registry->internalService(&globalAPI, {}), third);
  }
  EXPECT_EQ(registry->internalService(&scopedAPI, tags), first);
  registry->removeScopesWithTag(account);
  const Ref<rt::Object> again = registry->internalService(&scopedAPI, tags);
  EXPECT_NE(again, first);
  EXPECT_EQ(registry->internalService(&scopedAPI, others), second);
  EXPECT_EQ(registry->internalService(&scopedAPI, tags), again);
  // A scope ends that is not that of the last request.
  registry->removeScopesWithTag(window);
  EXPECT_EQ(registry->internalService(&scopedAPI, tags), again);
  EXPECT_NE(registry->internalService(&scopedAPI, others), second);
  EXPECT_EQ(registry->internalService(&globalAPI, {}), third);
}

// A tag of an earlier request may be gone. Another tag may have its address.
TEST_F(SRLRegistryScopes, AreNotFoundByTheAddressOfAnEarlierTag) {
  class Tag final : public rt::Implements<Tag, rt::Object> {
   public:
    explicit Tag(int number) : number_(number) {}
    bool isEqual(const rt::Object* other) const override {
      const auto* tag = rt::cast<Tag>(other);
      return tag != nullptr && tag->number_ == number_;
    }
    std::uint64_t hash() const override { return 1; }

   private:
    const int number_;
  };
  const Ref<rt::Object> first = rt::make<Tag>(1);
  const Ref<SRLMemoizingScope> scope = registry->scopeWithTags(tagSet(first));
  alignas(Tag) std::array<std::byte, sizeof(Tag)> place;
  const auto scopeWithTagAtPlace = [&](int number) {
    Tag* tag = new (place.data()) Tag(number);
    const Ref<SRLMemoizingScope> found = registry->scopeWithTags({{tag}});
    // A new scope has retained the tag, so the tag must stay.
    if (found == scope) tag->~Tag();
    return found;
  };
  EXPECT_EQ(scopeWithTagAtPlace(1), scope);
  EXPECT_EQ(scopeWithTagAtPlace(1), scope);
  EXPECT_NE(scopeWithTagAtPlace(2), scope);
  registry->removeScopesWithTag(rt::make<Tag>(2));
  reinterpret_cast<Tag*>(place.data())->~Tag();
}

TEST_F(SRLRegistryScopes, TellTheDelegateWhichInstancesOutliveThem) {
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);
  EXPECT_EQ(registry->scopeLifecycleDelegate().get(), delegate.get());
  const Ref<rt::Object> kept = registry->internalService(&scopedAPI, tags);
  registry->internalService(&nestedAPI, tags);
  registry->internalService(&globalAPI, {});
  registry->removeScopesWithTag(account);
  EXPECT_THAT(delegate->tags, ElementsAre(account));
  EXPECT_EQ(delegate->instanceCount, 2U);
  EXPECT_THAT(delegate->survivors, ElementsAre(kept));

  // The delegate is called even if there is no scope to remove.
  registry->removeScopesWithTag(account);
  EXPECT_THAT(delegate->tags, ElementsAre(account, account));
  EXPECT_EQ(delegate->instanceCount, 0U);
}

// The tag used to be destroyed before the delegate was called with it.
TEST_F(SRLRegistryScopes, EndByATagThatOneOfTheirInstancesOwns) {
  class Session final : public rt::Implements<Session, rt::Object> {
   public:
    explicit Session(Ref<rt::Object> given) : account(std::move(given)) {}
    const Ref<rt::Object> account;
  };
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);
  Session* session = nullptr;
  {
    const Ref<rt::Object> tag = rt::make<Farewell>([] {});
    const Ref<rt::Object> made =
        registry->scopeWithTags(tagSet(tag))->instanceForIdentifier(this, nullptr, [&] {
          return rt::make<Session>(tag);
        });
    session = rt::cast<Session>(made.get());
  }
  const rt::Object* address = session->account.get();
  registry->removeScopesWithTag(session->account);
  ASSERT_EQ(delegate->tags.size(), 1U);
  EXPECT_EQ(delegate->tags[0].get(), address);
}

// The caller's reference to the tag becomes null while the scopes end.
TEST_F(SRLRegistryScopes, EndByAReferenceThatOneOfTheirInstancesClears) {
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);
  Ref<rt::Object> tag = rt::make<Farewell>([] {});
  const rt::Object* address = tag.get();
  registry->scopeWithTags(tagSet(tag))->instanceForIdentifier(this, nullptr, [&] {
    return rt::make<Farewell>([&] { tag = nullptr; });
  });
  registry->removeScopesWithTag(tag);
  EXPECT_FALSE(tag);
  ASSERT_EQ(delegate->tags.size(), 1U);
  EXPECT_EQ(delegate->tags[0].get(), address);
}

TEST_F(SRLRegistryScopes, DoNotTellTheDelegateOfNulls) {
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);
  registry->scopeWithTags(tags)->instanceForIdentifier(this, nullptr, [] { return Ref<rt::Object>(); });
  registry->removeScopesWithTag(account);
  EXPECT_EQ(delegate->instanceCount, 0U);
}

// If comparing a tag throws, nothing is removed, retained or released.
TEST_F(SRLRegistryScopes, StayIfATagThrows) {
  struct Failed {};
  class Moody final : public rt::Implements<Moody, rt::Object> {
   public:
    explicit Moody(bool& fails) : fails_(fails) {}
    bool isEqual(const rt::Object* other) const override {
      if (fails_) throw Failed();
      return this == other;
    }
    std::uint64_t hash() const override {
      if (fails_) throw Failed();
      return 1;
    }

   private:
    bool& fails_;
  };
  bool fails = false;
  Ref<rt::Object> moody = rt::make<Moody>(fails);
  const rt::Weak<rt::Object> weak = moody;
  const Ref<SRLMemoizingScope> scope = registry->scopeWithTags(tagSet(account, moody));
  const Ref<rt::Object> other = rt::Number::of(1);
  fails = true;
  EXPECT_THROW(registry->removeScopesWithTag(other), Failed);
  EXPECT_THROW(registry->scopeWithTags(tagSet(account, moody)), Failed);
  fails = false;
  EXPECT_EQ(registry->scopeWithTags(tagSet(account, moody)), scope);
  registry->removeScopesWithTag(other);
  registry->removeScopesWithTag(account);
  moody = nullptr;
  EXPECT_FALSE(weak.lock());
}

TEST_F(SRLRegistryScopes, EndIfTheDelegateIsGone) {
  registry->setScopeLifecycleDelegate(rt::make<Delegate>());
  EXPECT_FALSE(registry->scopeLifecycleDelegate());
  const Ref<SRLMemoizingScope> scope = registry->scopeWithTags(tags);
  registry->removeScopesWithTag(account);
  EXPECT_NE(registry->scopeWithTags(tags), scope);
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);
  registry->setScopeLifecycleDelegate(nullptr);
  registry->removeScopesWithTag(account);
  EXPECT_THAT(delegate->tags, IsEmpty());
}

TEST_F(SRLRegistryScopes, EndBeforeTheDelegateIsReadAgain) {
  Ref<Delegate> late = rt::make<Delegate>();
  registry->scopeWithTags(tagSet(account))->instanceForIdentifier(this, nullptr, [&] {
    return rt::make<Farewell>([&] { registry->setScopeLifecycleDelegate(late); });
  });
  registry->removeScopesWithTag(account);
  EXPECT_THAT(late->tags, ElementsAre(account));
  EXPECT_EQ(late->instanceCount, 0U);

  registry->scopeWithTags(tagSet(account))->instanceForIdentifier(this, nullptr, [&] {
    return rt::make<Farewell>([&] { late = nullptr; });
  });
  registry->removeScopesWithTag(account);
  EXPECT_FALSE(late);
}

TEST_F(SRLRegistryScopes, EndWithTheLockReleased) {
  Ref<rt::Object> found;
  const auto ask = [&] { found = registry->internalService(&scopedAPI, tags); };
  const Ref<rt::Object> tag = rt::make<Farewell>([] {});
  // Both an instance and a tag request a service while they are destroyed.
  registry->scopeWithTags(tagSet(tag, rt::make<Farewell>(ask)))->instanceForIdentifier(this, nullptr, [&] {
    return rt::make<Farewell>(ask);
  });
  registry->removeScopesWithTag(tag);
  EXPECT_TRUE(found);
}

TEST_F(SRLRegistryScopes, DoNotEndForANullTag) {
  const Ref<SRLMemoizingScope> scope = registry->scopeWithTags({});
  registry->removeScopesWithTag(nullptr);
  EXPECT_THAT(reportsOf("-[SRLRegistry removeScopesWithTag:]"), ElementsAre("tag cannot be nil!"));
  EXPECT_EQ(registry->scopeWithTags({}), scope);
}

class SRLRegistryByIdentifier : public ServicesTest {
 protected:
  const Ref<SRLScopeTagSetCodableWrapper> wrapper = SRLScopeTagSetCodableWrapper::initWithTagSet(tags);
  const Ref<SRLScopeTagSetCodableWrapper> empty = SRLScopeTagSetCodableWrapper::initWithTagSet({});
};

TEST_F(SRLRegistryByIdentifier, FindsTheSameServices) {
  EXPECT_EQ(registry->eg_internalService("Scoped"_s, wrapper), registry->internalService(&scopedAPI, tags));
  EXPECT_EQ(registry->eg_internalOptionalService("Scoped"_s, wrapper),
            registry->internalService(&scopedAPI, tags));
  EXPECT_FALSE(registry->eg_internalOptionalService("Unbound"_s, empty));
  EXPECT_EQ(registry->eg_internalMultiBoundService("NoneOfMany"_s, empty)->count(), 0U);
  EXPECT_TRUE(registry->eg_internalHasImplementationForService("Scoped"_s));
  EXPECT_FALSE(registry->eg_internalHasImplementationForService("Unbound"_s));
  EXPECT_THAT(reports.texts(), IsEmpty());
  EXPECT_EQ(registry->eg_internalMultiBoundService("Many"_s, wrapper)->count(), 2U);
}

TEST_F(SRLRegistryByIdentifier, ReportsMissingTags) {
  const auto missing = ElementsAre("Missing tag set for service:\nScoped.");
  EXPECT_FALSE(registry->eg_internalService("Scoped"_s, nullptr));
  EXPECT_THAT(reportsOf("-[SRLRegistry eg_internalService:scopeTags:]"), missing);
  EXPECT_FALSE(registry->eg_internalOptionalService("Scoped"_s, nullptr));
  EXPECT_THAT(reportsOf("-[SRLRegistry eg_internalOptionalService:scopeTags:]"), missing);
  EXPECT_FALSE(registry->eg_internalMultiBoundService("Scoped"_s, nullptr));
  EXPECT_THAT(reportsOf("-[SRLRegistry eg_internalMultiBoundService:scopeTags:]"), missing);
}

TEST_F(SRLRegistryByIdentifier, ReportsUnknownIdentifiersOfRequiredServices) {
  EXPECT_FALSE(registry->eg_internalService("Unknown"_s, wrapper));
  EXPECT_THAT(reportsOf("-[SRLRegistry eg_internalService:scopeTags:]"), ElementsAre("Unknown API Unknown"));
  EXPECT_FALSE(registry->eg_internalHasImplementationForService("Unknown"_s));
  EXPECT_THAT(reportsOf("-[SRLRegistry eg_internalHasImplementationForService:]"),
              ElementsAre("Unknown API Unknown"));
  EXPECT_FALSE(registry->eg_internalOptionalService("Unknown"_s, wrapper));
  const Ref<rt::Array> none = registry->eg_internalMultiBoundService("Unknown"_s, wrapper);
  ASSERT_TRUE(none);
  EXPECT_TRUE(none->isEmpty());
  EXPECT_THAT(reports.texts(), IsEmpty());
}

// Missing tags are found before the identifier is looked up.
TEST_F(SRLRegistryByIdentifier, ReportsOnlyMissingTagsForAnUnknownIdentifier) {
  EXPECT_FALSE(registry->eg_internalService("Unknown"_s, nullptr));
  EXPECT_FALSE(registry->eg_internalOptionalService("Unknown"_s, nullptr));
  EXPECT_FALSE(registry->eg_internalMultiBoundService("Unknown"_s, nullptr));
  const char* const missing = "Missing tag set for service:\nUnknown.";
  EXPECT_THAT(reports.texts(), ElementsAre(missing, missing, missing));
}

TEST_F(SRLRegistryByIdentifier, ReportsANullIdentifier) {
  EXPECT_FALSE(registry->eg_internalService(nullptr, wrapper));
  EXPECT_THAT(reports.texts(), ElementsAre("apiIdentifierString must not be nil", "Unknown API (null)"));
}

TEST_F(SRLRegistryByIdentifier, ReportsMoreThanFourTags) {
  const Ref<rt::Object> tag = rt::Number::of(1);
  const auto five = SRLScopeTagSetCodableWrapper::initWithTags(rt::Array::of(tag, tag, tag, tag, tag));
  EXPECT_TRUE(registry->eg_internalService("Global"_s, five));
  EXPECT_THAT(reports.texts(), ElementsAre("SRLScopeTagSet only supports up to 4 tags, but received 5."));
}

TEST_F(SRLRegistryByIdentifier, DoesNotRetainTagsAfterTheRequest) {
  Ref<rt::Object> tag = rt::make<Farewell>([] {});
  const rt::Weak<rt::Object> weak = tag;
  registry->eg_internalService("Fresh"_s, SRLScopeTagSetCodableWrapper::initWithTagSet(tagSet(tag, window)));
  tag = nullptr;
  EXPECT_FALSE(weak.lock());
}

// The tags of a request by identifier. This is the only reference to them, and the request's callbacks drop
// it.
Ref<SRLScopeTagSetCodableWrapper> onlyTags;
const Ref<SRLScopeTagSetCodableWrapper>& newTags(std::size_t count = 1) {
  std::vector<Ref<rt::Object>> tags;
  while (tags.size() < count) tags.emplace_back(rt::String::fromUTF8("tag, and only here").object());
  onlyTags = SRLScopeTagSetCodableWrapper::initWithTags(rt::make<rt::Array>(std::move(tags)));
  return onlyTags;
}

Ref<rt::Object> makeAndDropTags(SRLScopeTagSet given) {
  onlyTags = nullptr;
  EXPECT_TRUE(given.tags[0] == nullptr || rt::String::from(given.tags[0]) == "tag, and only here");
  return rt::make<Thing>(SRLScopeTagSet{});
}
Ref<SRLInstanceType> typeAndDropTags(const SRLAPIRegistrationData* /*api*/) {
  onlyTags = nullptr;
  return SRLClassType::initWithClass(&rt::classInfo<Thing>());
}

TEST_F(SRLRegistryByIdentifier, RetainsTheTagsDuringTheRequest) {
  static constexpr SRLImplementationRegistrationData freshly{.identifier = "Freshly",
                                                             .instanceType = {.className = "Thing"},
                                                             .factory = makeAndDropTags,
                                                             .scopeType = 0b1,
                                                             .lifetime = 1};
  static constexpr SRLImplementationRegistrationData once{
      .identifier = "Once", .instanceType = {.className = "Thing"}, .factory = makeThing, .scopeType = 0b1};
  static constexpr Implementations freshlyList[] = {&freshly, nullptr};
  static constexpr Implementations onceList[] = {&once, nullptr};
  static constexpr SRLAPIRegistrationData one{
      .identifier = "One", .instanceType = kThingType, .scopeType = 0b1, .identifierLength = 3};
  static constexpr SRLAPIRegistrationData many{.identifier = "Many",
                                               .instanceType = kThingType,
                                               .scopeType = 0b1,
                                               .identifierLength = 4,
                                               .isMultibound = 1};
  static constexpr SRLAPIRegistrationData first{.identifier = "First",
                                                .instanceType = {.function = typeAndDropTags},
                                                .scopeType = 0b1,
                                                .identifierLength = 5,
                                                .instanceTypeKind = SRLInstanceTypeKindFunction};
  static constexpr _SRLBindingRegistrationData bindings[] = {
      {&one, freshlyList}, {&many, freshlyList}, {&first, onceList}};
  static_assert(SRLAreBindingsSorted(bindings));
  const SRLBindingsModuleData module{.bindingsBegin = std::begin(bindings),
                                     .bindingsEnd = std::end(bindings)};
  const Ref<SRLRegistry> other = SRLRegistry::initPrivate();
  other->internalRegisterBindings(std::array{&module});
  SRLRegistry::setSharedInstance(other);

  // The factory drops the tags. In the first request for an API, the function of its type does, too.
  EXPECT_TRUE(other->eg_internalService("One"_s, newTags()));
  EXPECT_TRUE(other->eg_internalOptionalService("One"_s, newTags()));
  EXPECT_EQ(other->eg_internalMultiBoundService("Many"_s, newTags())->count(), 1U);
  EXPECT_FALSE(onlyTags);
  EXPECT_TRUE(other->eg_internalService("First"_s, newTags()));
  EXPECT_TRUE(other->mutableCopy()->eg_internalOptionalService("First"_s, newTags()));
  EXPECT_THAT(reports.texts(), IsEmpty());
  // Here the request reports too many tags before the factory drops them.
  EXPECT_TRUE(other->eg_internalService("One"_s, newTags(5)));
  EXPECT_EQ(reports.texts().size(), 2U);
  onlyTags = nullptr;
}

}  // namespace
