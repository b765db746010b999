// Finding APIs by their protocol and by the text of their identifier.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <latch>
#include <string>
#include <thread>
#include <utility>
#include <vector>

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

const SRLAPIRegistrationData* apiOf(const rt::ProtocolInfo& protocol, const Ref<SRLRegistry>& registry) {
  const rt::LockGuard guard(*registry->lock());
  return registry->apiIdentifierForProtocol(&protocol);
}

Ref<SRLInstanceType> typeOf(const SRLAPIRegistrationData*) {
  return nullptr;
}

struct Unrelated : rt::Protocol<Unrelated> {
 protected:
  ~Unrelated() = default;
};

TEST(SRLAPIIdentifierForProtocol, FindsTheFirstAPIOfTheProtocolAlone) {
  const SRLAPIRegistrationData byFunction{.identifier = "a",
                                          .instanceType = {.function = typeOf},
                                          .identifierLength = 1,
                                          .instanceTypeKind = SRLInstanceTypeKindFunction};
  const SRLAPIRegistrationData withClass{
      .identifier = "b",
      .instanceType = {.names = {.protocolName = "TestClock", .className = "TestSundial"}},
      .identifierLength = 1};
  const SRLAPIRegistrationData ofClass{
      .identifier = "c", .instanceType = {.names = {.className = "TestClock"}}, .identifierLength = 1};
  const SRLAPIRegistrationData longer{
      .identifier = "d", .instanceType = {.names = {.protocolName = "TestClocks"}}, .identifierLength = 1};
  const SRLAPIRegistrationData shorter{
      .identifier = "e", .instanceType = {.names = {.protocolName = "TestCloc"}}, .identifierLength = 1};
  const SRLAPIRegistrationData nothing{.identifier = "f", .identifierLength = 1};
  const TestModule others({{&byFunction, testNoClocks},
                           {&withClass, testNoClocks},
                           {&ofClass, testNoClocks},
                           {&longer, testNoClocks},
                           {&shorter, testNoClocks},
                           {&nothing, testNoClocks}});
  const TestModule module({{&testClockAPI, testNoClocks}, {&testClocksAPI, testNoClocks}});
  const SRLAPIRegistrationData another = testClockAPI;
  const TestModule anotherModule({{&another, testNoClocks}});

  EXPECT_EQ(apiOf(rt::protocolInfo<TestClock>(), registryWith({&others})), nullptr);
  EXPECT_EQ(apiOf(rt::protocolInfo<TestClock>(), registryWith({&others, &module, &anotherModule})),
            &testClockAPI);
  EXPECT_EQ(apiOf(rt::protocolInfo<TestClock>(), registryWith({&anotherModule, &module})), &another);
  EXPECT_EQ(apiOf(rt::protocolInfo<Unrelated>(), registryWith({&others, &module})), nullptr);
}

// The record holds names, but its kind says that it does not.
TEST(SRLAPIIdentifierForProtocol, IgnoresAPIsThatAreNotGivenByName) {
  for (const unsigned kind : {1U, 2U, 3U}) {
    SRLAPIRegistrationData api = testClockAPI;
    api.instanceTypeKind = kind & 3U;
    const TestModule module({{&api, testNoClocks}});
    EXPECT_EQ(apiOf(rt::protocolInfo<TestClock>(), registryWith({&module})), nullptr);
  }
}

TEST(SRLAPIIdentifierForProtocol, IsNullWithoutModulesOrProtocol) {
  TestReports reports;
  EXPECT_EQ(apiOf(rt::protocolInfo<TestClock>(), registryWith({})), nullptr);
  EXPECT_EQ(apiOf(rt::protocolInfo<TestClock>(), SRLRegistry::initPrivate()), nullptr);
  const TestModule module({{&testClockAPI, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  const rt::LockGuard guard(*registry->lock());
  EXPECT_EQ(registry->apiIdentifierForProtocol(nullptr), nullptr);
  EXPECT_THAT(wholeReports(reports), IsEmpty());
}

TEST(SRLAPIIdentifierFromString, FindsTheFirstAPIWithTheIdentifier) {
  const SRLAPIRegistrationData another = testClockAPI;
  const TestModule one({{&testClockAPI, testNoClocks}, {&testClocksAPI, testNoClocks}});
  const TestModule other({{&another, testNoClocks}});
  EXPECT_EQ(registryWith({&one, &other})->apiIdentifierFromString("Clock"_s), &testClockAPI);
  EXPECT_EQ(registryWith({&other, &one})->apiIdentifierFromString("Clock"_s), &another);
  EXPECT_EQ(registryWith({&other, &one})->apiIdentifierFromString(rt::String::fromUTF8("Clocks")),
            &testClocksAPI);
}

// For repeated look-ups, by different strings, also in a copy.
TEST(SRLAPIIdentifierFromString, FindsTheSameAPIEachTime) {
  const SRLAPIRegistrationData another = testClockAPI;
  const TestModule one({{&testClockAPI, testNoClocks}, {&testClocksAPI, testNoClocks}});
  const TestModule other({{&another, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&other, &one});
  const Ref<SRLRegistry> copy = [&] {
    registry->apiIdentifierFromString("Clock"_s);
    return registry->mutableCopy();
  }();
  for (int i = 0; i < 3; ++i) {
    for (const Ref<SRLRegistry>& asked : {registry, copy}) {
      EXPECT_EQ(asked->apiIdentifierFromString(rt::String::fromUTF8("Clock")), &another);
      EXPECT_EQ(asked->apiIdentifierFromString("Clocks"_s), &testClocksAPI);
      EXPECT_EQ(asked->apiIdentifierFromString("Sundials"_s), nullptr);
    }
  }
}

TEST(SRLAPIIdentifierFromString, LooksAgainOnceThereAreModules) {
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  EXPECT_EQ(registry->apiIdentifierFromString("Clock"_s), nullptr);
  const TestModule module({{&testClockAPI, testNoClocks}});
  registry->internalRegisterBindings(std::array{module.data()});
  EXPECT_EQ(registry->apiIdentifierFromString("Clock"_s), &testClockAPI);
}

TEST(SRLAPIIdentifierFromString, IsNullForAnUnknownIdentifier) {
  TestReports reports;
  const TestModule module({{&testClockAPI, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  for (const rt::String& absent : {"Cloc"_s, "Clocks"_s, "clock"_s, "Clocl"_s, ""_s}) {
    EXPECT_EQ(registry->apiIdentifierFromString(absent), nullptr) << absent.view();
  }
  EXPECT_EQ(registryWith({})->apiIdentifierFromString("Clock"_s), nullptr);
  EXPECT_THAT(wholeReports(reports), IsEmpty());
}

// The record's length counts bytes.
TEST(SRLAPIIdentifierFromString, ComparesAsManyBytesAsTheRecordSays) {
  const SRLAPIRegistrationData umlaut{.identifier = "\u00fc", .identifierLength = 2};
  const SRLAPIRegistrationData part{.identifier = "Weather", .identifierLength = 4};
  const TestModule module({{&umlaut, testNoClocks}, {&part, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  EXPECT_EQ(registry->apiIdentifierFromString("\u00fc"_s), &umlaut);
  EXPECT_EQ(registry->apiIdentifierFromString("Weat"_s), &part);
  EXPECT_EQ(registry->apiIdentifierFromString("Weather"_s), nullptr);
}

TEST(SRLAPIIdentifierFromString, ReportsANullIdentifier) {
  TestReports reports;
  EXPECT_EQ(SRLRegistry::initPrivate()->apiIdentifierFromString(nullptr), nullptr);
  EXPECT_THAT(wholeReports(reports), ElementsAre(WholeReport{kFile, "-[SRLRegistry apiIdentifierFromString:]",
                                                             "apiIdentifierString must not be nil"}));
}

// The null identifier is reported without the lock.
TEST(SRLAPIIdentifierFromString, LetsTheErrorCallbackUseTheRegistry) {
  TestReports reports;
  const TestModule module({{&testClockAPI, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&module});
  const SRLAPIRegistrationData* found = nullptr;
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [&](const Ref<PECErrorDescription>&) { found = registry->apiIdentifierFromString("Clock"_s); });
  EXPECT_EQ(registry->apiIdentifierFromString(nullptr), nullptr);
  EXPECT_EQ(found, &testClockAPI);
}

TEST(SRLRegisteredAPIIdentifiers, AreThoseOfAllModules) {
  const SRLAPIRegistrationData another = testClockAPI;
  const SRLAPIRegistrationData umlaut{.identifier = "\u00fc", .identifierLength = 2};
  const TestModule one({{&testClockAPI, testWallClocks}, {&testClocksAPI, testNoClocks}});
  const TestModule other({{&another, testSundials}, {&umlaut, testNoClocks}});
  const Ref<SRLRegistry> registry = registryWith({&one, &other});
  const Ref<rt::Set> identifiers = registry->registeredAPIIdentifiers();
  EXPECT_TRUE(rt::isEqual(identifiers, rt::Set::of("Clock"_s, "Clocks"_s, "\u00fc"_s)));
  // Requesting a service does not change them. Each call returns a new set.
  boundTo(testClockAPI, registry);
  EXPECT_TRUE(rt::isEqual(registry->registeredAPIIdentifiers(), identifiers));
  EXPECT_NE(registry->registeredAPIIdentifiers(), identifiers);
}

// An API that is bound by hand belongs to no module.
TEST(SRLRegisteredAPIIdentifiers, DoNotIncludeAPIsBoundByHand) {
  const Ref<SRLRegistry> registry = registryWith({});
  {
    const rt::LockGuard guard(*registry->lock());
    registry->internalRegisterServiceAPI(&testClockAPI, implementationOf<TestWallClock>("clock"));
  }
  EXPECT_TRUE(registry->registeredAPIIdentifiers()->isEmpty());
}

// The first look-up registers the bindings, once, and all threads find the same ones.
TEST(SRLRegistryThreads, FindTheSameBindings) {
  TestReports reports;
  const TestModule module({{&testClockAPI, testWallClocks}, {&testClocksAPI, testBothClocks}});
  for (int round = 0; round < 50; ++round) {
    const Ref<SRLRegistry> registry = registryWith({&module});
    std::array<Ref<SRLImplementation>, 4> found;
    std::array<std::int64_t, 4> counts{};
    std::latch start(found.size());
    {
      std::vector<std::jthread> threads;
      for (std::size_t i = 0; i < found.size(); ++i) {
        threads.emplace_back([&, i] {
          start.arrive_and_wait();
          found.at(i) = boundTo(testClockAPI, registry);
          counts.at(i) = countBoundTo(testClocksAPI, registry);
          const Ref<SRLRegistry> copy = registry->mutableCopy();
          EXPECT_EQ(boundTo(testClockAPI, copy), found.at(i));
          EXPECT_EQ(registry->apiIdentifierFromString("Clock"_s), &testClockAPI);
          EXPECT_FALSE(registry->description().isEmpty());
        });
      }
    }
    ASSERT_NE(found.front(), nullptr);
    EXPECT_THAT(found, testing::Each(found.front()));
    EXPECT_THAT(counts, testing::Each(2));
  }
  EXPECT_THAT(wholeReports(reports), IsEmpty());
  // Releases what is left of the copies that were destroyed on the threads.
  rt::MainQueue::drain();
}

// Each registry that a thread installs is returned to exactly one thread.
TEST(SRLRegistryThreads, ExchangeTheSharedInstance) {
  const Ref<SRLRegistry> original = SRLRegistry::sharedInstance();
  std::array<std::vector<Ref<SRLRegistry>>, 4> replaced;
  std::vector<Ref<SRLRegistry>> expected{original};
  {
    std::vector<std::jthread> threads;
    std::latch start(replaced.size());
    for (std::vector<Ref<SRLRegistry>>& mine : replaced) {
      std::vector<Ref<SRLRegistry>> own(100);
      for (Ref<SRLRegistry>& registry : own) registry = SRLRegistry::initPrivate();
      expected.insert(expected.end(), own.begin(), own.end());
      threads.emplace_back([&mine, &start, own = std::move(own)] {
        start.arrive_and_wait();
        for (const Ref<SRLRegistry>& registry : own) {
          EXPECT_NE(SRLRegistry::sharedInstance(), nullptr);
          mine.push_back(SRLRegistry::setSharedInstance(registry));
        }
      });
    }
    threads.clear();
  }
  std::vector<Ref<SRLRegistry>> seen{SRLRegistry::setSharedInstance(original)};
  for (const auto& some : replaced) seen.insert(seen.end(), some.begin(), some.end());
  EXPECT_THAT(seen, testing::UnorderedElementsAreArray(expected));
}

}  // namespace
