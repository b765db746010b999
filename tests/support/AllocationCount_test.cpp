#include "tests/support/AllocationCount.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <memory>
#include <string>
#include <thread>

namespace {

class AllocationCountTest : public testing::Test {
 protected:
  void SetUp() override {
    if (!AllocationCount::isSupported()) GTEST_SKIP() << "allocations cannot be counted on this system";
  }
};

// Keeps the compiler from optimising the block away.
void use(const void* block) {
  asm volatile("" : : "r"(block) : "memory");
}

TEST_F(AllocationCountTest, IsZeroIfNothingIsAllocated) {
  const AllocationCount count;
  const int local = 0;
  use(&local);
  EXPECT_EQ(count.allocations(), 0);
  EXPECT_EQ(count.balance(), 0);
}

TEST_F(AllocationCountTest, CountsEveryAllocationFunction) {
  const AllocationCount count;
  auto made = std::make_unique<int>(1);
  use(made.get());
  EXPECT_EQ(count.allocations(), 1);

  struct alignas(256) Aligned {
    char bytes[256];
  };
  auto aligned = std::make_unique<Aligned>();
  use(aligned.get());
  EXPECT_EQ(count.allocations(), 2);

  void* block = std::calloc(1, 100);
  use(block);
  EXPECT_EQ(count.allocations(), 3);
  block = std::realloc(block, 100'000);  // NOLINT(bugprone-suspicious-realloc-usage)
  use(block);
  EXPECT_EQ(count.allocations(), 4);
  EXPECT_EQ(count.balance(), 3);
  std::free(block);

  const std::string inLibrary(100, 'x');
  use(inLibrary.data());
  EXPECT_EQ(count.allocations(), 5);
  EXPECT_EQ(count.balance(), 3);
}

TEST_F(AllocationCountTest, IgnoresOtherThreads) {
  std::thread thread;
  const AllocationCount before;
  thread = std::thread([] {
    for (int i = 0; i < 1000; ++i) use(std::make_unique<int>(i).get());
  });
  thread.join();
  EXPECT_LT(before.allocations(), 100);
}

}  // namespace
