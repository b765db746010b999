// One registry and many threads.

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

// What the thread is asking: the shared registry, or a copy.
constinit thread_local SRLRegistry* askedHere = nullptr;

// Taken by all that is the user's own: a registry that held its lock meanwhile would end the program here.
void takeTheLock() {
  const Ref<SRLRegistry> shared = SRLRegistry::sharedInstance();
  {
    const rt::LockGuard guard(*shared->lock());
  }
  if (askedHere != nullptr) const rt::LockGuard guard(*askedHere->lock());
}

std::atomic<int> tagsAlive{0};

// An account or a window, equal by number.
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

// Counts all that happens.
std::atomic<std::uint64_t> now{1};

struct Account {
  std::atomic<std::uint64_t> removalsBegun{0};
  std::atomic<std::uint64_t> removalsEnded{0};
  // When the last removal that is over had begun.
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
// Some of the lowest level, for one API.
constexpr std::size_t kMany = 8;
constinit SRLAPIRegistrationData apiOfMany{.identifier = "APIsOfMany",
                                           .instanceType = {.names = {.className = "Instance"}},
                                           .scopeType = 0b1,
                                           .identifierLength = 10,
                                           .isMultibound = 1};
std::array<const SRLImplementationRegistrationData*, kMany + 1> many{};
std::array<std::string, kAPIs> identifiers;
thread_local std::minstd_rand chance;

// Each asks for a service of the level below, so that no instance needs itself.
template <std::size_t level>
Ref<rt::Object> makeInstance(SRLScopeTagSet tags) {
  takeTheLock();
  Ref<rt::Object> dependency;
  if constexpr (level > 0) {
    // The API's scope is that of the account; services without one have none to give.
    if (tags.tags[0] != nullptr) {
      const std::size_t below = ((level - 1) * kAPIsInLevel) + (chance() % kAPIsInLevel);
      dependency = SRLRegistry::sharedInstance()->internalService(&apis.at(below), tags);
    }
  }
  return rt::make<Instance>(std::move(dependency));
}

constexpr std::array<Ref<rt::Object> (*)(SRLScopeTagSet), kLevels> kFactories = {
    makeInstance<0>, makeInstance<1>, makeInstance<2>, makeInstance<3>};

// What the requests of all threads have got: an instance, by when it was made, of each API's implementation,
// for an account while none of its scopes is removed.
class Model {
 public:
  // What has been got first for the same.
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

// Ends the account's scopes, at times the same as other threads do.
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

// What holds for every request, whatever the other threads do:
// - a service comes out, however it is asked for, and nothing is reported;
// - one that is made anew each time is another each time;
// - one that lives in an account's scope was made after every removal that was over before the request;
// - requests of all threads get the same one unless a removal was under way before, or has begun since;
// - one that lives in no account's scope is the same for ever;
// - user code, that is factories, destructors and the delegate, finds the registry's lock free;
// and at the end, when all scopes have ended, no tag is left that the registry had retained.
void request(SRLRegistry& registry, std::size_t api, std::size_t number) {
  const Account& account = accounts.at(number);
  const std::uint64_t ended = account.removalsEnded;
  const std::uint64_t begun = account.removalsBegun;
  const std::uint64_t lastRemoval = account.lastRemoval;
  // The tag lives as long as this request only, unless the registry keeps it.
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

// The same for an API for many: all of them come out, each as above.
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
  // All but those that live in no account's scope.
  std::size_t expected = 0;
  for (std::size_t api = 0; api < kMany; ++api) {
    if (isNew(api) || isOfAccount(api)) ++expected;
  }
  EXPECT_GE(madeSince, expected);
  if (ended != begun || account.removalsBegun != begun) return;
  // Those of the APIs for one, which have the same implementations, are among them.
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

TEST(SRLRegistryThreads, KeepEveryPromise) {
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
        // Every other request is for one of a few, so that threads meet in their making.
        const std::size_t choice = chance() % 2 == 0 ? kAPIs : kMany + (i / 100);
        const std::size_t api = chance() % choice;
        request(*asked, api, chance() % kAccounts);
        if (chance() % 8 == 0) requestMany(*asked, chance() % kAccounts);
        if (chance() % 50 == 0) removeScopesOf(*registry, chance() % kAccounts);
        // Copies keep what is scoped in the shared registry, too.
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

// A request goes to the registry that is shared at some moment of it, which is whole however soon it is
// replaced.
TEST(SRLRegistryThreads, AskWhileTheSharedRegistryIsReplaced) {
  const Ref<SRLRegistry> asked = SRLRegistry::initPrivate();
  asked->internalRegisterBindings(std::array{&moduleOfAll()});
  const Ref<SRLRegistry> before = SRLRegistry::setSharedInstance(asked);
  std::atomic<bool> isOver{false};
  std::vector<std::thread> threads;
  threads.reserve(3);
  for (std::size_t thread = 0; thread < 3; ++thread) {
    threads.emplace_back([&] {
      const Ref<Tag> tag = rt::make<Tag>(std::size_t{0});
      // One that lives in the account's scope, and needs no other.
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
