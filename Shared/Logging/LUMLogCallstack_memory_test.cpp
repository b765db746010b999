// Call stacks where memory runs out: null, and nothing thrown. This program's operator new fails on demand.

#include <gtest/gtest.h>

#include <cstddef>
#include <cstdlib>
#include <new>

#include "Shared/Logging/LUMLogAddressCallstack.h"
#include "Shared/Logging/LUMLogSymbolCallstack.h"
#include "tests/Sanitizers.h"

namespace {

// How many allocations more the calling thread gets; less than none for any number.
constinit thread_local int allowed = -1;

}  // namespace

// The thread sanitizer brings its own.
#if !RT_TEST_THREAD_SANITIZER

// Not inlined, or g++ sees `free` where it looks for a `delete`.
[[gnu::noinline]] void* operator new(std::size_t size) {
  if (allowed == 0) throw std::bad_alloc();
  if (allowed > 0) --allowed;
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

// Takes stacks with one allocation more each time, until that is enough; returns how often it was not.
template <class Take>
int failuresOf(Take take) {
  for (int failures = 0; failures < 100000; ++failures) {
    allowed = failures;
    bool isTaken = false;
    EXPECT_NO_THROW(isTaken = static_cast<bool>(take()));
    allowed = -1;
    if (isTaken) return failures;
  }
  return -1;
}

TEST(LUMLogCallstackMemory, IsMissedAsAStackIs) {
  if (RT_TEST_THREAD_SANITIZER) GTEST_SKIP() << "the thread sanitizer's operator new cannot be replaced";
  EXPECT_GE(failuresOf([] { return LUMLogAddressCallstack::addressCallstackIgnoringFrameCount(0); }), 1);
  EXPECT_GE(failuresOf([] { return LUMLogSymbolCallstack::symbolCallstackIgnoringFrameCount(0); }), 3);
}

}  // namespace
