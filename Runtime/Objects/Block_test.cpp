#include "Runtime/Objects/Block.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "Runtime/Objects/Weak.h"
#include "tests/support/AllocationCount.h"

namespace {

int twice(int value) {
  return 2 * value;
}

class Token final : public rt::Implements<Token, rt::Object> {};

static_assert(sizeof(rt::Block<void()>) == sizeof(void*));

TEST(Block, IsNullUntilItIsMade) {
  const rt::Block<void()> block;
  EXPECT_FALSE(block);
  EXPECT_TRUE(block == nullptr);
  EXPECT_EQ(block, rt::Block<void()>(nullptr));
  EXPECT_FALSE(block.object());
}

TEST(Block, IsMadeFromAnyCallable) {
  int base = 39;
  ++base;
  const rt::Block<int(int)> fromLambda = [base](int value) { return base + value; };
  EXPECT_EQ(fromLambda(2), 42);
  const rt::Block<int(int)> fromFunction = &twice;
  EXPECT_EQ(fromFunction(21), 42);
  const rt::Block<int(int)> fromFunctionName = twice;
  EXPECT_EQ(fromFunctionName(21), 42);
  const rt::Block<std::size_t(const std::string&)> fromMember = &std::string::size;
  EXPECT_EQ(fromMember("four"), 4U);
  const rt::Block<int(int)> fromNullPointer = static_cast<int (*)(int)>(nullptr);
  EXPECT_FALSE(fromNullPointer);
}

TEST(Block, DropsTheResultOfItsFunctionIfItReturnsVoid) {
  int calls = 0;
  const rt::Block<void()> block = [&calls] { return ++calls; };
  block();
  EXPECT_EQ(calls, 1);
}

TEST(Block, PassesArgumentsAsTheyAreDeclared) {
  const rt::Block<void(int&)> byReference = [](int& value) { ++value; };
  int value = 1;
  byReference(value);
  EXPECT_EQ(value, 2);

  const rt::Block<std::unique_ptr<int>(std::unique_ptr<int>)> byValue = [](std::unique_ptr<int> argument) {
    ++*argument;
    return argument;
  };
  EXPECT_EQ(*byValue(std::make_unique<int>(41)), 42);
}

TEST(Block, CapturesMoveOnlyValues) {
  const rt::Block<int()> block = [number = std::make_unique<int>(42)] { return *number; };
  const rt::Block<int()> copy = block;  // NOLINT(performance-unnecessary-copy-initialization)
  EXPECT_EQ(copy(), 42);
}

TEST(Block, KeepsItsStateBetweenCalls) {
  const rt::Block<int()> counter = [count = 0]() mutable { return ++count; };
  const rt::Block<int()> copy = counter;  // NOLINT(performance-unnecessary-copy-initialization)
  EXPECT_EQ(counter(), 1);
  EXPECT_EQ(copy(), 2);
}

TEST(Block, IsEqualToItsCopiesOnly) {
  int value = 1;
  const auto lambda = [&value] { return value; };
  const rt::Block<int()> one = lambda;
  const rt::Block<int()> another = lambda;
  const rt::Block<int()> copy = one;  // NOLINT(performance-unnecessary-copy-initialization)
  EXPECT_EQ(one, copy);
  EXPECT_NE(one, another);
}

TEST(Block, IsTheSameBlockEachTimeIfNothingIsCaptured) {
  const auto make = [] { return rt::Block<int()>([] { return 42; }); };
  EXPECT_EQ(make(), make());
  EXPECT_EQ(make()(), 42);
  EXPECT_NE(make(), rt::Block<int()>([] { return 42; }));
}

TEST(Block, IsAnObject) {
  const rt::Ref<Token> token = rt::make<Token>();
  const rt::Block<void()> block = [token] {};
  const rt::Ref<rt::Object> object = block.object();
  EXPECT_EQ(object->classInfo().name, "Block");
  EXPECT_TRUE(object->isEqual(block.object().get()));
  EXPECT_EQ(object, rt::Block<void()>(block).object());
}

TEST(Block, ReleasesItsCapturesWithItsLastReference) {
  rt::Ref<Token> token = rt::make<Token>();
  const rt::Weak<Token> weak = token;
  rt::Block<void()> block = [token = std::move(token)] {};
  std::optional<rt::Block<void()>> copy = block;
  block = nullptr;
  EXPECT_TRUE(weak.lock());
  copy.reset();
  EXPECT_FALSE(weak.lock());
}

TEST(Block, StaysAliveDuringACallThatClearsIt) {
  rt::Block<bool()> block;
  block = [&block, token = rt::make<Token>(), text = std::string(100, 'x')] {
    const rt::Weak<Token> weak = token;
    block = nullptr;
    return weak.lock() && text == std::string(100, 'x');
  };
  EXPECT_TRUE(block());
  EXPECT_FALSE(block);
}

TEST(Block, StaysAliveDuringACallThatThrows) {
  rt::Ref<Token> token = rt::make<Token>();
  const rt::Weak<Token> weak = token;
  rt::Block<void()> block;
  block = [&block, token = std::move(token)] {
    block = nullptr;
    throw std::runtime_error(token ? "kept" : "lost");
  };
  try {
    block();
    FAIL() << "the exception did not pass";
  } catch (const std::runtime_error& error) {
    EXPECT_STREQ(error.what(), "kept");
  }
  EXPECT_FALSE(weak.lock());
}

TEST(Block, AllocatesOnceAndOnlyForCaptures) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations on this system";
  int value = 1;
  const AllocationCount count;
  const rt::Block<int()> constant = [] { return 1; };
  rt::Block<int()> copyOfConstant = constant;
  EXPECT_EQ(count.allocations(), 0);
  const rt::Block<int()> capturing = [&value] { return value; };
  EXPECT_EQ(count.allocations(), 1);
  copyOfConstant = capturing;
  EXPECT_EQ(copyOfConstant() + constant() + capturing(), 3);
  EXPECT_EQ(count.allocations(), 1);
}

TEST(Block, CallKeptCallsTheBlockAndTrapsOnNull) {
  const rt::Block<std::uint32_t()> block = [token = rt::make<Token>()] { return 42U; };
  EXPECT_EQ(block.callKept(), 42U);
  EXPECT_DEATH(rt::Block<void()>().callKept(), "");
}

TEST(BlockDeathTest, EndsTheProgramWhenNullIsCalled) {
  testing::GTEST_FLAG(death_test_style) = "threadsafe";
  const rt::Block<int(int)> block;
  EXPECT_DEATH(static_cast<void>(block(1)), "rt: a null Block was called, from 0x");
}

// Every thread calls one block and drops references of its own to it. The captured object is destroyed once,
// at the end.
TEST(Block, IsSharedBetweenThreads) {
  constexpr int kThreads = 4;
  constexpr int kRounds = 2000;
  rt::Ref<Token> token = rt::make<Token>();
  const rt::Weak<Token> weak = token;
  std::atomic<int> calls = 0;
  rt::Block<void()> block = [&calls, token = std::move(token)] { calls.fetch_add(1); };
  std::vector<std::jthread> threads;
  threads.reserve(kThreads);
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([block] {
      for (int round = 0; round < kRounds; ++round) {
        const rt::Block<void()> mine = block;  // NOLINT(performance-unnecessary-copy-initialization)
        mine();
      }
    });
  }
  block = nullptr;
  threads.clear();
  EXPECT_EQ(calls, kThreads * kRounds);
  EXPECT_FALSE(weak.lock());
}

}  // namespace
