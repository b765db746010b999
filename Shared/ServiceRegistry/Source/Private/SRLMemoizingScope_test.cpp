#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <stdexcept>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/String.h"
#include "Runtime/Objects/Weak.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScopeIvars.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/TestFactories.h"
#include "tests/support/TestReports.h"

struct SRLMemoizingScopeTestAccess {
  static SRLMemoizingScopeIvars& ivars(const rt::Ref<SRLMemoizingScope>& scope) { return *scope->ivars_; }
};

namespace {

using namespace rt::literals;
using rt::Ref;
using testing::IsEmpty;
using Access = SRLMemoizingScopeTestAccess;
using Factory = rt::Block<Ref<rt::Object>()>;

// Two identifiers. Only their addresses matter.
struct Identifiers {
  int first = 1;
  int second = 1;
};

class SRLMemoizingScopeTest : public testing::Test {
 protected:
  Ref<rt::Object> ask(const void* identifier, const Factory& factory, bool* instanceCreated = nullptr) const {
    return scope_->instanceForIdentifier(identifier, instanceCreated, factory);
  }

  const Ref<SRLMemoizingScope> scope_ = SRLMemoizingScope::init();
  const Identifiers identifiers_;
};

using SRLMemoizingScopeDeathTest = SRLMemoizingScopeTest;

TEST_F(SRLMemoizingScopeTest, IsEmptyAtFirst) {
  EXPECT_TRUE(scope_->instances()->isEmpty());
  SRLMemoizingScopeIvars& ivars = Access::ivars(scope_);
  const rt::LockGuard guard(ivars.lock);
  EXPECT_THAT(ivars.instances.entries(), IsEmpty());
  EXPECT_THAT(ivars.pendingCreations, IsEmpty());
  EXPECT_EQ(ivars.instances.entries().max_load_factor(), 1.0F);
  EXPECT_EQ(ivars.pendingCreations.max_load_factor(), 1.0F);
}

TEST_F(SRLMemoizingScopeTest, MakesAnInstanceAtTheFirstRequest) {
  for (const bool before : {false, true}) {
    const Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
    bool isCreated = before;
    int runs = 0;
    Ref<rt::Object> made;
    const Ref<rt::Object> got = scope->instanceForIdentifier(&identifiers_.first, &isCreated, [&] {
      EXPECT_TRUE(isCreated);  // It is written before the factory runs.
      ++runs;
      made = rt::make<Instance>();
      return made;
    });
    EXPECT_TRUE(got);
    EXPECT_EQ(got, made);
    EXPECT_EQ(runs, 1);
    EXPECT_TRUE(isCreated);
  }
}

TEST_F(SRLMemoizingScopeTest, ReturnsAnExistingInstanceAndLeavesTheFlagAlone) {
  const Ref<rt::Object> made = ask(&identifiers_.first, makeInstance);
  for (const bool before : {false, true}) {
    bool isCreated = before;
    EXPECT_EQ(ask(&identifiers_.first, mustNotRun, &isCreated), made);
    EXPECT_EQ(isCreated, before);
  }
  EXPECT_EQ(ask(&identifiers_.first, mustNotRun), made);
}

TEST_F(SRLMemoizingScopeTest, IdentifiesInstancesByAddress) {
  ASSERT_EQ(identifiers_.first, identifiers_.second);
  const Ref<rt::Object> first = ask(&identifiers_.first, makeInstance);
  const Ref<rt::Object> second = ask(&identifiers_.second, makeInstance);
  const Ref<rt::Object> third = ask(nullptr, makeInstance);
  EXPECT_NE(first, second);
  EXPECT_NE(first, third);
  EXPECT_EQ(ask(&identifiers_.first, mustNotRun), first);
  EXPECT_EQ(ask(&identifiers_.second, mustNotRun), second);
  EXPECT_EQ(ask(nullptr, mustNotRun), third);
}

TEST_F(SRLMemoizingScopeTest, SharesNoInstanceWithAnotherScope) {
  const Ref<rt::Object> made = ask(&identifiers_.first, makeInstance);
  EXPECT_NE(SRLMemoizingScope::init()->instanceForIdentifier(&identifiers_.first, nullptr, makeInstance),
            made);
}

TEST_F(SRLMemoizingScopeTest, KeepsANullInstance) {
  bool isCreated = false;
  EXPECT_EQ(ask(&identifiers_.first, [] { return nullptr; }, &isCreated), nullptr);
  EXPECT_TRUE(isCreated);
  for (const bool before : {false, true}) {
    isCreated = before;
    EXPECT_EQ(ask(&identifiers_.first, mustNotRun, &isCreated), nullptr);
    EXPECT_EQ(isCreated, before);
  }
}

TEST_F(SRLMemoizingScopeTest, ListsItsInstancesWithoutNulls) {
  std::array<char, 50> places{};
  for (std::size_t i = 0; i < places.size(); ++i) {
    ask(&places[i], [i]() -> Ref<rt::Object> { return i % 3 == 0 ? nullptr : rt::make<Instance>(); });
  }
  const Ref<rt::Array> listed = scope_->instances();
  EXPECT_EQ(listed->count(), 33U);
  EXPECT_NE(scope_->instances(), listed);

  std::vector<Ref<rt::Object>> expected;
  SRLMemoizingScopeIvars& ivars = Access::ivars(scope_);
  const rt::LockGuard guard(ivars.lock);
  EXPECT_EQ(ivars.instances.entries().size(), 50U);
  EXPECT_THAT(ivars.pendingCreations, IsEmpty());
  for (const auto& [identifier, instance] : ivars.instances.entries()) {
    if (instance) expected.push_back(instance);
  }
  EXPECT_TRUE(std::ranges::equal(*listed, expected));
}

TEST_F(SRLMemoizingScopeTest, OwnsItsInstances) {
  Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
  const rt::Weak<rt::Object> weak = scope->instanceForIdentifier(&identifiers_.first, nullptr, makeInstance);
  EXPECT_NE(weak.lock(), nullptr);
  scope = nullptr;
  EXPECT_EQ(weak.lock(), nullptr);
}

// If the scope held a lock meanwhile, this would end the program.
TEST_F(SRLMemoizingScopeTest, LetsAFactoryUseTheScope) {
  Ref<rt::Object> inner;
  const Ref<rt::Object> outer = ask(&identifiers_.first, [&]() -> Ref<rt::Object> {
    EXPECT_TRUE(scope_->instances()->isEmpty());
    inner = ask(&identifiers_.second, makeInstance);
    EXPECT_EQ(scope_->instances()->count(), 1U);
    return rt::make<Instance>();
  });
  EXPECT_TRUE(inner);
  EXPECT_EQ(ask(&identifiers_.first, mustNotRun), outer);
  EXPECT_EQ(ask(&identifiers_.second, mustNotRun), inner);
}

// The entries of pending creations are reused, also if instances are made within each other.
TEST_F(SRLMemoizingScopeTest, MakesInstancesInSequenceAndNested) {
  std::array<char, 30> places{};
  std::vector<Ref<rt::Object>> made(places.size());
  const auto make = [&](std::size_t i) {
    return made[i] = ask(&places[i], [] { return Ref<rt::Object>(rt::make<Instance>()); });
  };
  for (std::size_t i = 0; i + 3 <= places.size(); i += 3) {
    made[i] = ask(&places[i], [&] {
      make(i + 1);
      make(i + 2);
      return Ref<rt::Object>(rt::make<Instance>());
    });
  }
  for (std::size_t i = 0; i < places.size(); ++i) {
    EXPECT_TRUE(made[i]);
    EXPECT_EQ(ask(&places[i], mustNotRun), made[i]);
  }
  SRLMemoizingScopeIvars& ivars = Access::ivars(scope_);
  const rt::LockGuard guard(ivars.lock);
  EXPECT_THAT(ivars.pendingCreations, IsEmpty());
  EXPECT_FALSE(ivars.spareCreation.empty());
}

// A thread may still be about to wait for the lock. If the next creation reused it, the thread would also
// wait for that one, and perhaps for ever.
TEST_F(SRLMemoizingScopeTest, DoesNotReuseALockThatAThreadWaitsFor) {
  SRLMemoizingScopeIvars& ivars = Access::ivars(scope_);
  std::thread other;
  ask(&identifiers_.first, [&] {
    other = std::thread([&] { EXPECT_TRUE(ask(&identifiers_.first, mustNotRun)); });
    while (true) {
      const rt::LockGuard guard(ivars.lock);
      if (ivars.pendingCreations.at(&identifiers_.first)->isAwaited()) break;
    }
    return Ref<rt::Object>(rt::make<Instance>());
  });
  other.join();
  {
    const rt::LockGuard guard(ivars.lock);
    EXPECT_TRUE(ivars.spareCreation.empty());
  }
  ask(&identifiers_.second, makeInstance);
  const rt::LockGuard guard(ivars.lock);
  EXPECT_FALSE(ivars.spareCreation.empty());
}

Ref<rt::Object> fail() {
  throw std::out_of_range("no instance");
}

TEST_F(SRLMemoizingScopeTest, ThrowsWhatTheFactoryThrowsAndLeavesTheInstancePending) {
  bool isCreated = false;
  try {
    ask(&identifiers_.first, fail, &isCreated);
    ADD_FAILURE() << "nothing was thrown";
  } catch (const std::out_of_range& exception) {
    EXPECT_STREQ(exception.what(), "no instance");
  }
  EXPECT_TRUE(isCreated);
  EXPECT_TRUE(scope_->instances()->isEmpty());
  EXPECT_TRUE(ask(&identifiers_.second, makeInstance));
  std::thread([&] { EXPECT_EQ(scope_->instances()->count(), 1U); }).join();

  SRLMemoizingScopeIvars& ivars = Access::ivars(scope_);
  const rt::LockGuard guard(ivars.lock);
  EXPECT_EQ(ivars.instances.find(&identifiers_.first), nullptr);
  EXPECT_EQ(ivars.instances.entries().size(), 1U);
  EXPECT_TRUE(ivars.pendingCreations.contains(&identifiers_.first));
  EXPECT_EQ(ivars.pendingCreations.size(), 1U);
}

void expectReportOfNoInstance(TestReports& reports) {
  const std::vector<Ref<LUMLogMessage>> messages = reports.messages();
  ASSERT_EQ(messages.size(), 1U);
  EXPECT_EQ(messages[0]->level(), LUMLogLevelFault);
  EXPECT_EQ(text(*messages[0]), "We blocked waiting on instance creation but no instance was created.");
  EXPECT_EQ(messages[0]->file(), "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope");
  EXPECT_EQ(messages[0]->function(),
            "-[SRLMemoizingScope instanceForIdentifier:instanceCreated:factoryBlock:]");
  EXPECT_GT(messages[0]->line(), 0U);
  EXPECT_FALSE(messages[0]->safeParameters());
}

// This used to end the program, since the thread still held the lock that it waited for.
TEST_F(SRLMemoizingScopeTest, ReportsAFailedInstanceToTheSameThread) {
  EXPECT_THROW(ask(&identifiers_.first, fail), std::out_of_range);
  TestReports reports;
  for (const bool before : {false, true}) {
    bool isCreated = before;
    EXPECT_EQ(ask(&identifiers_.first, mustNotRun, &isCreated), nullptr);
    EXPECT_FALSE(isCreated);
    expectReportOfNoInstance(reports);
  }
  EXPECT_EQ(ask(&identifiers_.first, mustNotRun), nullptr);
  expectReportOfNoInstance(reports);
  // No lock is left held.
  EXPECT_TRUE(scope_->instances()->isEmpty());
  EXPECT_TRUE(ask(&identifiers_.second, makeInstance));
}

// The other threads used to wait for ever.
TEST_F(SRLMemoizingScopeTest, ReportsAFailedInstanceToOtherThreads) {
  EXPECT_THROW(ask(&identifiers_.first, fail), std::out_of_range);
  TestReports reports;
  for (int i = 0; i < 2; ++i) {
    std::thread([&] {
      bool isCreated = true;
      EXPECT_EQ(ask(&identifiers_.first, mustNotRun, &isCreated), nullptr);
      EXPECT_FALSE(isCreated);
    }).join();
    expectReportOfNoInstance(reports);
  }
}

// The thread used to wait for ever. The factory throws only once that thread is about to wait.
TEST_F(SRLMemoizingScopeTest, WakesThreadsThatWaitForAFailedInstance) {
  SRLMemoizingScopeIvars& ivars = Access::ivars(scope_);
  TestReports reports;
  std::thread waiting;
  const Factory failBeforeOthers = [&]() -> Ref<rt::Object> {
    waiting = std::thread([&] {
      bool isCreated = true;
      EXPECT_EQ(ask(&identifiers_.first, mustNotRun, &isCreated), nullptr);
      EXPECT_FALSE(isCreated);
    });
    while (true) {
      const rt::LockGuard guard(ivars.lock);
      if (ivars.pendingCreations.at(&identifiers_.first)->isAwaited()) break;
    }
    return fail();
  };
  EXPECT_THROW(ask(&identifiers_.first, failBeforeOthers), std::out_of_range);
  waiting.join();
  expectReportOfNoInstance(reports);
}

// Memory for an instance is allocated before the factory runs. It used to be allocated afterwards. If there
// was none, the instance was lost and stayed pending for ever.
TEST_F(SRLMemoizingScopeTest, AllocatesNothingOnceTheFactoryHasReturned) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  std::array<char, 100> places{};
  std::int64_t allocations = 0;
  // Each instance is made within the previous one, so that all are pending at once.
  const std::function<Ref<rt::Object>(std::size_t)> make = [&](std::size_t i) {
    AllocationCount count;
    const Ref<rt::Object> made = scope_->instanceForIdentifier(&places[i], nullptr, [&] {
      if (i + 1 < places.size()) make(i + 1);
      Ref<rt::Object> instance = makeInstance();
      count = AllocationCount();
      return instance;
    });
    allocations += count.allocations();
    return made;
  };
  make(0);
  EXPECT_EQ(allocations, 0);
  EXPECT_EQ(scope_->instances()->count(), places.size());
}

#if !defined(__APPLE__)

constexpr const char* kTakenAgain =
    "rt: the lock at 0x[0-9a-f]+ is taken again by thread [0-9]+, which holds it";

TEST_F(SRLMemoizingScopeDeathTest, AFactoryThatRequestsItsOwnInstanceEndsTheProgram) {
  EXPECT_DEATH(ask(&identifiers_.first, [&] { return ask(&identifiers_.first, makeInstance); }), kTakenAgain);
}

TEST_F(SRLMemoizingScopeDeathTest, FactoriesThatRequestEachOthersInstancesEndTheProgram) {
  const Factory outer = [&] {
    return ask(&identifiers_.second, [&] { return ask(&identifiers_.first, makeInstance); });
  };
  EXPECT_DEATH(ask(&identifiers_.first, outer), kTakenAgain);
}

#endif

}  // namespace
