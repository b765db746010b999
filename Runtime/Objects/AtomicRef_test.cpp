#include "Runtime/Objects/AtomicRef.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <thread>
#include <utility>
#include <vector>

#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Weak.h"
#include "tests/support/AllocationCount.h"
#include "tests/support/ForkTest.h"

namespace {

using rt::AtomicRef;
using rt::Ref;

// Holds two numbers that are equal as long as the object lives. `alive` counts the objects.
class Twins final : public rt::Implements<Twins, rt::Object> {
 public:
  explicit Twins(int number) : first_(number), second_(number) { ++alive; }
  ~Twins() override {
    first_ = -1;
    second_ = -2;
    --alive;
  }

  bool isWhole() const { return first_ == second_; }
  int number() const { return first_; }

  static inline std::atomic<int> alive = 0;

 private:
  int first_;
  int second_;
};

class AtomicRefTest : public testing::Test {
 protected:
  void TearDown() override { EXPECT_EQ(Twins::alive, 0); }
};

TEST_F(AtomicRefTest, StartsAsNull) {
  const AtomicRef<Twins> reference;
  EXPECT_FALSE(reference.load());
}

TEST_F(AtomicRefTest, ExchangeReturnsThePreviousObject) {
  AtomicRef<Twins> reference;
  EXPECT_FALSE(reference.exchange(rt::make<Twins>(1)));
  EXPECT_EQ(reference.load()->number(), 1);
  EXPECT_EQ(reference.exchange(rt::make<Twins>(2))->number(), 1);
  EXPECT_EQ(Twins::alive, 1);
  EXPECT_EQ(reference.exchange(nullptr)->number(), 2);
  EXPECT_FALSE(reference.load());
  EXPECT_EQ(Twins::alive, 0);
}

TEST_F(AtomicRefTest, RetainsItsObjectUntilItIsDestroyed) {
  rt::Weak<Twins> weak;
  {
    AtomicRef<Twins> reference;
    reference.exchange(rt::make<Twins>(1));
    weak = reference.load();
    EXPECT_TRUE(weak.lock());
  }
  EXPECT_FALSE(weak.lock());
}

TEST_F(AtomicRefTest, AReplacedObjectLivesUntilItsLastReferenceIsReleased) {
  AtomicRef<Twins> reference;
  reference.exchange(rt::make<Twins>(1));
  Ref<Twins> first = reference.load();
  const Ref<Twins> second = reference.load();
  reference.exchange(nullptr);
  EXPECT_EQ(Twins::alive, 1);
  first = nullptr;
  EXPECT_EQ(second->number(), 1);
}

TEST_F(AtomicRefTest, MayBeReplacedWithTheSameObject) {
  AtomicRef<Twins> reference;
  const Ref<Twins> twins = rt::make<Twins>(1);
  reference.exchange(twins);
  const Ref<Twins> read = reference.load();
  EXPECT_EQ(reference.exchange(twins), twins);
  EXPECT_EQ(reference.load(), twins);
}

TEST_F(AtomicRefTest, CompareExchangeReplacesOnlyTheExpectedObject) {
  AtomicRef<Twins> reference;
  const Ref<Twins> first = rt::make<Twins>(1);
  EXPECT_FALSE(reference.compareExchange(first, nullptr));
  EXPECT_TRUE(reference.compareExchange(nullptr, first));
  EXPECT_FALSE(reference.compareExchange(nullptr, rt::make<Twins>(2)));
  EXPECT_EQ(reference.load(), first);
  EXPECT_TRUE(reference.compareExchange(first, rt::make<Twins>(3)));
  EXPECT_EQ(reference.load()->number(), 3);
}

// Reads more often than one lot has counts, so that readers add to the lot. Keeps half of the references.
TEST_F(AtomicRefTest, LendsMoreReferencesThanOneLotHas) {
  AtomicRef<Twins> reference;
  reference.exchange(rt::make<Twins>(1));
  std::vector<Ref<Twins>> kept;
  for (int i = 0; i < 300'000; ++i) {
    Ref<Twins> read = reference.load();
    ASSERT_EQ(read->number(), 1);
    if (i % 2 == 0) kept.push_back(std::move(read));
  }
  reference.exchange(nullptr);
  EXPECT_EQ(Twins::alive, 1);
  kept.clear();
}

TEST_F(AtomicRefTest, ReadingAllocatesNothing) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  AtomicRef<Twins> reference;
  reference.exchange(rt::make<Twins>(1));
  const AllocationCount count;
  reference.load();
  EXPECT_EQ(count.allocations(), 0);
}

// Invariant: every object that is read is whole. No object is destroyed twice or leaked.
TEST_F(AtomicRefTest, ThreadsReadWhileOthersReplace) {
  AtomicRef<Twins> reference;
  reference.exchange(rt::make<Twins>(0));
  std::atomic<bool> isEnding = false;
  std::atomic<int> wrong = 0;
  std::array<std::thread, 4> readers;
  for (std::thread& each : readers) {
    each = std::thread([&] {
      Ref<Twins> kept;
      for (int i = 0; !isEnding; ++i) {
        Ref<Twins> read = reference.load();
        if (read && !read->isWhole()) ++wrong;
        if (i % 7 == 0) kept = std::move(read);
      }
      if (kept && !kept->isWhole()) ++wrong;
    });
  }
  std::array<std::thread, 2> writers;
  for (std::thread& each : writers) {
    each = std::thread([&] {
      for (int i = 0; i < 3000; ++i) {
        const Ref<Twins> known = reference.load();
        reference.compareExchange(known, rt::make<Twins>(i));
        if (i % 100 == 0) reference.exchange(nullptr);
        // Replaces the reference with the same object while references to it are lent.
        if (i % 50 == 0) reference.exchange(known);
      }
    });
  }
  for (std::thread& each : writers) each.join();
  isEnding = true;
  for (std::thread& each : readers) each.join();
  EXPECT_EQ(wrong, 0);
}

// Invariant: the child of a fork can read and replace, whatever the other threads were doing.
TEST_F(AtomicRefTest, IsUsableInTheChildOfAFork) {
  AtomicRef<Twins> reference;
  reference.exchange(rt::make<Twins>(0));
  std::atomic<bool> isEnding = false;
  std::thread reader([&] {
    while (!isEnding) reference.load();
  });
  std::thread writer([&] {
    while (!isEnding) reference.exchange(rt::make<Twins>(1));
  });
  int status = 0;
  for (int i = 0; i < 100 && status == 0; ++i) {
    status = statusOfChild([&] {
      if (!reference.load()->isWhole()) return 1;
      reference.exchange(rt::make<Twins>(2));
      return reference.load()->number() == 2 ? 0 : 2;
    });
  }
  isEnding = true;
  reader.join();
  writer.join();
  EXPECT_EQ(status, 0);
}

}  // namespace
