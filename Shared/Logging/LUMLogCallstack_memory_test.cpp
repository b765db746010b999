// When memory runs out, capturing a call stack returns null and throws nothing. Allocations here fail on
// demand.

#include <gtest/gtest.h>

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <new>

#include "Runtime/Process/Private/CallStack.h"
#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "tests/support/Sanitizers.h"

// Whether malloc and its relatives fail too, if the C library lets a program replace them.
#if defined(__GLIBC__) && !RT_TEST_ADDRESS_SANITIZER && !RT_TEST_THREAD_SANITIZER
#define FAILS_MALLOC 1
#else
#define FAILS_MALLOC 0
#endif

namespace {

// How many more allocations the calling thread gets. A negative number allows any number.
constinit thread_local int allowed = -1;
// How many allocations the thread was refused.
constinit thread_local int refused = 0;

[[maybe_unused]] bool isRefused() noexcept {
  if (allowed == 0) {
    ++refused;
    return true;
  }
  if (allowed > 0) --allowed;
  return false;
}

}  // namespace

#if FAILS_MALLOC

// NOLINTBEGIN(bugprone-reserved-identifier,readability-inconsistent-declaration-parameter-name)
extern "C" {

void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);

void* malloc(std::size_t size) {
  if (!isRefused()) return __libc_malloc(size);
  errno = ENOMEM;
  return nullptr;
}

void* calloc(std::size_t nmemb, std::size_t size) {
  if (!isRefused()) return __libc_calloc(nmemb, size);
  errno = ENOMEM;
  return nullptr;
}

void* realloc(void* ptr, std::size_t size) {
  if (!isRefused()) return __libc_realloc(ptr, size);
  errno = ENOMEM;
  return nullptr;
}

}  // extern "C"
// NOLINTEND(bugprone-reserved-identifier,readability-inconsistent-declaration-parameter-name)

#elif !RT_TEST_THREAD_SANITIZER  // It brings its own operator new.

// Not inlined, because g++ would warn of `free` in place of `delete`.
[[gnu::noinline]] void* operator new(std::size_t size) {
  if (isRefused()) throw std::bad_alloc();
  if (void* memory = std::malloc(size)) return memory;
  throw std::bad_alloc();
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
  std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t /*size*/) noexcept {
  std::free(memory);
}

#endif

namespace {

// Captures stacks with one more allocation each time, until none is refused. Returns how often there was no
// stack.
template <class Take>
int failuresOf(Take take) {
  int failures = 0;
  for (int count = 0; count < 100000; ++count) {
    bool isTaken = false;
    bool isThrown = false;
    refused = 0;
    allowed = count;
    try {
      isTaken = static_cast<bool>(take());
    } catch (...) {
      isThrown = true;
    }
    allowed = -1;
    EXPECT_FALSE(isThrown) << "after " << count;
    if (!isTaken) ++failures;
    if (refused > 0) continue;
    EXPECT_TRUE(isTaken);
    return failures;
  }
  return -1;
}

// Does the same for a stack of addresses that is captured `depth` calls further in.
[[gnu::noinline]] int failuresAtDepth(int depth) {
  const int failures =
      depth > 0 ? failuresAtDepth(depth - 1)
                : failuresOf([] { return LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(0); });
  rt::CallStack::keepFrame();
  return failures;
}

class LUMLogCallstackMemoryTest : public testing::Test {
 protected:
  void SetUp() override {
    if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the thread sanitizer's operator new cannot be replaced";
  }
};

// One failure is that of the object. The others are those of the buffer, which holds 128 addresses at first
// and doubles.
TEST_F(LUMLogCallstackMemoryTest, AddressCallstackIsNullWithoutMemory) {
  EXPECT_EQ(failuresAtDepth(0), FAILS_MALLOC ? 2 : 1);
  EXPECT_EQ(failuresAtDepth(150), FAILS_MALLOC ? 3 : 1);
  EXPECT_EQ(failuresAtDepth(300), FAILS_MALLOC ? 4 : 1);
}

TEST_F(LUMLogCallstackMemoryTest, SymbolCallstackIsNullWithoutMemory) {
  EXPECT_GE(failuresOf([] { return LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(0); }), 3);
}

}  // namespace
