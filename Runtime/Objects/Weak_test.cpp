#include "Runtime/Objects/Weak.h"

#include <gtest/gtest.h>

#include <atomic>
#include <barrier>
#include <memory>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "tests/support/AllocationCount.h"

namespace {

struct Delegate : rt::Protocol<Delegate> {
  virtual int answer() const = 0;

 protected:
  ~Delegate() = default;
};

struct Other : rt::Protocol<Other> {
 protected:
  ~Other() = default;
};

// Changes its answer in its destructor, so that a test notices an object that is being destroyed.
class Listener : public rt::Implements<Listener, rt::Object, Other, Delegate> {
 public:
  explicit Listener(std::atomic<int>* destructions = nullptr) : destructions_(destructions) {}
  ~Listener() override {
    answer_ = 0;
    if (destructions_ != nullptr) ++*destructions_;
  }
  int answer() const override { return answer_; }

 private:
  int answer_ = 42;
  std::atomic<int>* destructions_;
};

class Constant final : public rt::Implements<Constant, rt::Object> {
 public:
  constexpr Constant() : Implements(Immortal()) {}
  constexpr ~Constant() override {}  // NOLINT(modernize-use-equals-default)
};

constexpr Constant kConstant;

TEST(Weak, RefersToNothingUntilItIsMade) {
  const rt::Weak<Listener> weak;
  EXPECT_FALSE(weak.lock());
  EXPECT_FALSE(rt::Weak<Listener>(nullptr).lock());
  EXPECT_FALSE(rt::Weak<Listener>(static_cast<Listener*>(nullptr)).lock());
  EXPECT_FALSE(rt::Weak<Delegate>(rt::Ref<Listener>()).lock());
}

TEST(Weak, LocksNullOnceTheObjectIsGone) {
  std::atomic<int> destructions = 0;
  rt::Ref<Listener> listener = rt::make<Listener>(&destructions);
  const rt::Weak<Listener> weak = listener;
  EXPECT_EQ(weak.lock(), listener);
  EXPECT_EQ(destructions, 0);
  listener = nullptr;
  EXPECT_EQ(destructions, 1);
  EXPECT_FALSE(weak.lock());
}

TEST(Weak, LocksAReferenceThatKeepsTheObjectAlive) {
  rt::Ref<Listener> listener = rt::make<Listener>();
  const rt::Weak<Listener> weak = listener;
  const rt::Ref<Listener> locked = weak.lock();
  listener = nullptr;
  EXPECT_EQ(locked->answer(), 42);
  EXPECT_TRUE(weak.lock());
}

TEST(Weak, MayReferToAProtocol) {
  rt::Ref<Listener> listener = rt::make<Listener>();
  const rt::Weak<Delegate> fromClass = listener;
  const rt::Ref<Delegate> delegate = listener;
  const rt::Weak<Delegate> fromProtocol = delegate;
  const rt::Weak<rt::Object> ofRoot = listener;
  EXPECT_EQ(fromClass.lock(), delegate);
  EXPECT_EQ(fromProtocol.lock()->answer(), 42);
  EXPECT_EQ(ofRoot.lock(), listener);
}

TEST(Weak, IsCopiedMovedAndReplaced) {
  rt::Ref<Listener> one = rt::make<Listener>();
  const rt::Ref<Listener> another = rt::make<Listener>();
  rt::Weak<Listener> weak = one;
  const rt::Weak<Listener> copy = weak;
  rt::Weak<Listener> moved = std::move(weak);
  EXPECT_FALSE(weak.lock());  // NOLINT(bugprone-use-after-move)
  EXPECT_EQ(copy.lock(), one);
  EXPECT_EQ(moved.lock(), one);
  moved = another;
  EXPECT_EQ(moved.lock(), another);
  moved = copy;
  auto& same = moved;
  moved = same;
  EXPECT_EQ(moved.lock(), one);
  one = nullptr;
  EXPECT_FALSE(copy.lock());
  EXPECT_FALSE(moved.lock());
  moved = nullptr;
  EXPECT_FALSE(moved.lock());
}

TEST(Weak, RefersToNothingInTheObjectsDestructor) {
  struct Seen {
    bool throughOld = true;
    bool throughNew = true;
  };
  class Dying final : public rt::Implements<Dying, rt::Object> {
   public:
    explicit Dying(Seen& seen) : seen_(seen) {}
    ~Dying() override {
      seen_.throughOld = old.lock() != nullptr;
      seen_.throughNew = rt::Weak<Dying>(this).lock() != nullptr;
    }
    rt::Weak<Dying> old;

   private:
    Seen& seen_;
  };
  Seen seen;
  {
    const rt::Ref<Dying> dying = rt::make<Dying>(seen);
    dying->old = dying;
    EXPECT_TRUE(dying->old.lock());
  }
  EXPECT_FALSE(seen.throughOld);
  EXPECT_FALSE(seen.throughNew);
  seen = {};
  rt::make<Dying>(seen) = nullptr;
  EXPECT_FALSE(seen.throughNew) << "where there was no weak reference before";
}

TEST(Weak, MayReferToAConstant) {
  const rt::Weak<const Constant> weak = &kConstant;
  EXPECT_EQ(weak.lock().get(), &kConstant);
}

TEST(Weak, AllocatesForTheFirstReferenceOnly) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations on this system";
  rt::Ref<Listener> listener = rt::make<Listener>();
  const AllocationCount count;
  std::optional<rt::Weak<Listener>> first = listener;
  EXPECT_EQ(count.allocations(), 1);
  {
    const rt::Weak<Delegate> second = listener;
    const rt::Weak<Delegate> third = second;  // NOLINT(performance-unnecessary-copy-initialization)
    EXPECT_TRUE(third.lock());
  }
  EXPECT_EQ(count.allocations(), 1);
  listener = nullptr;
  EXPECT_EQ(count.balance(), 0) << "the object is freed, its cell is not";
  first.reset();
  EXPECT_EQ(count.balance(), -1) << "the cell is freed with the last weak reference";
}

// One thread releases the last reference while others call `lock`. Each of them gets null or an object that
// stays whole until it is released. The object is destroyed once.
TEST(Weak, LocksNullOrTheWholeObjectDuringTheLastRelease) {
  constexpr int kRounds = 3000;
  constexpr int kLockers = 2;
  std::atomic<int> destructions = 0;
  std::atomic<int> wrongAnswers = 0;
  rt::Ref<Listener> strong;
  rt::Weak<Delegate> weak;
  std::barrier barrier(kLockers + 1);
  {
    std::vector<std::jthread> threads;
    threads.reserve(kLockers);
    for (int i = 0; i < kLockers; ++i) {
      threads.emplace_back([&] {
        for (int round = 0; round < kRounds; ++round) {
          barrier.arrive_and_wait();
          while (const rt::Ref<Delegate> locked = weak.lock()) {
            if (locked->answer() != 42) ++wrongAnswers;
          }
          barrier.arrive_and_wait();
        }
      });
    }
    for (int round = 0; round < kRounds; ++round) {
      strong = rt::make<Listener>(&destructions);
      weak = strong;
      barrier.arrive_and_wait();
      strong = nullptr;
      barrier.arrive_and_wait();
      ASSERT_EQ(destructions, round + 1);
    }
  }
  EXPECT_EQ(wrongAnswers, 0);
}

// Threads that make the first weak reference at the same time share one cell. All of them see that the object
// is gone.
TEST(Weak, ManyThreadsMakeTheFirstReferenceAtOnce) {
  constexpr int kRounds = 2000;
  constexpr int kThreads = 3;
  rt::Ref<Listener> strong;
  std::vector<rt::Weak<Listener>> weaks(kThreads);
  std::barrier barrier(kThreads + 1);
  std::vector<std::jthread> threads;
  threads.reserve(kThreads);
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([&, place = &weaks[static_cast<std::size_t>(i)]] {
      for (int round = 0; round < kRounds; ++round) {
        barrier.arrive_and_wait();
        *place = strong;
        barrier.arrive_and_wait();
      }
    });
  }
  for (int round = 0; round < kRounds; ++round) {
    strong = rt::make<Listener>();
    barrier.arrive_and_wait();
    barrier.arrive_and_wait();
    for (const auto& weak : weaks) EXPECT_EQ(weak.lock(), strong);
    strong = nullptr;
    for (const auto& weak : weaks) EXPECT_FALSE(weak.lock());
  }
}

}  // namespace
