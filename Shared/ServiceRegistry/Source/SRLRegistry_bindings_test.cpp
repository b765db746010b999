// The registration of bindings: which are accepted, and which are refused.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/Entities/InstanceType/SRLProtocolType.h"
#include "tests/support/TestBindings.h"
#include "tests/support/WholeReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr const char* kFile = "Shared/ServiceRegistry/Source/SRLRegistry";
constexpr const char* kService = "-[SRLRegistry internalRegisterServiceAPI:toImplementation:]";
constexpr const char* kSingle =
    "-[SRLRegistry internalRegisterImplementation:forSingleboundAPI:allowOverridingExistingBinding:]";
constexpr const char* kMulti = "-[SRLRegistry internalRegisterImplementation:forMultiboundAPI:]";

std::string textOf(const Ref<SRLImplementation>& implementation) {
  return std::string(implementation->description().view());
}

WholeReport incompatible(const std::string& implementation, const std::string& api) {
  return {kFile,
          kService,
          "Implementation " + implementation + " should conform to " + api,
          {implementation, api}};
}
WholeReport alreadyRegistered(const std::string& existing, const std::string& added) {
  return {kFile,
          kSingle,
          "Service API is already registered\nService API: Clock\nExisting binding implementation: " +
              existing + "\nNew binding implementation: " + added,
          {"Clock", existing, added}};
}

class SRLRegistryBindings : public testing::Test {
 protected:
  void bind(const SRLAPIRegistrationData* api, const Ref<SRLImplementation>& implementation) {
    const rt::LockGuard guard(*registry_->lock());
    registry_->internalRegisterServiceAPI(api, implementation);
  }
  void bindSingle(const Ref<SRLImplementation>& implementation, const SRLAPIRegistrationData* api,
                  bool allowOverriding) {
    const rt::LockGuard guard(*registry_->lock());
    registry_->internalRegisterImplementation(implementation, api, allowOverriding);
  }
  void bindMulti(const Ref<SRLImplementation>& implementation, const SRLAPIRegistrationData* api) {
    const rt::LockGuard guard(*registry_->lock());
    registry_->internalRegisterImplementation(implementation, api);
  }
  void registerBindings(const _SRLBindingRegistrationData& binding) {
    const rt::LockGuard guard(*registry_->lock());
    registry_->registerBindings(binding);
  }
  Ref<SRLImplementation> bound() const { return boundTo(testClockAPI, registry_); }

  TestReports reports_;
  Ref<SRLRegistry> registry_ = SRLRegistry::initPrivate();
};

TEST_F(SRLRegistryBindings, AreMadeFromTheirRecords) {
  registerBindings({&testClockAPI, testSundials});
  const Ref<SRLImplementation> implementation = bound();
  ASSERT_NE(implementation, nullptr);
  EXPECT_TRUE(rt::isEqual(implementation, implementationOf<TestSundial>("TestSundial")));
  EXPECT_EQ(implementation->lifetime(), 1U);
  EXPECT_EQ(implementation->configuration(), nullptr);
  const Ref<rt::Array> tags = rt::Array::of("a"_s, "b"_s);
  bool isCreated = false;
  const Ref<rt::Object> instance =
      implementation->factoryBlock()(SRLScopeTagSetCreateWithTags(tags.get()), &isCreated);
  EXPECT_NE(rt::cast<TestSundial>(instance.get()), nullptr);
  EXPECT_TRUE(isCreated);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, CarryTheFieldsOfTheirRecords) {
  static SRLScopeTagSet received;
  const SRLImplementationRegistrationData record{
      .identifier = "implementation",
      .instanceType = {.className = "TestSundial"},
      .configInstanceType = {.className = "TestStone"},
      .factory = [](SRLScopeTagSet tags) -> Ref<rt::Object> {
        received = tags;
        return rt::make<TestSundial>();
      },
      .scopeType = 0b10,
      .hasConfiguration = 1,
      .isConfigurationRequired = 1,
  };
  TestImplementations records[] = {&record, nullptr};
  registerBindings({&testClockAPI, records});
  const Ref<SRLImplementation> implementation = bound();
  ASSERT_NE(implementation, nullptr);
  EXPECT_EQ(implementation->lifetime(), 0U);
  EXPECT_EQ(implementation->scopeType(), 0b10U);
  ASSERT_NE(implementation->configuration(), nullptr);
  EXPECT_TRUE(implementation->configuration()->isRequired());
  EXPECT_EQ(implementation->configuration()->instanceType()->asObject()->description(), "TestStone");
  EXPECT_THAT(textOf(implementation),
              testing::HasSubstr(", identifier: implementation, instanceType: TestSundial,"));
  // The factory gets the tags of the implementation's scope, and runs once for this scope.
  const Ref<rt::Array> tags = rt::Array::of("one"_s, "two"_s);
  const Ref<rt::Array> scope = rt::Array::of("two"_s);
  const SRLScopeTagSet set = SRLScopeTagSetCreateWithTags(tags.get());
  const Ref<rt::Object> instance = implementation->factoryBlock()(set, nullptr);
  ASSERT_NE(instance, nullptr);
  EXPECT_TRUE(SRLScopeTagSetEqual(received, SRLScopeTagSetCreateWithTags(scope.get())));
  EXPECT_EQ(implementation->factoryBlock()(set, nullptr), instance);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
  SRLRegistry::sharedInstance()->removeScopesWithTag("two"_s);
}

// The configuration is made first, then the implementation's type, and then the API's type.
TEST_F(SRLRegistryBindings, MakeTheirPartsInOrder) {
  const SRLImplementationRegistrationData record{
      .identifier = "implementation",
      .instanceType = {.className = "NoSuchClass"},
      .configInstanceType = {.className = "NoSuchConfiguration"},
      .factory = makeTestService<TestSundial>,
      .lifetime = 1,
      .hasConfiguration = 1,
  };
  TestImplementations records[] = {&record, nullptr};
  registerBindings({&testClockAPI, records});
  EXPECT_THAT(reports_.texts(), ElementsAre("SRLClassType's concreteClass must not be nil.",
                                            "SRLImplementationConfiguration requires a non-nil instanceType.",
                                            "SRLClassType's concreteClass must not be nil."));
  // An implementation without a type fits every API.
  ASSERT_NE(bound(), nullptr);
  EXPECT_EQ(bound()->instanceType(), nullptr);
  EXPECT_EQ(bound()->configuration(), nullptr);
}

TEST_F(SRLRegistryBindings, OfAMultiBoundAPIAreAllRegistered) {
  registerBindings({&testClocksAPI, testBothClocks});
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 2);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

// Implementations after a refused one are registered.
TEST_F(SRLRegistryBindings, ContinueAfterARefusedOne) {
  TestImplementations records[] = {&testStone, &testSundial, &testWallClock, nullptr};
  registerBindings({&testClockAPI, records});
  ASSERT_NE(bound(), nullptr);
  EXPECT_EQ(bound()->instanceType()->asObject()->description(), "TestSundial");
  const std::vector<WholeReport> reports = wholeReports(reports_);
  ASSERT_EQ(reports.size(), 2U);
  EXPECT_EQ(reports[0], incompatible("TestStone", "id<TestClock>"));
  EXPECT_EQ(reports[1], alreadyRegistered(textOf(bound()), reports[1].parameters.at(2)));
}

TEST_F(SRLRegistryBindings, ThatAreEmptyUnbindASingleBoundAPI) {
  const TestModule module({{&testClockAPI, testWallClocks}});
  registry_ = registryWith({&module});
  ASSERT_NE(bound(), nullptr);
  registerBindings({&testClockAPI, testNoClocks});
  // The API is known. Otherwise it would be looked up in the module.
  EXPECT_EQ(bound(), nullptr);
  EXPECT_EQ(bound(), nullptr);
  // An empty binding does not prevent a later one.
  registerBindings({&testClockAPI, testSundials});
  EXPECT_NE(bound(), nullptr);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, ThatAreEmptyReleaseTheImplementation) {
  registerBindings({&testClockAPI, testWallClocks});
  const rt::Weak<SRLImplementation> weak = bound();
  ASSERT_NE(weak.lock(), nullptr);
  registerBindings({&testClockAPI, testNoClocks});
  EXPECT_EQ(weak.lock(), nullptr);
}

TEST_F(SRLRegistryBindings, ThatAreEmptyMakeAnEmptySetOrKeepTheExistingOne) {
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), -1);
  registerBindings({&testClocksAPI, testNoClocks});
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 0);
  registerBindings({&testClocksAPI, testBothClocks});
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 2);
  registerBindings({&testClocksAPI, testNoClocks});
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 2);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, AreRegisteredIfAModuleHasTheAPI) {
  const TestModule one({{&testClockAPI, testNoClocks}});
  const TestModule other({{&testClocksAPI, testSundials}});
  const Ref<SRLRegistry> registry = registryWith({&one, &other});
  const rt::LockGuard guard(*registry->lock());
  // An empty binding counts, too.
  EXPECT_TRUE(registry->lazilyRegisterBindingsForAPI(&testClockAPI));
  EXPECT_TRUE(registry->lazilyRegisterBindingsForAPI(&testClocksAPI));
  const SRLAPIRegistrationData unknown{.identifier = "Unknown", .identifierLength = 7};
  EXPECT_FALSE(registry->lazilyRegisterBindingsForAPI(&unknown));
}

TEST_F(SRLRegistryBindings, ComeFromTheFirstOfTwoModules) {
  const TestModule one({{&testClockAPI, testWallClocks}});
  const TestModule other({{&testClockAPI, testSundials}});
  registry_ = registryWith({&one, &other});
  ASSERT_NE(bound(), nullptr);
  EXPECT_EQ(bound()->instanceType()->asObject()->description(), "TestWallClock");
  const std::vector<WholeReport> reports = wholeReports(reports_);
  ASSERT_EQ(reports.size(), 1U);
  EXPECT_EQ(reports[0], alreadyRegistered(textOf(bound()), reports[0].parameters.at(2)));
  EXPECT_THAT(reports[0].parameters.at(2), testing::HasSubstr("identifier: TestSundial"));
}

TEST_F(SRLRegistryBindings, AreClearedByAnEmptyBindingOfALaterModule) {
  const TestModule one({{&testClockAPI, testWallClocks}, {&testClocksAPI, testWallClocks}});
  const TestModule nothing({{&testClockAPI, testNoClocks}, {&testClocksAPI, testNoClocks}});
  registry_ = registryWith({&one, &nothing});
  EXPECT_EQ(bound(), nullptr);
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 1);
  registry_ = registryWith({&nothing, &one});
  EXPECT_NE(bound(), nullptr);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, OfAMultiBoundAPIComeFromAllModules) {
  const TestModule one({{&testClocksAPI, testWallClocks}});
  const TestModule other({{&testClocksAPI, testBothClocks}});
  // Both modules bind the wall clock, which counts once.
  EXPECT_EQ(countBoundTo(testClocksAPI, registryWith({&one, &other})), 2);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, NeedAnAPIAndAnImplementation) {
  bind(nullptr, implementationOf<TestWallClock>("clock"));
  EXPECT_THAT(wholeReports(reports_), ElementsAre(WholeReport{kFile, kService, "apiData cannot be nil!"}));
  bind(&testClockAPI, nullptr);
  EXPECT_THAT(wholeReports(reports_),
              ElementsAre(WholeReport{kFile, kService, "implMetadata cannot be nil!"}));
  // A null API is reported first.
  bind(nullptr, nullptr);
  EXPECT_THAT(wholeReports(reports_), ElementsAre(WholeReport{kFile, kService, "apiData cannot be nil!"}));
  EXPECT_EQ(bound(), nullptr);
}

TEST_F(SRLRegistryBindings, NeedAClassOfTheAPIsType) {
  bind(&testClockAPI, implementationOf<TestStone>("stone"));
  EXPECT_THAT(wholeReports(reports_), ElementsAre(incompatible("TestStone", "id<TestClock>")));
  EXPECT_EQ(bound(), nullptr);
  bind(&testClocksAPI, implementationOf<TestStone>("stone"));
  EXPECT_THAT(wholeReports(reports_), ElementsAre(incompatible("TestStone", "id<TestClock>")));
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), -1);
}

TEST_F(SRLRegistryBindings, NeedAnAPIWithAType) {
  SRLAPIRegistrationData api = testClockAPI;
  api.instanceType.names.protocolName = "NoSuchProtocol";
  bind(&api, implementationOf<TestWallClock>("clock"));
  const std::vector<WholeReport> reports = wholeReports(reports_);
  ASSERT_EQ(reports.size(), 2U);
  EXPECT_EQ(reports[0].text, "Either instanceClass or instanceProtocol must be provided.");
  EXPECT_EQ(reports[1], incompatible("TestWallClock", "(null)"));
  EXPECT_EQ(boundTo(api, registry_), nullptr);
}

// Only a class can be checked for conformance.
TEST_F(SRLRegistryBindings, OfTypesOtherThanClassesAreNotChecked) {
  struct Unrelated : rt::Protocol<Unrelated> {
   protected:
    ~Unrelated() = default;
  };
  const Ref<SRLImplementation> implementation =
      implementationOf("clock", SRLProtocolType::initWithProtocol(&rt::protocolInfo<Unrelated>()));
  bind(&testClockAPI, implementation);
  EXPECT_EQ(bound(), implementation);
  bind(&testClocksAPI, implementationOf("clock", nullptr));
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 1);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, NeedASubsetOfTheAPIsScope) {
  for (const SRLScopeType scope : {0b100U, 0b101U, 0b111U, 0x80000000U}) {
    const Ref<SRLImplementation> implementation = implementationOf<TestWallClock>("clock", scope);
    bind(&testClockAPI, implementation);
    EXPECT_THAT(
        wholeReports(reports_),
        ElementsAre(WholeReport{kFile,
                                kService,
                                "Cannot bind a implementation to APIs that require a superset of scopes:\n"
                                "Implementation: " +
                                    textOf(implementation) + ",\nService API: Clock",
                                {textOf(implementation), "Clock"}}));
    EXPECT_EQ(bound(), nullptr);
  }
  for (const SRLScopeType scope : {0U, 0b01U, 0b10U, 0b11U}) {
    registry_ = SRLRegistry::initPrivate();
    bind(&testClockAPI, implementationOf<TestWallClock>("clock", scope));
    EXPECT_NE(bound(), nullptr) << scope;
  }
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

// An implementation with a wrong type and a wrong scope: the type is reported.
TEST_F(SRLRegistryBindings, AreCheckedForTypeBeforeScope) {
  bind(&testClockAPI, implementationOf<TestStone>("stone", 0b100));
  EXPECT_THAT(wholeReports(reports_), ElementsAre(incompatible("TestStone", "id<TestClock>")));
}

TEST_F(SRLRegistryBindings, OfASingleBoundAPIAreNotReplaced) {
  const Ref<SRLImplementation> first = implementationOf<TestWallClock>("first");
  const Ref<SRLImplementation> second = implementationOf<TestSundial>("second");
  bind(&testClockAPI, first);
  bind(&testClockAPI, second);
  EXPECT_THAT(wholeReports(reports_), ElementsAre(alreadyRegistered(textOf(first), textOf(second))));
  EXPECT_EQ(bound(), first);
  // Binding the same implementation again is reported, too.
  bindSingle(first, &testClockAPI, false);
  EXPECT_THAT(wholeReports(reports_), ElementsAre(alreadyRegistered(textOf(first), textOf(first))));
  EXPECT_EQ(bound(), first);
}

TEST_F(SRLRegistryBindings, OfASingleBoundAPIAreReplacedIfAllowed) {
  const Ref<SRLImplementation> first = implementationOf<TestWallClock>("first");
  const Ref<SRLImplementation> second = implementationOf<TestSundial>("second");
  bindSingle(first, &testClockAPI, true);
  EXPECT_EQ(bound(), first);
  bindSingle(second, &testClockAPI, true);
  EXPECT_EQ(bound(), second);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

TEST_F(SRLRegistryBindings, ToAnAPIOfTheWrongKindAreRefused) {
  const Ref<SRLImplementation> implementation = implementationOf<TestWallClock>("clock");
  for (const bool allowOverriding : {false, true}) {
    bindSingle(implementation, &testClocksAPI, allowOverriding);
    EXPECT_THAT(wholeReports(reports_),
                ElementsAre(WholeReport{kFile, kSingle, "Incorrect binding type for Clocks", {"Clocks"}}));
  }
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), -1);
  bindMulti(implementation, &testClockAPI);
  EXPECT_THAT(wholeReports(reports_),
              ElementsAre(WholeReport{kFile, kMulti, "Incorrect binding type for Clock", {"Clock"}}));
  EXPECT_EQ(bound(), nullptr);
}

TEST_F(SRLRegistryBindings, OfAMultiBoundAPIHoldEqualImplementationsOnce) {
  bindMulti(implementationOf<TestWallClock>("clock"), &testClocksAPI);
  bindMulti(implementationOf<TestWallClock>("clock"), &testClocksAPI);
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 1);
  bindMulti(implementationOf<TestWallClock>("another"), &testClocksAPI);
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 2);
  EXPECT_THAT(wholeReports(reports_), IsEmpty());
}

// The exception reaches the caller. The lock is released, and the tables are unchanged.
TEST_F(SRLRegistryBindings, AreUnchangedIfTheErrorCallbackThrows) {
  const TestModule one({{&testClockAPI, testWallClocks}});
  const TestModule other({{&testClockAPI, testSundials}});
  registry_ = registryWith({&one, &other});
  struct Thrown {};
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [](const Ref<PECErrorDescription>&) { throw Thrown(); });
  EXPECT_THROW(bound(), Thrown);
  ASSERT_NE(bound(), nullptr);
  EXPECT_EQ(bound()->instanceType()->asObject()->description(), "TestWallClock");
}

// An implementation whose hash throws is not added, and the API does not become known.
TEST_F(SRLRegistryBindings, AreRegisteredAgainAfterATypeHasThrown) {
  struct Thrown {};
  static bool isThrowing;
  class Type final : public rt::Implements<Type, rt::Object, SRLInstanceType> {
   public:
    bool doesRepresentSupertypeOfClass(const rt::ClassInfo&) const override { return false; }
    std::uint64_t hash() const override {
      if (isThrowing) throw Thrown();
      return 1;
    }
  };
  const SRLImplementationRegistrationData record{
      .identifier = "implementation",
      .instanceType = {.function = [](const SRLImplementationRegistrationData*) -> Ref<SRLInstanceType> {
        return rt::make<Type>();
      }},
      .factory = makeTestService<TestSundial>,
      .instanceTypeKind = SRLInstanceTypeKindFunction,
      .lifetime = 1};
  TestImplementations records[] = {&record, nullptr};
  const TestModule module({{&testClocksAPI, records}});
  registry_ = registryWith({&module});
  isThrowing = true;
  EXPECT_THROW(countBoundTo(testClocksAPI, registry_), Thrown);
  isThrowing = false;
  EXPECT_EQ(countBoundTo(testClocksAPI, registry_), 1);
}

}  // namespace
