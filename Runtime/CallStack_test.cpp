#include "Runtime/CallStack.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cmath>
#include <filesystem>
#include <regex>
#include <thread>

#include "tests/AllocationCount.h"

// The test program exports these, so that symbols() can name them. Each does something after its call, so
// that none of them leaves its frame to the function that it calls.
#define EXPORTED [[gnu::visibility("default"), gnu::noinline]]

namespace call_stack_test {

using Addresses = std::array<std::uint64_t, 512>;

EXPORTED std::size_t innermost(std::span<std::uint64_t> addresses) {
  const std::size_t count = rt::CallStack::capture(addresses);
  asm volatile("");
  return count;
}

EXPORTED std::size_t middle(std::span<std::uint64_t> addresses) {
  const std::size_t count = innermost(addresses);
  asm volatile("");
  return count;
}

EXPORTED std::size_t recursive(std::span<std::uint64_t> addresses, int depth) {
  const std::size_t count = depth == 0 ? innermost(addresses) : recursive(addresses, depth - 1);
  asm volatile("");
  return count;
}

}  // namespace call_stack_test

namespace {

using namespace call_stack_test;
using testing::HasSubstr;

std::string symbolOf(const Addresses& addresses, std::size_t index) {
  return std::string(rt::CallStack::symbols(addresses).at(index).view());
}

TEST(CallStack, BeginsWithTheFunctionThatAsked) {
  Addresses addresses{};
  const std::size_t count = middle(addresses);
  ASSERT_GT(count, 3U);
  EXPECT_THAT(symbolOf(addresses, 0), HasSubstr(" call_stack_test::innermost(std::span<unsigned long"));
  EXPECT_THAT(symbolOf(addresses, 1), HasSubstr(" call_stack_test::middle(std::span<unsigned long"));
}

TEST(CallStack, HasAFrameForEachCall) {
  Addresses shallow{};
  Addresses deep{};
  const std::size_t shallowCount = recursive(shallow, 1);
  const std::size_t deepCount = recursive(deep, 101);
  EXPECT_EQ(deepCount, shallowCount + 100);
  for (std::size_t i = 1; i < 101; ++i) EXPECT_THAT(symbolOf(deep, i), HasSubstr("recursive(")) << i;
}

TEST(CallStack, LeavesOutWhatDoesNotFit) {
  Addresses whole{};
  const std::size_t count = recursive(whole, 20);
  for (std::size_t capacity = 0; capacity < 10; ++capacity) {
    Addresses part{};
    EXPECT_EQ(recursive(std::span(part).first(capacity), 20), capacity);
    // The frames above this one are the same each time.
    EXPECT_TRUE(
        std::equal(part.begin(), part.begin() + static_cast<std::ptrdiff_t>(capacity), whole.begin()));
    EXPECT_EQ(part[capacity], 0U);
  }
  EXPECT_GT(count, 20U);
}

TEST(CallStack, AllocatesNothing) {
  if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
  Addresses addresses{};
  middle(addresses);
  const AllocationCount allocations;
  middle(addresses);
  EXPECT_EQ(allocations.allocations(), 0);
}

TEST(CallStack, WorksOnEveryThreadAndAfterAFork) {
  std::thread([] {
    Addresses addresses{};
    EXPECT_GT(middle(addresses), 2U);
  }).join();
  const pid_t child = fork();
  if (child == 0) {
    Addresses addresses{};
    _exit(middle(addresses) > 2 ? 0 : 1);
  }
  int status = -1;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0);
}

TEST(CallStackSymbols, SayNumberImageAddressAndFunction) {
  Addresses addresses{};
  middle(addresses);
  EXPECT_TRUE(std::regex_match(
      symbolOf(addresses, 1),
      std::regex(R"(1   CallStack_test +0x[0-9a-f]{16} call_stack_test::middle\(.*\) \+ [0-9]+)")))
      << symbolOf(addresses, 1);
}

TEST(CallStackSymbols, SayTheDistanceFromTheFunctionsStart) {
  const auto start = reinterpret_cast<std::uint64_t>(&middle);
  const std::array addresses = {start + 7};
  EXPECT_THAT(std::string(rt::CallStack::symbols(addresses).at(0).view()), HasSubstr(") + 7"));
}

TEST(CallStackSymbols, SayWhatIsKnownOfAnAddressOfNoFunction) {
  const std::array<std::uint64_t, 2> addresses = {0, 16};
  const std::vector<rt::String> lines = rt::CallStack::symbols(addresses);
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0], "0   ???                                 0x0000000000000000");
  EXPECT_EQ(lines[1], "1   ???                                 0x0000000000000010");
}

// Used to lose the end of the name, and the blank that parts it from the address.
TEST(CallStackSymbols, NameAnImageWithALongNameInFull) {
  namespace fs = std::filesystem;
  Dl_info information{};
  double (*const function)(double) = &std::cos;
  if (dladdr(reinterpret_cast<const void*>(function), &information) == 0 ||
      std::string(information.dli_fname).find(".so") == std::string::npos) {
    GTEST_SKIP() << "the mathematical library is no image of its own";
  }
  const std::string name = std::string(200, 'x') + ".so";
  const fs::path copy = fs::path(testing::TempDir()) / name;
  fs::copy_file(information.dli_fname, copy, fs::copy_options::overwrite_existing);
  void* const image = dlopen(copy.c_str(), RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(image, nullptr) << dlerror();
  const std::array addresses = {reinterpret_cast<std::uint64_t>(dlsym(image, "cos")) + 1};
  EXPECT_THAT(std::string(rt::CallStack::symbols(addresses).at(0).view()),
              testing::StartsWith("0   " + name + " 0x"));
  dlclose(image);
  fs::remove(copy);
}

TEST(CallStackSymbols, AreNoneForNoAddresses) {
  EXPECT_TRUE(rt::CallStack::symbols({}).empty());
}

}  // namespace
