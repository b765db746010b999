#include "Runtime/Locks/Lazy.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <stdexcept>
#include <thread>

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "tests/support/ForkTest.h"

namespace {

TEST(Lazy, MakesItsValueOnce) {
  static constinit rt::Lazy<int> value;
  int made = 0;
  const auto make = [&] { return ++made; };
  EXPECT_EQ(value.get(make), 1);
  EXPECT_EQ(value.get(make), 1);
  EXPECT_EQ(made, 1);
}

TEST(Lazy, MakesItsValueOnceForManyThreads) {
  static constinit rt::Lazy<int> value;
  std::atomic<int> made = 0;
  std::atomic<int> right = 0;
  std::array<std::thread, 8> threads;
  for (std::thread& each : threads) {
    each = std::thread([&] {
      if (value.get([&] {
            std::this_thread::yield();
            return ++made;
          }) == 1) {
        ++right;
      }
    });
  }
  for (std::thread& each : threads) each.join();
  EXPECT_EQ(made, 1);
  EXPECT_EQ(right, 8);
}

TEST(Lazy, TriesAgainAfterAnException) {
  static constinit rt::Lazy<int> value;
  EXPECT_THROW(value.get([]() -> int { throw std::runtime_error("not yet"); }), std::runtime_error);
  EXPECT_EQ(value.get([] { return 2; }), 2);
}

TEST(Lazy, NeverDestroysItsValue) {
  struct Ending {
    ~Ending() { ADD_FAILURE() << "destroyed"; }
  };
  const rt::Lazy<Ending> value;
  const_cast<rt::Lazy<Ending>&>(value).get([] { return Ending(); });
}

// With a static variable of a function, the child used to wait for ever.
TEST(Lazy, MakesItsValueInAForkedChildIfAnotherThreadWasMakingIt) {
  static constinit rt::Lazy<int> value;
  std::atomic<bool> isMaking = false;
  std::atomic<bool> mayEnd = false;
  std::thread maker([&] {
    value.get([&] {
      isMaking = true;
      isMaking.notify_one();
      mayEnd.wait(false);
      return 1;
    });
  });
  isMaking.wait(false);
  EXPECT_EQ(statusOfChild([&] { return value.get([] { return 2; }) == 2 ? 0 : 1; }), 0);
  mayEnd = true;
  mayEnd.notify_one();
  maker.join();
  EXPECT_EQ(value.get([] { return 3; }), 1);
}

#if !defined(__APPLE__)
TEST(LazyDeathTest, AskingForTheValueWhileMakingItEndsTheProgram) {
  static constinit rt::Lazy<int> value;
  EXPECT_DEATH(value.get([] { return value.get([] { return 1; }); }), "is taken again by thread");
}
#endif

}  // namespace
