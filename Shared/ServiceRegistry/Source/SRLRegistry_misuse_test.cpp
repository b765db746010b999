// Misuse that ends the program: registering modules twice, and misuse of the lock.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <cstdio>
#include <functional>
#include <latch>
#include <string>
#include <thread>

#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/TestBindings.h"
#include "tests/support/TestLoggers.h"
#include "tests/support/TestReports.h"

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::ContainsRegex;
using testing::HasSubstr;
using testing::KilledBySignal;
using testing::Not;

constexpr const char* kTwice =
    "Trying to register bindings module data twice. This is likely caused by loading multiple bindings "
    "modules in the same app or test. See docs/registry.md#registering-bindings-module-twice.";
constexpr const char* kAsksInCallback =
    "SRLRegistry: an error callback asks a registry whose lock at 0x[0-9a-f]+ is held; callbacks must not\n";
constexpr const char* kWaitsInCallback =
    "SRLMemoizingScope: an error callback asks for the instance for 0x[0-9a-f]+, which is being made; "
    "callbacks must not\n";

// How misuse of a lock ends the program. macOS has a lock of its own, which prints nothing.
#if defined(__APPLE__)
constexpr int kSignalOfLock = SIGILL;
constexpr const char* kTakenAgain = "";
constexpr const char* kNotHeld = "";
#else
constexpr int kSignalOfLock = SIGABRT;
constexpr const char* kTakenAgain =
    "rt: the lock at 0x[0-9a-f]+ is taken again by thread [0-9]+, which holds it\n";
constexpr const char* kNotHeld =
    "rt: the lock at 0x[0-9a-f]+ is needed by thread [0-9]+, but no thread holds it\n";
#endif

// An error callback that prints the report and returns.
void print(const Ref<PECErrorDescription>& error) {
  std::fprintf(stderr, "%s: %s: \"%s\" of \"%s\"\n", std::string(error->filePath().view()).c_str(),
               std::string(error->functionName().view()).c_str(),
               std::string(error->errorMessage().view()).c_str(),
               std::string(error->rawFormatString().view()).c_str());
}

class SRLRegistryDeathTest : public testing::Test {
 protected:
  SRLRegistryDeathTest() { setCallback(print); }

  static void setCallback(const PECErrorHandlerBlock& callback) {
    PECErrorHandler::sharedInstance()->setErrorHandlerBlock(callback);
  }

  TestReports reports_;
  const TestModule module_{{{&testClockAPI, testWallClocks}}};
  const Ref<SRLRegistry> registry_ = registryWith({&module_});
};

TEST_F(SRLRegistryDeathTest, ModulesRegisteredTwiceEndTheProgramAfterAReport) {
  const std::string report =
      "Shared/ServiceRegistry/Source/SRLRegistry: -[SRLRegistry internalRegisterBindings:]: \"" +
      std::string(kTwice) + "\" of \"" + kTwice + "\"\n";
  EXPECT_EXIT(registry_->internalRegisterBindings({}), KilledBySignal(SIGABRT), HasSubstr(report));
  // The shared registry got its modules when the program was loaded.
  EXPECT_EXIT(SRLRegistry::sharedInstance()->internalRegisterBindings({}), KilledBySignal(SIGABRT),
              HasSubstr(report));
  EXPECT_EXIT(SRLRegistry::initialize(rt::classInfo<SRLRegistry>()), KilledBySignal(SIGABRT),
              HasSubstr(report));
  EXPECT_EXIT(SRLRegistry::load(), KilledBySignal(SIGABRT), HasSubstr(report));
  const auto registerWithLogger = [this] {
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(
        rt::make<TestSyncLogger>([](const Ref<LUMLogMessage>& message) {
          std::fprintf(stderr, "level %llu, %d parameters\n",
                       static_cast<unsigned long long>(message->level()),
                       int{countOfSafeParameters(*message)});
        }));
    registry_->internalRegisterBindings({});
  };
  EXPECT_EXIT(registerWithLogger(), KilledBySignal(SIGABRT),
              AllOf(HasSubstr("level 4, 0 parameters\n"), HasSubstr(report)));
  // A copy of a registry with modules has these modules.
  EXPECT_EXIT(registry_->mutableCopy()->internalRegisterBindings({}), KilledBySignal(SIGABRT),
              HasSubstr(report));
}

TEST_F(SRLRegistryDeathTest, ModulesRegisteredWhileModulesAreRegisteredEndTheProgram) {
  static SRLRegistry* registry;
  const Ref<SRLRegistry> fresh = SRLRegistry::initPrivate();
  registry = fresh.get();
  const TestModule module({}, [](SRLConfigurationFactories&) { registry->internalRegisterBindings({}); });
  const SRLBindingsModuleData* const modules[] = {module.data()};
  EXPECT_EXIT(fresh->internalRegisterBindings(modules), KilledBySignal(SIGABRT), HasSubstr(kTwice));
}

// No caller can catch what the error callback throws.
TEST_F(SRLRegistryDeathTest, ModulesRegisteredTwiceEndTheProgramEvenIfTheCallbackThrows) {
  struct Thrown {};
  const auto registerTwice = [this] {
    try {
      registry_->internalRegisterBindings({});
    } catch (...) {
      std::fputs("the caller has caught it\n", stderr);
    }
  };
  setCallback([](const Ref<PECErrorDescription>& error) {
    print(error);
    throw Thrown();
  });
  EXPECT_EXIT(registerTwice(), KilledBySignal(SIGABRT),
              AllOf(HasSubstr(kTwice), Not(HasSubstr("has caught"))));
  // The default error callback throws, too.
  setCallback(nullptr);
  EXPECT_EXIT(registerTwice(), KilledBySignal(SIGABRT),
              AllOf(HasSubstr(kTwice), Not(HasSubstr("has caught"))));
}

TEST_F(SRLRegistryDeathTest, FunctionsThatNeedTheLockEndTheProgramWithoutIt) {
  const auto registerBindings = [this]() RT_NO_THREAD_SAFETY_ANALYSIS {
    registry_->registerBindings(module_.bindings().front());
  };
  EXPECT_EXIT(registerBindings(), KilledBySignal(kSignalOfLock), ContainsRegex(kNotHeld));
  const auto ask = [this]() RT_NO_THREAD_SAFETY_ANALYSIS {
    registry_->apiIdentifierForProtocol(&rt::protocolInfo<TestClock>());
  };
  EXPECT_EXIT(ask(), KilledBySignal(kSignalOfLock), ContainsRegex(kNotHeld));
}

// Each registry has a lock of its own.
TEST_F(SRLRegistryDeathTest, FunctionsThatNeedTheLockEndTheProgramWithAnotherLock) {
  const Ref<SRLRegistry> copy = registry_->mutableCopy();
  const auto registerBindings = [&]() RT_NO_THREAD_SAFETY_ANALYSIS {
    const rt::LockGuard guard(*registry_->lock());
    copy->registerBindings(module_.bindings().front());
  };
  EXPECT_EXIT(registerBindings(), KilledBySignal(kSignalOfLock), ContainsRegex(kNotHeld));
}

TEST_F(SRLRegistryDeathTest, FunctionsThatTakeTheLockEndTheProgramIfItIsHeld) {
  const std::function<void()> takers[] = {
      [this] { registry_->apiIdentifierFromString("Clock"_s); },
      [this] { registry_->registeredAPIIdentifiers(); },
      [this] { registry_->description(); },
      [this] { registry_->mutableCopy(); },
      [this] { registry_->internalService(&testClockAPI, {}); },
  };
  for (const auto& take : takers) {
    const auto takeTwice = [&] {
      const rt::LockGuard guard(*registry_->lock());
      take();
    };
    EXPECT_EXIT(takeTwice(), KilledBySignal(kSignalOfLock), ContainsRegex(kTakenAgain));
  }
}

// The second look-up of an identifier takes no lock.
TEST_F(SRLRegistryDeathTest, AnIdentifierFoundBeforeIsFoundWithTheLockHeld) {
  registry_->apiIdentifierFromString("Clock"_s);
  const rt::LockGuard guard(*registry_->lock());
  EXPECT_EQ(registry_->apiIdentifierFromString("Clock"_s), &testClockAPI);
}

// Some reports are made with the lock held.
TEST_F(SRLRegistryDeathTest, AnErrorCallbackThatUsesTheRegistryUnderItsLockEndsTheProgram) {
  setCallback([this](const Ref<PECErrorDescription>& error) {
    print(error);
    registry_->registeredAPIIdentifiers();
  });
  const SRLAPIRegistrationData unknown{.identifier = "Unknown", .identifierLength = 7};
  EXPECT_EXIT(registry_->internalService(&unknown, {}), KilledBySignal(SIGABRT),
              AllOf(HasSubstr("No binding was found for required, single-bound service: Unknown"),
                    ContainsRegex(kAsksInCallback)));
  const auto bindStone = [this] {
    const rt::LockGuard guard(*registry_->lock());
    registry_->internalRegisterServiceAPI(&testClockAPI, implementationOf<TestStone>("stone"));
  };
  EXPECT_EXIT(bindStone(), KilledBySignal(SIGABRT),
              AllOf(HasSubstr("Implementation TestStone should conform to id<TestClock>"),
                    ContainsRegex(kAsksInCallback)));
}

// A logger runs on the thread that reports.
TEST_F(SRLRegistryDeathTest, ALoggerThatUsesTheRegistryUnderItsLockEndsTheProgram) {
  const auto report = [this] {
    LUMLogMultiplexer::sharedInstance()->addSyncLogger(rt::make<TestSyncLogger>(
        [this](const Ref<LUMLogMessage>&) { registry_->registeredAPIIdentifiers(); }));
    const SRLAPIRegistrationData unknown{.identifier = "Unknown", .identifierLength = 7};
    registry_->internalService(&unknown, {});
  };
  EXPECT_EXIT(report(), KilledBySignal(kSignalOfLock), ContainsRegex(kTakenAgain));
}

// Another thread holds the lock. It may be waiting to report until this callback returns.
TEST_F(SRLRegistryDeathTest, AnErrorCallbackThatWouldWaitForTheRegistryEndsTheProgram) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  const auto report = [this] {
    setCallback([this](const Ref<PECErrorDescription>&) {
      std::latch isHeld(1);
      const std::jthread other([&] {
        const rt::LockGuard guard(*registry_->lock());
        isHeld.count_down();
        registry_->implementationForSingleBoundService(nullptr);
      });
      isHeld.wait();
      registry_->registeredAPIIdentifiers();
    });
    registry_->removeScopesWithTag(nullptr);
  };
  EXPECT_EXIT(report(), KilledBySignal(SIGABRT), ContainsRegex(kAsksInCallback));
}

// Another thread is making the instance. Both threads used to wait for each other.
TEST_F(SRLRegistryDeathTest, AnErrorCallbackThatWouldWaitForAnInstanceEndsTheProgram) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  const auto report = [this] {
    setCallback([this](const Ref<PECErrorDescription>&) {
      const Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
      std::latch isBeingMade(1);
      const std::jthread other([&] {
        scope->instanceForIdentifier(this, nullptr, [&]() -> Ref<rt::Object> {
          isBeingMade.count_down();
          registry_->removeScopesWithTag(nullptr);
          return nullptr;
        });
      });
      isBeingMade.wait();
      scope->instanceForIdentifier(this, nullptr, []() -> Ref<rt::Object> { return nullptr; });
    });
    registry_->removeScopesWithTag(nullptr);
  };
  EXPECT_EXIT(report(), KilledBySignal(SIGABRT), ContainsRegex(kWaitsInCallback));
}

}  // namespace
