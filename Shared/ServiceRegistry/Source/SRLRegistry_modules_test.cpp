// What a registry takes from bindings modules, and how it finds bindings there.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <deque>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/TestBindings.h"
#include "tests/support/WholeReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ElementsAre;
using testing::IsEmpty;
using Bindings = std::vector<const _SRLBindingRegistrationData*>;

constexpr const char* kFile = "Shared/ServiceRegistry/Source/SRLRegistry";

SRLAPIRegistrationData apiNamed(const std::string& identifier) {
  return {.identifier = identifier.c_str(),
          .identifierLength = static_cast<std::uint16_t>(identifier.size())};
}

Bindings bindingsOf(const SRLAPIRegistrationData& api, const Ref<SRLRegistry>& registry) {
  const rt::LockGuard guard(*registry->lock());
  return registry->registrationDatasForAPI(&api);
}

// The identifiers of configurations. `made` lists the factories that have run.
const int first = 0;
const int second = 0;
const int third = 0;
std::vector<std::string> made;

template <class Configuration>
Ref<rt::Object> note(const char* who) {
  made.emplace_back(who);
  return rt::make<Configuration>();
}

class SRLRegistryConfigurations : public testing::Test {
 protected:
  SRLRegistryConfigurations() { made.clear(); }

  static void addOnes(SRLConfigurationFactories& factories) {
    factories[&first] = [] { return note<TestStone>("first of one"); };
    factories[&second] = [] { return note<TestStone>("second of one"); };
  }
  static void addOthers(SRLConfigurationFactories& factories) {
    // Each module gets a table of its own.
    EXPECT_TRUE(factories.empty());
    factories[&second] = [] { return note<TestSundial>("second of other"); };
    factories[&third] = [] { return note<TestSundial>("third of other"); };
  }

  const TestModule one_{{}, addOnes};
  const TestModule none_{{}};
  const TestModule other_{{}, addOthers};
};

TEST_F(SRLRegistryConfigurations, ComeFromTheFirstModuleThatHasThem) {
  TestReports reports;
  const Ref<SRLRegistry> registry = registryWith({&one_, &none_, &other_});
  EXPECT_THAT(made, IsEmpty());
  const auto isStone = [&](const void* identifier) {
    return rt::cast<TestStone>(registry->internalImplementationConfigForIdentifier(identifier).get()) !=
           nullptr;
  };
  EXPECT_TRUE(isStone(&second));
  EXPECT_TRUE(isStone(&first));
  EXPECT_FALSE(isStone(&third));
  EXPECT_THAT(made, ElementsAre("second of one", "first of one", "third of other"));
  EXPECT_THAT(wholeReports(reports), IsEmpty());
}

TEST_F(SRLRegistryConfigurations, DependOnTheOrderOfTheModules) {
  registryWith({&other_, &one_})->internalImplementationConfigForIdentifier(&second);
  EXPECT_THAT(made, ElementsAre("second of other"));
}

TEST_F(SRLRegistryConfigurations, AreMadeOnceForEachRegistry) {
  const Ref<SRLRegistry> registry = registryWith({&one_});
  const Ref<rt::Object> configuration = registry->internalImplementationConfigForIdentifier(&first);
  ASSERT_NE(configuration, nullptr);
  EXPECT_EQ(registry->internalImplementationConfigForIdentifier(&first), configuration);
  EXPECT_THAT(made, ElementsAre("first of one"));
  EXPECT_NE(registryWith({&one_})->internalImplementationConfigForIdentifier(&first), configuration);
  EXPECT_THAT(made, ElementsAre("first of one", "first of one"));
}

TEST_F(SRLRegistryConfigurations, AreNullIfNoModuleHasThem) {
  TestReports reports;
  const Ref<SRLRegistry> registry = registryWith({&one_});
  EXPECT_EQ(registry->internalImplementationConfigForIdentifier(&third), nullptr);
  EXPECT_EQ(registry->internalImplementationConfigForIdentifier(nullptr), nullptr);
  EXPECT_THAT(wholeReports(reports), IsEmpty());
}

TEST_F(SRLRegistryConfigurations, CanBeRequestedWithTheLockHeld) {
  const Ref<SRLRegistry> registry = registryWith({&one_});
  const rt::LockGuard guard(*registry->lock());
  EXPECT_NE(registry->internalImplementationConfigForIdentifier(&first), nullptr);
}

// A factory for an address that an earlier module has used is released.
TEST_F(SRLRegistryConfigurations, ReleaseFactoriesThatAreNotUsed) {
  static std::weak_ptr<int> kept;
  static std::weak_ptr<int> dropped;
  const TestModule late({}, [](SRLConfigurationFactories& factories) {
    const auto mine = std::make_shared<int>();
    const auto taken = std::make_shared<int>();
    kept = mine;
    dropped = taken;
    factories[&third] = [mine] { return rt::make<TestStone>(); };
    factories[&first] = [taken] { return rt::make<TestStone>(); };
  });
  Ref<SRLRegistry> registry = registryWith({&one_, &late});
  EXPECT_TRUE(dropped.expired());
  EXPECT_FALSE(kept.expired());
  registry = nullptr;
  EXPECT_TRUE(kept.expired());
}

// A module's callback requests services.
TEST(SRLRegistryRegistration, IsInProgressDuringTheCallbacksOfModules) {
  TestReports reports;
  static Ref<SRLRegistry> registry;
  registry = SRLRegistry::initPrivate();
  const TestModule module({{&testClockAPI, testWallClocks}, {&testClocksAPI, testWallClocks}},
                          [](SRLConfigurationFactories&) {
                            EXPECT_EQ(registry->internalService(&testClockAPI, {}), nullptr);
                            EXPECT_EQ(registry->internalOptionalService(&testClockAPI, {}), nullptr);
                            EXPECT_EQ(registry->internalMultiBoundService(&testClocksAPI, {}), nullptr);
                            // A module's bindings are added after its configurations.
                            EXPECT_TRUE(registry->registeredAPIIdentifiers()->isEmpty());
                          });
  const SRLBindingsModuleData* const modules[] = {module.data()};
  registry->internalRegisterBindings(modules);
  const std::string prior = "A service injector was called prior to service bindings being registered.\n\n";
  EXPECT_THAT(
      wholeReports(reports),
      ElementsAre(
          WholeReport{
              kFile, "-[SRLRegistry internalService:scopeTags:]", prior + "Service: Clock", {"Clock"}},
          WholeReport{kFile,
                      "-[SRLRegistry internalOptionalService:scopeTags:]",
                      prior + "Service: Clock",
                      {"Clock"}},
          WholeReport{kFile,
                      "-[SRLRegistry internalMultiBoundService:scopeTags:]",
                      prior + "Service: Clocks",
                      {"Clocks"}}));
  // The same requests succeed now.
  EXPECT_NE(registry->internalService(&testClockAPI,
                                      SRLScopeTagSetCreateWithTags(rt::Array::of("a"_s, "b"_s).get())),
            nullptr);
  EXPECT_EQ(countBoundTo(testClocksAPI, registry), 1);
  EXPECT_THAT(wholeReports(reports), IsEmpty());
  registry = nullptr;
}

// The API's type is given by a function, which must not run before a request for the API.
TEST(SRLRegistryRegistration, DoesNotReadBindings) {
  TestReports reports;
  static int calls;
  calls = 0;
  const SRLAPIRegistrationData api{
      .identifier = "API",
      .instanceType = {.function =
                           [](const SRLAPIRegistrationData*) {
                             ++calls;
                             return Ref<SRLInstanceType>(
                                 SRLClassType::initWithClass(&rt::classInfo<TestWallClock>()));
                           }},
      .identifierLength = 3,
      .instanceTypeKind = SRLInstanceTypeKindFunction};
  const TestModule module({{&api, testWallClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  EXPECT_TRUE(registry->registeredAPIIdentifiers()->contains("API"_s));
  EXPECT_EQ(calls, 0);
  EXPECT_NE(boundTo(api, registry), nullptr);
  EXPECT_EQ(calls, 1);
  EXPECT_NE(boundTo(api, registry), nullptr);
  EXPECT_EQ(calls, 1);
  EXPECT_THAT(wholeReports(reports), IsEmpty());
}

TEST(SRLRegistrationDatasForAPI, AreInTheOrderOfTheModules) {
  const TestModule one({{&testClockAPI, testWallClocks}, {&testClocksAPI, testWallClocks}});
  const TestModule without({{&testClocksAPI, testWallClocks}});
  const TestModule empty({});
  const TestModule other({{&testClockAPI, testSundials}});
  EXPECT_THAT(bindingsOf(testClockAPI, registryWith({&one, &without, &empty, &other})),
              ElementsAre(one.bindings().data(), other.bindings().data()));
  EXPECT_THAT(bindingsOf(testClockAPI, registryWith({&other, &without, &one})),
              ElementsAre(other.bindings().data(), one.bindings().data()));
  EXPECT_THAT(bindingsOf(testClockAPI, registryWith({&without, &empty})), IsEmpty());
  EXPECT_THAT(bindingsOf(testClockAPI, registryWith({})), IsEmpty());
  // A module that is registered twice counts as two.
  EXPECT_THAT(bindingsOf(testClockAPI, registryWith({&other, &other})),
              ElementsAre(other.bindings().data(), other.bindings().data()));
}

// The given record need not be the module's. Its `identifierLength` does not matter.
TEST(SRLRegistrationDatasForAPI, CompareTheTextOfTheIdentifier) {
  const TestModule module({{&testClockAPI, testWallClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  const std::string text = "Clock";
  SRLAPIRegistrationData api = apiNamed(text);
  EXPECT_THAT(bindingsOf(api, registry), ElementsAre(module.bindings().data()));
  api.identifierLength = 1;
  EXPECT_THAT(bindingsOf(api, registry), ElementsAre(module.bindings().data()));
}

TEST(SRLRegistrationDatasForAPI, CompareTheLengthBeforeTheBytes) {
  // By bytes alone, "B" would come after "AA".
  const std::string identifiers[] = {"", "B", "Z", "\xC3", "AA", "AB", "BA", "AAA"};
  std::vector<SRLAPIRegistrationData> apis;
  apis.reserve(std::size(identifiers));
  for (const std::string& identifier : identifiers) apis.push_back(apiNamed(identifier));
  std::vector<_SRLBindingRegistrationData> bindings;
  bindings.reserve(apis.size());
  for (const SRLAPIRegistrationData& api : apis) bindings.push_back({&api, testNoClocks});
  const TestModule module(bindings);
  const Ref<SRLRegistry> registry = registryWith({&module});
  for (std::size_t i = 0; i < apis.size(); ++i) {
    EXPECT_EQ(module.bindings()[i].api, &apis[i]);
    EXPECT_THAT(bindingsOf(apis[i], registry), ElementsAre(&module.bindings()[i])) << identifiers[i];
  }
  // Identifiers before, between and behind these, and some that only share a prefix with them.
  for (const std::string absent : {"A", "C", "\xC4", "A@", "AC", "ZZ", "AA@", "AAB", "AAAA"}) {
    EXPECT_THAT(bindingsOf(apiNamed(absent), registry), IsEmpty()) << absent;
  }
}

TEST(SRLRegistrationDatasForAPI, AgreeWithALinearSearch) {
  std::mt19937 random(20240229);  // the same at every run
  const auto below = [&random](std::size_t limit) {
    return std::uniform_int_distribution<std::size_t>(0, limit - 1)(random);
  };
  const auto identifier = [&below] {
    static constexpr std::string_view kLetters =
        "\x01\x7F\x80\xFF"
        "ab";
    std::string text(below(4), '\0');
    for (char& letter : text) letter = kLetters[below(kLetters.size())];
    return text;
  };
  for (int round = 0; round < 200; ++round) {
    std::deque<std::string> texts;
    std::deque<SRLAPIRegistrationData> apis;
    std::deque<TestModule> modules;
    std::vector<const SRLBindingsModuleData*> datas;
    for (std::size_t count = below(4); count > 0; --count) {
      std::set<std::string> unique;
      for (std::size_t i = below(40); i > 0; --i) unique.insert(identifier());
      std::vector<_SRLBindingRegistrationData> bindings;
      bindings.reserve(unique.size());
      for (const std::string& text : unique) {
        bindings.push_back({&apis.emplace_back(apiNamed(texts.emplace_back(text))), testNoClocks});
      }
      const TestModule& module = modules.emplace_back(std::move(bindings));
      ASSERT_TRUE(SRLAreBindingsSorted(module.bindings()));
      datas.push_back(module.data());
    }
    const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
    registry->internalRegisterBindings(datas);
    for (int i = 0; i < 50; ++i) {
      const std::string text = identifier();
      Bindings expected;
      for (const TestModule& module : modules) {
        for (const _SRLBindingRegistrationData& binding : module.bindings()) {
          if (text == binding.api->identifier) expected.push_back(&binding);
        }
      }
      EXPECT_EQ(bindingsOf(apiNamed(text), registry), expected) << testing::PrintToString(text);
    }
  }
}

// The first answer in a process holds for all registries. So each case runs in a process of its own.
class SRLRegistryMultipleModulesDeathTest : public testing::Test {
 protected:
  static bool answerOf(std::initializer_list<const TestModule*> modules) {
    return registryWith(modules)->multipleBindingsModulesAllowed();
  }
  // Ends the process, with status 0 if `isRight`.
  [[noreturn]] static void exitWith(bool isRight) { std::exit(isRight ? 0 : 1); }

  const TestModule allowing_{{}, nullptr, 1};
  const TestModule allowingToo_{{}, nullptr, 0x80};
  const TestModule forbidding_{{}, nullptr, 0};
};

TEST_F(SRLRegistryMultipleModulesDeathTest, AreAllowedWithoutModules) {
  EXPECT_EXIT(exitWith(answerOf({})), testing::ExitedWithCode(0), "");
}

TEST_F(SRLRegistryMultipleModulesDeathTest, AreAllowedIfAllModulesAllowThem) {
  EXPECT_EXIT(exitWith(answerOf({&allowing_, &allowingToo_})), testing::ExitedWithCode(0), "");
}

TEST_F(SRLRegistryMultipleModulesDeathTest, AreForbiddenIfOneModuleForbidsThem) {
  EXPECT_EXIT(exitWith(!answerOf({&allowing_, &forbidding_})), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(exitWith(!answerOf({&forbidding_, &allowing_})), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(exitWith(!answerOf({&forbidding_})), testing::ExitedWithCode(0), "");
}

TEST_F(SRLRegistryMultipleModulesDeathTest, KeepTheFirstAnswer) {
  EXPECT_EXIT(exitWith(answerOf({}) && answerOf({&forbidding_}) &&
                       SRLRegistry::sharedInstance()->multipleBindingsModulesAllowed()),
              testing::ExitedWithCode(0), "");
  EXPECT_EXIT(exitWith(!answerOf({&forbidding_}) && !answerOf({&allowing_}) && !answerOf({})),
              testing::ExitedWithCode(0), "");
}

// The generator's own byte stands before the flag.
TEST_F(SRLRegistryMultipleModulesDeathTest, IgnoreTheGeneratorsFlag) {
  const auto answer = [](std::uint8_t generatorFlag, std::uint8_t allowsMultipleModules) {
    const SRLBindingsModuleData data{.generatorFlag = generatorFlag,
                                     .allowsMultipleModules = allowsMultipleModules};
    const SRLBindingsModuleData* const modules[] = {&data};
    const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
    registry->internalRegisterBindings(modules);
    return registry->multipleBindingsModulesAllowed();
  };
  EXPECT_EXIT(exitWith(!answer(1, 0)), testing::ExitedWithCode(0), "");
  EXPECT_EXIT(exitWith(answer(0, 1)), testing::ExitedWithCode(0), "");
}

TEST_F(SRLRegistryMultipleModulesDeathTest, CanBeAskedAboutWithTheLockHeld) {
  const auto ask = [] {
    const Ref<SRLRegistry> registry = registryWith({});
    const rt::LockGuard guard(*registry->lock());
    return registry->multipleBindingsModulesAllowed();
  };
  EXPECT_EXIT(exitWith(ask()), testing::ExitedWithCode(0), "");
}

}  // namespace
