#include "Runtime/Process/Private/CallStack.h"

#include <dlfcn.h>
#include <execinfo.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <regex>
#include <span>
#include <thread>
#include <vector>

#include "tests/support/AllocationCount.h"
#include "tests/support/Process.h"

// The test program exports these functions, so that symbols() can name them. Each does something after its
// call. So no call is a tail call, and each function has a frame.
// NOLINTBEGIN(misc-use-internal-linkage)
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
// NOLINTEND(misc-use-internal-linkage)

// The unwind tables of this function are wrong: they lead to the same frame again and again.
#if defined(__x86_64__) && defined(__linux__)
extern "C" std::size_t callFromStuckFrame(std::uint64_t* addresses, std::size_t size);
extern "C" std::size_t callStackTestCapture(std::uint64_t* addresses, std::size_t size);
extern "C" EXPORTED std::size_t callStackTestCapture(std::uint64_t* addresses, std::size_t size) {
  const std::size_t count = innermost({addresses, size});
  asm volatile("");
  return count;
}
asm(R"(
  .text
  .type callFromStuckFrame, @function
callFromStuckFrame:
  .cfi_startproc
  subq $8, %rsp
  .cfi_def_cfa %rsp, 0
  .cfi_offset %rip, -8
  call callStackTestCapture@PLT
  addq $8, %rsp
  ret
  .cfi_endproc
  .size callFromStuckFrame, . - callFromStuckFrame
)");
#endif

}  // namespace call_stack_test

namespace {

// A function that the program does not export.
[[gnu::noinline]] std::size_t hidden(std::span<std::uint64_t> addresses) {
  const std::size_t count = call_stack_test::innermost(addresses);
  asm volatile("");
  return count;
}

using namespace call_stack_test;
using testing::HasSubstr;
using testing::Not;

std::string symbolOf(const Addresses& addresses, std::size_t index) {
  return std::string(rt::CallStack::symbols(addresses).at(index).view());
}

TEST(CallStack, BeginsWithTheCallerOfCapture) {
  Addresses addresses{};
  const std::size_t count = middle(addresses);
  ASSERT_GT(count, 3U);
  EXPECT_THAT(symbolOf(addresses, 0), HasSubstr(" call_stack_test::innermost(std::"));
  EXPECT_THAT(symbolOf(addresses, 1), HasSubstr(" call_stack_test::middle(std::"));
}

TEST(CallStack, HasAFrameForEachCall) {
  Addresses shallow{};
  Addresses deep{};
  const std::size_t shallowCount = recursive(shallow, 1);
  const std::size_t deepCount = recursive(deep, 101);
  EXPECT_EQ(deepCount, shallowCount + 100);
  for (std::size_t i = 1; i < 101; ++i) EXPECT_THAT(symbolOf(deep, i), HasSubstr("recursive(")) << i;
}

TEST(CallStack, FindsTheCallersThatTheCLibraryFinds) {
  Addresses addresses{};
  const std::span own = std::span(addresses).first(middle(addresses));
  std::array<void*, 512> pointers{};
  const int count = backtrace(pointers.data(), pointers.size());
  std::vector<std::uint64_t> systems;
  for (void* pointer : std::span(pointers).first(static_cast<std::size_t>(count)))
    systems.push_back(reinterpret_cast<std::uint64_t>(pointer));
  // This function made both calls, at different places. The two stacks agree from its caller on. Sanitizers
  // add inner frames of their own.
  ASSERT_GT(own.size(), 3U);
  const auto systemsCaller = std::ranges::find(systems, own[3]);
  ASSERT_NE(systemsCaller, systems.end());
  EXPECT_LE(systemsCaller - systems.begin(), 2);
  EXPECT_TRUE(std::ranges::equal(own.subspan(3), std::ranges::subrange(systemsCaller, systems.end())));
}

// The rest of the array used to be filled with one address.
TEST(CallStack, EndsAtAFrameThatLeadsToItself) {
#if defined(__x86_64__) && defined(__linux__)
  Addresses addresses{};
  EXPECT_EQ(callFromStuckFrame(addresses.data(), addresses.size()), 3U);
  EXPECT_THAT(symbolOf(addresses, 2), HasSubstr(" callFromStuckFrame + "));
#else
  GTEST_SKIP() << "no wrong unwind tables for this machine";
#endif
}

TEST(CallStack, LeavesOutOuterFramesThatDoNotFit) {
  Addresses whole{};
  const std::size_t count = recursive(whole, 20);
  for (std::size_t capacity = 0; capacity < 10; ++capacity) {
    Addresses part{};
    EXPECT_EQ(recursive(std::span(part).first(capacity), 20), capacity);
    // The innermost frames are the same each time.
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

// Such functions used to appear only as a distance from the start of the image.
TEST(CallStackSymbols, NameFunctionsThatAreNotExported) {
  Addresses addresses{};
  hidden(addresses);
  EXPECT_THAT(
      symbolOf(addresses, 1),
      testing::MatchesRegex(
          R"(1   CallStack[a-z_]*_test +0x[0-9a-f]+ \(anonymous namespace\)::hidden\(.*\) \+ [0-9]+)"));
  const std::array start = {reinterpret_cast<std::uint64_t>(&hidden) + 7};
  EXPECT_THAT(std::string(rt::CallStack::symbols(start).at(0).view()), HasSubstr(") + 7"));
}

#ifdef __linux__
TEST(CallStackSymbols, IgnoreFilesThatAreDamagedOrNotTheLoadedOnes) {
  namespace fs = std::filesystem;
  const fs::path copy = fs::path(testing::TempDir()) / "call-stack-test.so";
  if (runProcess({"sh", "-c", "command -v cc"}).exitStatus != 0)
    GTEST_SKIP() << "no C compiler is called cc here";
  const ProcessResult built = runProcess(
      {"sh", "-ec",
       R"(printf 'static int hidden(int a) { return a + 1; }\nint (*shown)(int) = hidden;\n' | cc -shared -fPIC -x c -o "$1" -)",
       "sh", copy.string()});
  ASSERT_EQ(built.exitStatus, 0) << built.standardError;
  void* const image = dlopen(copy.c_str(), RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(image, nullptr) << dlerror();
  const auto* const function = static_cast<const std::uint64_t*>(dlsym(image, "shown"));
  const std::array addresses = {*function + 1};
  const auto symbol = [&] { return std::string(rt::CallStack::symbols(addresses).at(0).view()); };
  EXPECT_THAT(symbol(), HasSubstr(" hidden + 1"));

  std::string content;
  {
    std::ifstream stream(copy, std::ios::binary);
    content.assign(std::istreambuf_iterator<char>(stream), {});
  }
  const auto replaceBy = [&](std::string_view bytes) {
    // Makes a new file. The loaded one stays as it is.
    fs::remove(copy);
    std::ofstream(copy, std::ios::binary) << bytes;
  };
  replaceBy(content);
  EXPECT_THAT(symbol(), HasSubstr(" hidden + 1"));
  replaceBy("");
  EXPECT_THAT(symbol(), Not(HasSubstr("hidden")));
  std::mt19937 random(20'261'121);
  for (std::size_t round = 0; round < 3000; ++round) {
    std::string damaged = content;
    // The headers are at both ends of the file.
    const std::size_t ends = 2500;
    for (int i = 0; i < 4; ++i) {
      const std::size_t offset = random() % ends;
      damaged[round % 2 == 0 ? offset % 64 : damaged.size() - 1 - offset] = static_cast<char>(random());
    }
    if (round % 7 == 0) damaged.resize(random() % damaged.size());
    replaceBy(damaged);
    EXPECT_THAT(symbol(), testing::StartsWith("0   call-stack-test.so "));
  }
  fs::remove(copy);
  EXPECT_THAT(symbol(), Not(HasSubstr("hidden")));
  dlclose(image);
}
#endif

TEST(CallStackSymbols, HaveNoImageForAnUnknownAddress) {
  const std::array<std::uint64_t, 2> addresses = {0, 16};
  const std::vector<rt::String> lines = rt::CallStack::symbols(addresses);
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0], "0   ???                                 0x0000000000000000");
  EXPECT_EQ(lines[1], "1   ???                                 0x0000000000000010");
}

// The end of the name and the blank before the address used to be missing.
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

TEST(CallStackSymbols, AreEmptyForNoAddresses) {
  EXPECT_TRUE(rt::CallStack::symbols({}).empty());
}

}  // namespace
