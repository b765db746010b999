// Tests both classes of call stacks.

#include "Shared/Logging/LUMLogCallstack.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <initializer_list>
#include <limits>
#include <string>
#include <vector>

#include "Runtime/Process/Private/CallStack.h"
#include "Runtime/Text/Format.h"
#include "Runtime/Values/Number.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"

namespace {

using namespace rt::literals;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

constexpr std::uint64_t kMany = std::numeric_limits<std::uint64_t>::max();

rt::Ref<LUMLogAddressCallstack> addresses(std::initializer_list<std::uint64_t> values,
                                          std::uint64_t ignoreFrameCount = 0) {
  auto* buffer = static_cast<std::uint64_t*>(std::malloc((values.size() + 1) * sizeof(std::uint64_t)));
  std::ranges::copy(values, buffer);
  return LUMLogAddressCallstack::initWithAddresses(buffer, values.size(), ignoreFrameCount);
}

std::vector<std::uint64_t> kept(const LUMLogAddressCallstack& stack) {
  std::vector<std::uint64_t> result;
  stack.enumerateAddressesWithBlock(
      [&](std::uint64_t address, std::uint64_t /*index*/, bool* /*stop*/) { result.push_back(address); });
  return result;
}

std::string symbolOf(std::uint64_t address) {
  return std::string(rt::CallStack::symbols(std::array{address}).front().view());
}

std::vector<std::string> linesOf(const LUMLogSymbolCallstack& stack) {
  std::vector<std::string> lines;
  for (std::size_t i = 0; i < stack.symbols()->count(); ++i) {
    lines.emplace_back(stack.symbols()->stringAt(i).view());
  }
  return lines;
}

// These functions have frames of their own.

[[gnu::noinline]] rt::Ref<LUMLogAddressCallstack> innerTakesAddresses(std::uint64_t count) {
  auto stack = LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(count);
  rt::CallStack::keepFrame();
  return stack;
}

[[gnu::noinline]] rt::Ref<LUMLogAddressCallstack> outerTakesAddresses(std::uint64_t count) {
  auto stack = innerTakesAddresses(count);
  rt::CallStack::keepFrame();
  return stack;
}

[[gnu::noinline]] rt::Ref<LUMLogAddressCallstack> callerInitializesWithAddresses(std::uint64_t count) {
  auto stack = LUMLogAddressCallstack::initWithAddressesIgnoringFrameCount(count);
  rt::CallStack::keepFrame();
  return stack;
}

[[gnu::noinline]] rt::Ref<LUMLogSymbolCallstack> innerTakesSymbols(std::uint64_t count) {
  auto stack = LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(count);
  rt::CallStack::keepFrame();
  return stack;
}

[[gnu::noinline]] rt::Ref<LUMLogSymbolCallstack> outerTakesSymbols(std::uint64_t count) {
  auto stack = innerTakesSymbols(count);
  rt::CallStack::keepFrame();
  return stack;
}

// Calls `function` below `depth` frames of this function.
[[gnu::noinline]] void descend(int depth, const std::function<void()>& function) {
  if (depth > 0) {
    descend(depth - 1, function);
  } else {
    function();
  }
  rt::CallStack::keepFrame();
}

TEST(LUMLogAddressCallstack, LeavesOutTheInnermostFrames) {
  const std::vector<std::uint64_t> all = kept(*outerTakesAddresses(0));
  ASSERT_GT(all.size(), 2U);
  EXPECT_THAT(symbolOf(all[0]), HasSubstr("innerTakesAddresses"));
  EXPECT_THAT(symbolOf(all[1]), HasSubstr("outerTakesAddresses"));

  const rt::Ref<LUMLogAddressCallstack> fewer = outerTakesAddresses(1);
  EXPECT_EQ(fewer->frameCount(), all.size() - 1);
  EXPECT_THAT(symbolOf(kept(*fewer).front()), HasSubstr("outerTakesAddresses"));
}

TEST(LUMLogAddressCallstack, BeginsWithTheCallerOfTheInitializer) {
  const std::vector<std::uint64_t> all = kept(*callerInitializesWithAddresses(0));
  EXPECT_THAT(symbolOf(all[0]), HasSubstr("callerInitializesWithAddresses"));
}

TEST(LUMLogAddressCallstack, IsNullIfNoFrameIsLeft) {
  const std::uint64_t depth = outerTakesAddresses(0)->frameCount();
  EXPECT_EQ(outerTakesAddresses(depth - 1)->frameCount(), 1U);
  EXPECT_FALSE(outerTakesAddresses(depth));
  EXPECT_FALSE(outerTakesAddresses(depth + 1));
  EXPECT_FALSE(outerTakesAddresses(kMany));
  EXPECT_FALSE(callerInitializesWithAddresses(kMany));
}

TEST(LUMLogAddressCallstack, CapturesStacksOfAnyDepth) {
  std::uint64_t depth = 0;
  descend(0, [&] { depth = innerTakesAddresses(0)->frameCount(); });
  // One below, at and above each size of the capture's buffer: 128, 256, 512.
  for (const int size : {127, 128, 129, 255, 256, 257, 511, 512, 513, 3000}) {
    const int added = size - static_cast<int>(depth);
    descend(added, [&] { EXPECT_EQ(innerTakesAddresses(0)->frameCount(), std::uint64_t(size)); });
  }
}

TEST(LUMLogAddressCallstack, HoldsTheGivenAddresses) {
  EXPECT_THAT(kept(*addresses({1, 2, 3})), ElementsAre(1, 2, 3));
  EXPECT_THAT(kept(*addresses({1, 2, 3}, 1)), ElementsAre(2, 3));
  EXPECT_EQ(addresses({1, 2, 3}, 1)->frameCount(), 2U);
  EXPECT_THAT(kept(*addresses({1, 2, 3}, 3)), IsEmpty());
  EXPECT_EQ(LUMLogAddressCallstack::initWithAddresses(nullptr, 0, 0)->frameCount(), 0U);
}

TEST(LUMLogAddressCallstack, HoldsTheValuesOfNumbers) {
  const auto stack = LUMLogAddressCallstack::initWithAddresses(
      rt::Array::of(rt::Number::of(7), rt::Number::of(-1), "no number"_s, rt::Number::of(kMany - 1)));
  EXPECT_THAT(kept(*stack), ElementsAre(7, kMany, 0, kMany - 1));
  EXPECT_EQ(LUMLogAddressCallstack::initWithAddresses(rt::make<rt::Array>())->frameCount(), 0U);
  EXPECT_EQ(LUMLogAddressCallstack::initWithAddresses(rt::Ref<rt::Array>())->frameCount(), 0U);
}

TEST(LUMLogAddressCallstack, EnumeratesAddressesUntilStopped) {
  std::vector<std::pair<std::uint64_t, std::uint64_t>> visited;
  const auto visit = [&](std::uint64_t last) {
    visited.clear();
    addresses({9, 10, 11, 12}, 1)
        ->enumerateAddressesWithBlock([&](std::uint64_t address, std::uint64_t index, bool* stop) {
          EXPECT_FALSE(*stop);
          visited.emplace_back(address, index);
          *stop = index == last;
        });
  };
  visit(kMany);
  EXPECT_THAT(visited, ElementsAre(std::pair(10, 0), std::pair(11, 1), std::pair(12, 2)));
  visit(1);
  EXPECT_THAT(visited, ElementsAre(std::pair(10, 0), std::pair(11, 1)));
  visit(0);
  EXPECT_THAT(visited, ElementsAre(std::pair(10, 0)));
  addresses({1})->enumerateAddressesWithBlock(nullptr);
}

TEST(LUMLogAddressCallstack, DescribesItself) {
  const auto one = addresses({0x10});
  EXPECT_EQ(one->description(),
            rt::format("<LUMLogAddressCallstack %p> { 0x10 }", static_cast<const void*>(one.get())));
  const auto several = addresses({1, 0x10, 0xab, 0xffffffffffffffff}, 1);
  EXPECT_EQ(several->description(),
            rt::format("<LUMLogAddressCallstack %p> { 0x10, 0xab, 0xffffffffffffffff }",
                       static_cast<const void*>(several.get())));
  const auto none = addresses({1}, 1);
  EXPECT_EQ(none->description(),
            rt::format("<LUMLogAddressCallstack %p> {  }", static_cast<const void*>(none.get())));
}

TEST(LUMLogAddressCallstack, ComparesAddressesThatAreNotLeftOut) {
  const auto stack = addresses({1, 2, 3}, 1);
  EXPECT_TRUE(stack->isEqual(stack.get()));
  EXPECT_TRUE(rt::isEqual(stack, addresses({2, 3})));
  EXPECT_TRUE(rt::isEqual(stack, addresses({8, 9, 2, 3}, 2)));
  EXPECT_FALSE(rt::isEqual(stack, addresses({2, 4})));
  EXPECT_FALSE(rt::isEqual(stack, addresses({2})));
  EXPECT_FALSE(rt::isEqual(stack, addresses({2, 3, 4})));
  EXPECT_TRUE(rt::isEqual(addresses({1}, 1), addresses({})));
  EXPECT_FALSE(stack->isEqual(nullptr));
  EXPECT_FALSE(stack->isEqual(LUMLogSymbolCallstack::initWithSymbols(nullptr).get()));
  EXPECT_EQ(stack->hash(), 2U);
  EXPECT_EQ(addresses({1}, 1)->hash(), 0U);
  EXPECT_EQ(stack->copy(), stack);
}

TEST(LUMLogSymbolCallstack, LeavesOutTheInnermostFrames) {
  const std::vector<std::string> all = linesOf(*outerTakesSymbols(0));
  ASSERT_GT(all.size(), 2U);
  EXPECT_THAT(all[0], HasSubstr("innerTakesSymbols"));
  EXPECT_THAT(all[1], HasSubstr("outerTakesSymbols"));
  // Lines keep their numbers in the whole stack, and the first line is left out.
  EXPECT_THAT(all[0], testing::StartsWith("1 "));

  const std::vector<std::string> fewer = linesOf(*outerTakesSymbols(1));
  EXPECT_EQ(fewer.size(), all.size() - 1);
  EXPECT_THAT(fewer[0], HasSubstr("outerTakesSymbols"));
  EXPECT_THAT(fewer[0], testing::StartsWith("2 "));
}

TEST(LUMLogSymbolCallstack, IsNullIfThereAreTooFewFrames) {
  const std::uint64_t depth = outerTakesSymbols(0)->symbols()->count();
  EXPECT_EQ(outerTakesSymbols(depth - 1)->symbols()->count(), 1U);
  // The stack has exactly this many frames, counting the capturing function. An empty result is no failure.
  ASSERT_TRUE(outerTakesSymbols(depth));
  EXPECT_TRUE(outerTakesSymbols(depth)->symbols()->isEmpty());
  EXPECT_FALSE(outerTakesSymbols(depth + 1));
  EXPECT_FALSE(outerTakesSymbols(kMany));
}

TEST(LUMLogSymbolCallstack, CapturesStacksOfAnyDepth) {
  std::size_t depth = 0;
  descend(0, [&] { depth = innerTakesSymbols(0)->symbols()->count(); });
  for (const int size : {126, 127, 128, 129, 300}) {
    descend(size - static_cast<int>(depth),
            [&] { EXPECT_EQ(innerTakesSymbols(0)->symbols()->count(), std::size_t(size)); });
  }
}

TEST(LUMLogSymbolCallstack, BehavesAsItsSymbolsDo) {
  const rt::Ref<rt::Array> symbols = rt::Array::of("one"_s, "two"_s);
  const auto stack = LUMLogSymbolCallstack::initWithSymbols(symbols);
  EXPECT_EQ(stack->symbols(), symbols);
  EXPECT_EQ(stack->description(), symbols->description());
  EXPECT_EQ(stack->hash(), symbols->hash());
  EXPECT_TRUE(stack->isEqual(stack.get()));
  EXPECT_TRUE(rt::isEqual(stack, LUMLogSymbolCallstack::initWithSymbols(rt::Array::of("one"_s, "two"_s))));
  EXPECT_FALSE(rt::isEqual(stack, LUMLogSymbolCallstack::initWithSymbols(rt::Array::of("one"_s))));
  EXPECT_FALSE(rt::isEqual(stack, LUMLogSymbolCallstack::initWithSymbols(nullptr)));
  EXPECT_FALSE(stack->isEqual(nullptr));
  EXPECT_FALSE(stack->isEqual(symbols.get()));
  EXPECT_EQ(stack->copy(), stack);

  const auto none = LUMLogSymbolCallstack::initWithSymbols(nullptr);
  EXPECT_TRUE(none->description().isNull());
  EXPECT_EQ(none->hash(), 0U);
  EXPECT_TRUE(rt::isEqual(none, LUMLogSymbolCallstack::initWithSymbols(nullptr)));
}

}  // namespace
