// Many threads that request the same instances, or different ones, at the same time.

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <latch>
#include <memory>
#include <numeric>
#include <random>
#include <thread>
#include <vector>

#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScope.h"
#include "tests/support/TestFactories.h"

namespace {

using rt::Ref;
using Factory = rt::Block<Ref<rt::Object>()>;

// Each factory waits until the other one runs, too.
TEST(SRLMemoizingScopeThreads, MakeDifferentInstancesAtTheSameTime) {
  const Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
  const std::array<char, 2> places{};
  std::latch bothRun(2);
  const Factory factory = [&] {
    bothRun.arrive_and_wait();
    return makeInstance();
  };
  std::thread other([&] { scope->instanceForIdentifier(&places.back(), nullptr, factory); });
  EXPECT_TRUE(scope->instanceForIdentifier(&places.front(), nullptr, factory));
  other.join();
  EXPECT_EQ(scope->instances()->count(), 2U);
}

// This thread requests the instance while the other one's factory runs. It may still be so late that it finds
// the finished instance. The flag tells that, and the test tries again.
TEST(SRLMemoizingScopeThreads, WaitForAnInstanceThatIsBeingMade) {
  constexpr int kMostTries = 1000;
  bool hasWaited = false;
  for (int i = 0; i < kMostTries && !hasWaited; ++i) {
    const Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
    std::latch isMaking(1);
    std::latch isAsking(1);
    bool isCreated = false;
    Ref<rt::Object> made;
    const Factory factory = [&] {
      isMaking.count_down();
      isAsking.wait();
      for (int give = 0; give < 100; ++give) std::this_thread::yield();
      return makeInstance();
    };
    std::thread creator([&] { made = scope->instanceForIdentifier(&scope, &isCreated, factory); });
    isMaking.wait();
    isAsking.count_down();
    bool isCreatedHere = true;
    const Ref<rt::Object> got = scope->instanceForIdentifier(&scope, &isCreatedHere, mustNotRun);
    creator.join();
    EXPECT_TRUE(isCreated);
    EXPECT_TRUE(got);
    EXPECT_EQ(got, made);
    hasWaited = !isCreatedHere;
  }
  EXPECT_TRUE(hasWaited);
}

// Two scopes with the same identifiers and with factories of several kinds. A nested factory requests only
// later instances, of either scope.
class Workshop {
 public:
  static constexpr std::size_t kIdentifiers = 10'000;
  static constexpr std::size_t kOrders = 2 * kIdentifiers;

  // The state of an identifier in a scope.
  struct Order {
    enum Kind : std::uint8_t { kPlain, kNull, kSlow, kYielding, kNested };
    Kind kind = kPlain;
    std::vector<std::size_t> needed;
    std::atomic<int> runs = 0;
    std::atomic<int> flags = 0;
    // Written by the factory, and read by every thread that got the instance.
    Ref<rt::Object> made;
  };

  explicit Workshop(std::uint32_t seed) {
    std::mt19937 random(seed);
    for (std::size_t i = 0; i < kOrders; ++i) {
      orders_[i].kind = static_cast<Order::Kind>(random() % 5);
      if (orders_[i].kind != Order::kNested) continue;
      for (std::size_t count = 1 + random() % 3; count > 0; --count) {
        if (const std::size_t needed = i + 1 + random() % 64; needed < kOrders) {
          orders_[i].needed.push_back(needed);
        }
      }
    }
  }

  void ask(std::size_t index) {
    Order& order = orders_[index];
    bool isCreated = false;
    const Ref<rt::Object> got =
        scopes_[index % 2]->instanceForIdentifier(&identifiers_[index / 2], &isCreated, [&] {
          order.runs.fetch_add(1, std::memory_order_relaxed);
          order.made = make(order);
          return order.made;
        });
    if (isCreated) order.flags.fetch_add(1, std::memory_order_relaxed);
    if (got != order.made) strangers_.fetch_add(1, std::memory_order_relaxed);
  }

  const Order& order(std::size_t index) const { return orders_[index]; }
  int strangers() const { return strangers_; }
  std::size_t countOfInstances() const {
    return scopes_[0]->instances()->count() + scopes_[1]->instances()->count();
  }

 private:
  Ref<rt::Object> make(const Order& order) {
    switch (order.kind) {
      case Order::kNull:
        return nullptr;
      case Order::kSlow:
        makeMany();
        break;
      case Order::kYielding:
        for (int i = 0; i < 3; ++i) std::this_thread::yield();
        break;
      default:
        for (const std::size_t needed : order.needed) ask(needed);
    }
    return rt::make<Instance>();
  }

  static void makeMany() {
    std::vector<Ref<rt::Object>> many;
    for (int i = 0; i < 100; ++i) many.emplace_back(rt::make<Instance>());
  }

  const std::array<Ref<SRLMemoizingScope>, 2> scopes_ = {SRLMemoizingScope::init(),
                                                         SRLMemoizingScope::init()};
  std::vector<Order> orders_ = std::vector<Order>(kOrders);
  std::vector<char> identifiers_ = std::vector<char>(kIdentifiers);
  std::atomic<int> strangers_ = 0;
};

// Invariant: each factory runs once, every request returns its result, and exactly one request sets the flag
// to true. Half of the threads make their requests in the same order, and so at about the same time.
TEST(SRLMemoizingScopeThreads, MakeEachInstanceOnce) {
  constexpr std::uint32_t kThreads = 8;
  const auto workshop = std::make_unique<Workshop>(41);
  std::latch start(kThreads);
  std::vector<std::thread> threads;
  for (std::uint32_t i = 0; i < kThreads; ++i) {
    threads.emplace_back([&, seed = i / 2 * 2 == i ? 0 : i] {
      std::vector<std::size_t> indices(Workshop::kOrders);
      std::iota(indices.begin(), indices.end(), std::size_t{0});
      std::ranges::shuffle(indices, std::mt19937(seed));
      start.arrive_and_wait();
      for (const std::size_t index : indices) workshop->ask(index);
    });
  }
  for (std::thread& thread : threads) thread.join();
  std::size_t count = 0;
  for (std::size_t i = 0; i < Workshop::kOrders; ++i) {
    const Workshop::Order& order = workshop->order(i);
    ASSERT_EQ(order.runs, 1) << i;
    ASSERT_EQ(order.flags, 1) << i;
    ASSERT_EQ(order.made == nullptr, order.kind == Workshop::Order::kNull) << i;
    if (order.made) ++count;
  }
  EXPECT_EQ(workshop->strangers(), 0);
  EXPECT_EQ(workshop->countOfInstances(), count);
}

}  // namespace
