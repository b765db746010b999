// Many threads use one registry.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <latch>
#include <map>
#include <mutex>
#include <random>
#include <string>
#include <thread>
#include <tuple>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "tests/support/TestReports.h"

namespace {

using rt::Ref;

constexpr std::size_t kThreads = 8;
constexpr std::size_t kRequests = 2000;
constexpr std::size_t kAccounts = 4;
constexpr std::size_t kLevels = 4;
constexpr std::size_t kAPIsInLevel = 250;
constexpr std::size_t kAPIs = kLevels * kAPIsInLevel;

// The registry that the thread is using: the shared one or a copy.
constinit thread_local SRLRegistry* askedHere = nullptr;

// All callbacks of the registry take its lock. If it were held meanwhile, this would end the program.
void takeTheLock() {
  const Ref<SRLRegistry> shared = SRLRegistry::sharedInstance();
  {
    const rt::LockGuard guard(*shared->lock());
  }
  if (askedHere != nullptr) const rt::LockGuard guard(*askedHere->lock());
}

std::atomic<int> tagsAlive{0};

// A tag, equal to tags with the same number.
class Tag final : public rt::Implements<Tag, rt::Object> {
 public:
  explicit Tag(std::size_t number) : number_(number) { ++tagsAlive; }
  ~Tag() override {
    takeTheLock();
    --tagsAlive;
  }
  bool isEqual(const rt::Object* other) const override {
    const auto* tag = rt::cast<Tag>(other);
    return tag != nullptr && tag->number_ == number_;
  }
  std::uint64_t hash() const override { return number_; }
  std::size_t number() const { return number_; }

 private:
  const std::size_t number_;
};

// A clock that ticks at each event.
std::atomic<std::uint64_t> now{1};

struct Account {
  std::atomic<std::uint64_t> removalsBegun{0};
  std::atomic<std::uint64_t> removalsEnded{0};
  // The start of the latest removal that has ended.
  std::atomic<std::uint64_t> lastRemoval{0};
};
std::array<Account, kAccounts> accounts;

class Instance final : public rt::Implements<Instance, rt::Object> {
 public:
  explicit Instance(Ref<rt::Object> dependency) : dependency_(std::move(dependency)) {}
  ~Instance() override { takeTheLock(); }
  std::uint64_t madeAt() const { return madeAt_; }

 private:
  const std::uint64_t madeAt_ = now++;
  const Ref<rt::Object> dependency_;
};

std::array<SRLAPIRegistrationData, kAPIs> apis;
std::array<SRLImplementationRegistrationData, kAPIs> implementations;
std::array<std::array<const SRLImplementationRegistrationData*, 2>, kAPIs> lists;
std::array<_SRLBindingRegistrationData, kAPIs + 1> bindings;
// A multi-bound API, to which some implementations of the lowest level are bound.
constexpr std::size_t kMany = 8;
constinit SRLAPIRegistrationData apiOfMany{.identifier = "APIsOfMany",
                                           .instanceType = {.names = {.className = "Instance"}},
                                           .scopeType = 0b1,
                                           .identifierLength = 10,
                                           .isMultibound = 1};
std::array<const SRLImplementationRegistrationData*, kMany + 1> many{};
std::array<std::string, kAPIs> identifiers;
thread_local std::minstd_rand chance;

// Each factory requests a service of the level below, so that no instance needs itself.
template <std::size_t level>
Ref<rt::Object> makeInstance(SRLScopeTagSet tags) {
  takeTheLock();
  Ref<rt::Object> dependency;
  if constexpr (level > 0) {
    // Each API needs an account's tag. An implementation without a scope gets none, so it requests nothing.
    if (tags.tags[0] != nullptr) {
      const std::size_t below = ((level - 1) * kAPIsInLevel) + (chance() % kAPIsInLevel);
      dependency = SRLRegistry::sharedInstance()->internalService(&apis.at(below), tags);
    }
  }
  return rt::make<Instance>(std::move(dependency));
}

constexpr std::array<Ref<rt::Object> (*)(SRLScopeTagSet), kLevels> kFactories = {
    makeInstance<0>, makeInstance<1>, makeInstance<2>, makeInstance<3>};

// The instances that the requests of all threads must get. An instance is identified by the time when it was
// made. Its key is the API, the account, and the number of removals before.
class Model {
 public:
  // Returns the instance that the first request for the same key got.
  std::uint64_t expect(std::size_t api, std::size_t account, std::uint64_t removals, std::uint64_t madeAt) {
    const std::scoped_lock guard(mutex_);
    return got_.try_emplace({api, account, removals}, madeAt).first->second;
  }

  void clear() { got_.clear(); }

 private:
  std::mutex mutex_;
  std::map<std::tuple<std::size_t, std::size_t, std::uint64_t>, std::uint64_t> got_;
} model;

bool isNew(std::size_t api) {
  return api % 7 == 0;
}
bool isOfAccount(std::size_t api) {
  return api % 5 != 0;
}

const SRLBindingsModuleData& moduleOfAll() {
  for (std::size_t i = 0; i < kAPIs; ++i) {
    identifiers.at(i) = "API" + std::to_string(1000 + i);
    apis.at(i).identifier = identifiers.at(i).c_str();
    apis.at(i).identifierLength = static_cast<std::uint16_t>(identifiers.at(i).size());
    apis.at(i).scopeType = 0b1;
    apis.at(i).instanceType.names.className = "Instance";
    implementations.at(i).identifier = identifiers.at(i).c_str();
    implementations.at(i).instanceType.className = "Instance";
    implementations.at(i).factory = kFactories.at(i / kAPIsInLevel);
    implementations.at(i).scopeType = isOfAccount(i) ? 0b1 : 0;
    implementations.at(i).lifetime = isNew(i) ? 1 : 0;
    lists.at(i) = {&implementations.at(i), nullptr};
    bindings.at(i) = {&apis.at(i), lists.at(i).data()};
    if (i < kMany) many.at(i) = &implementations.at(i);
  }
  bindings.at(kAPIs) = {&apiOfMany, many.data()};
  static const SRLBindingsModuleData module{.bindingsBegin = bindings.data(),
                                            .bindingsEnd = bindings.data() + bindings.size()};
  return module;
}

// Ends the account's scopes. Other threads may do so at the same time.
void removeScopesOf(SRLRegistry& registry, std::size_t number) {
  Account& account = accounts.at(number);
  ++account.removalsBegun;
  const std::uint64_t begun = now++;
  registry.removeScopesWithTag(rt::make<Tag>(number));
  std::uint64_t last = account.lastRemoval;
  while (last < begun && !account.lastRemoval.compare_exchange_weak(last, begun)) {
  }
  ++account.removalsEnded;
}

// Checks what holds for every request, whatever the other threads do:
//
// - Every kind of request returns an instance, and nothing is reported.
// - A service with a new instance at every request has another instance each time.
// - An instance in an account's scope was made after every removal that ended before the request.
// - The requests of all threads get the same instance of an account, unless a removal overlaps with them.
// - An instance in the scope without tags stays the same for ever.
// - The registry's lock is free during callbacks: factories, destructors and the delegate.
//
// At the end, all scopes have ended. Then the registry has released all tags.
void request(SRLRegistry& registry, std::size_t api, std::size_t number) {
  const Account& account = accounts.at(number);
  const std::uint64_t ended = account.removalsEnded;
  const std::uint64_t begun = account.removalsBegun;
  const std::uint64_t lastRemoval = account.lastRemoval;
  // The tag lives only as long as this request, unless the registry retains it.
  const auto ask = [&] {
    const Ref<Tag> tag = rt::make<Tag>(number);
    const SRLScopeTagSet tags{{tag.get()}};
    switch (chance() % 8) {
      case 0:
        return registry.internalOptionalService(&apis.at(api), tags);
      case 1:
        return registry.eg_internalService(rt::String::fromUTF8(identifiers.at(api)),
                                           SRLScopeTagSetCodableWrapper::initWithTagSet(tags));
      default:
        return registry.internalService(&apis.at(api), tags);
    }
  };
  const Ref<rt::Object> first = ask();
  const Ref<rt::Object> second = ask();
  ASSERT_TRUE(first && second);
  if (isNew(api)) {
    EXPECT_NE(first, second);
  } else if (isOfAccount(api)) {
    const std::uint64_t madeAt = rt::cast<Instance>(first.get())->madeAt();
    EXPECT_GT(madeAt, lastRemoval);
    if (ended != begun || account.removalsBegun != begun) return;
    EXPECT_EQ(first, second);
    EXPECT_EQ(madeAt, model.expect(api, number, begun, madeAt));
  } else {
    EXPECT_EQ(first, second);
    const std::uint64_t madeAt = rt::cast<Instance>(first.get())->madeAt();
    EXPECT_EQ(madeAt, model.expect(api, kAccounts, 0, madeAt));
  }
}

// Checks the same for the multi-bound API. A request returns an instance of each implementation.
void requestMany(SRLRegistry& registry, std::size_t number) {
  const Account& account = accounts.at(number);
  const std::uint64_t ended = account.removalsEnded;
  const std::uint64_t begun = account.removalsBegun;
  const std::uint64_t lastRemoval = account.lastRemoval;
  const Ref<Tag> tag = rt::make<Tag>(number);
  const Ref<rt::Array> instances =
      registry.internalMultiBoundService(&apiOfMany, SRLScopeTagSet{{tag.get()}});
  ASSERT_TRUE(instances);
  ASSERT_EQ(instances->count(), kMany);
  std::size_t madeSince = 0;
  std::vector<std::uint64_t> madeAt;
  for (const Ref<rt::Object>& instance : *instances) {
    madeAt.push_back(rt::cast<Instance>(instance.get())->madeAt());
    if (madeAt.back() > lastRemoval) ++madeSince;
  }
  // All instances but those in the scope without tags.
  std::size_t expected = 0;
  for (std::size_t api = 0; api < kMany; ++api) {
    if (isNew(api) || isOfAccount(api)) ++expected;
  }
  EXPECT_GE(madeSince, expected);
  if (ended != begun || account.removalsBegun != begun) return;
  // The single-bound APIs have the same implementations, so their instances are among these.
  for (std::size_t api = 0; api < kMany; ++api) {
    if (isNew(api)) continue;
    const Ref<rt::Object> one = registry.internalService(&apis.at(api), SRLScopeTagSet{{tag.get()}});
    if (account.removalsBegun != begun) return;
    EXPECT_EQ(std::ranges::count(madeAt, rt::cast<Instance>(one.get())->madeAt()), 1);
  }
}

class Delegate final : public rt::Implements<Delegate, rt::Object, SRLScopeLifecycleDelegate> {
 public:
  void didRemoveScopesWithTag(const Ref<rt::Object>& /*tag*/,
                              const std::vector<rt::Weak<rt::Object>>& serviceInstances) override {
    takeTheLock();
    for (const rt::Weak<rt::Object>& instance : serviceInstances) static_cast<void>(instance.lock());
  }
};

TEST(SRLRegistryThreads, KeepAllInvariants) {
  std::atomic<int> reports{0};
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [&](const Ref<PECErrorDescription>&) { ++reports; });
  const Ref<SRLRegistry> registry = SRLRegistry::initPrivate();
  registry->internalRegisterBindings(std::array{&moduleOfAll()});
  const Ref<SRLRegistry> before = SRLRegistry::setSharedInstance(registry);
  const Ref<Delegate> delegate = rt::make<Delegate>();
  registry->setScopeLifecycleDelegate(delegate);

  model.clear();
  std::latch start(kThreads);
  std::vector<std::thread> threads;
  threads.reserve(kThreads);
  for (std::size_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&registry, &start, thread] {
      chance.seed(static_cast<unsigned>(thread + 1));
      start.arrive_and_wait();
      Ref<SRLRegistry> asked = registry;
      for (std::size_t i = 0; i < kRequests; ++i) {
        askedHere = asked.get();
        // Half of the requests are for one of a few APIs, so that threads make the same instances at once.
        const std::size_t choice = chance() % 2 == 0 ? kAPIs : kMany + (i / 100);
        const std::size_t api = chance() % choice;
        request(*asked, api, chance() % kAccounts);
        if (chance() % 8 == 0) requestMany(*asked, chance() % kAccounts);
        if (chance() % 50 == 0) removeScopesOf(*registry, chance() % kAccounts);
        // Copies use the scopes of the shared registry, too.
        askedHere = nullptr;
        if (chance() % 200 == 0) asked = chance() % 2 == 0 ? registry : registry->mutableCopy();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();

  for (std::size_t number = 0; number < kAccounts; ++number) removeScopesOf(*registry, number);
  EXPECT_EQ(tagsAlive, 0);
  EXPECT_EQ(reports, 0);
  SRLRegistry::setSharedInstance(before);
  PECErrorHandler::resetAfterTest();
}

// A request uses the registry that is shared at some moment during the request. That registry stays alive
// even if it is replaced meanwhile.
TEST(SRLRegistryThreads, RequestWhileTheSharedRegistryIsReplaced) {
  const Ref<SRLRegistry> asked = SRLRegistry::initPrivate();
  asked->internalRegisterBindings(std::array{&moduleOfAll()});
  const Ref<SRLRegistry> before = SRLRegistry::setSharedInstance(asked);
  std::atomic<bool> isOver{false};
  std::vector<std::thread> threads;
  threads.reserve(3);
  for (std::size_t thread = 0; thread < 3; ++thread) {
    threads.emplace_back([&] {
      const Ref<Tag> tag = rt::make<Tag>(std::size_t{0});
      // A service in the account's scope that needs no other service.
      for (std::size_t i = 0; i < kRequests; ++i) {
        EXPECT_TRUE(asked->internalService(&apis.at(1), SRLScopeTagSet{{tag.get()}}));
      }
    });
  }
  std::thread replacing([&] {
    while (!isOver) {
      SRLRegistry::setSharedInstance(asked->mutableCopy());
      SRLRegistry::setSharedInstance(asked);
    }
  });
  for (std::thread& thread : threads) thread.join();
  isOver = true;
  replacing.join();
  SRLRegistry::setSharedInstance(before);
}

}  // namespace
