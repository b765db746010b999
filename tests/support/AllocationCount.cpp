#include "tests/support/AllocationCount.h"

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdlib>

#include "tests/support/AllocationFailure.h"

namespace {

constinit thread_local std::int64_t allocated = 0;
constinit thread_local std::int64_t freed = 0;
constinit std::atomic<std::int64_t> live = 0;

[[maybe_unused]] void countAllocation() noexcept {
  ++allocated;
  live.fetch_add(1, std::memory_order_relaxed);
}

[[maybe_unused]] void countFree() noexcept {
  ++freed;
  live.fetch_sub(1, std::memory_order_relaxed);
}

}  // namespace

#ifdef SANITIZES_ALLOCATIONS

// The sanitizer owns malloc and calls these hooks at each allocation and deallocation.
extern "C" int __sanitizer_install_malloc_and_free_hooks(void (*onMalloc)(const volatile void*, std::size_t),
                                                         void (*onFree)(const volatile void*));

namespace {

const bool isInstalled =
    __sanitizer_install_malloc_and_free_hooks([](const volatile void*, std::size_t) { countAllocation(); },
                                              [](const volatile void*) { countFree(); }) != 0;

}  // namespace

bool AllocationCount::isSupported() noexcept {
  return isInstalled;
}

#elif defined(__GLIBC__)

// The C library lets a program replace malloc. Its own functions remain available under these names.
// NOLINTBEGIN(bugprone-reserved-identifier)
extern "C" {

void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);
void __libc_free(void* block);

void* malloc(std::size_t size) {
  if (AllocationFailure::happensNow()) return nullptr;
  countAllocation();
  return __libc_malloc(size);
}

void* calloc(std::size_t nmemb, std::size_t size) {
  if (AllocationFailure::happensNow()) return nullptr;
  countAllocation();
  return __libc_calloc(nmemb, size);
}

void* realloc(void* ptr, std::size_t size) {
  if (AllocationFailure::happensNow()) return nullptr;
  countAllocation();
  if (ptr != nullptr) countFree();
  return __libc_realloc(ptr, size);
}

void* memalign(std::size_t alignment, std::size_t size) {
  if (AllocationFailure::happensNow()) return nullptr;
  countAllocation();
  return __libc_memalign(alignment, size);
}

void* aligned_alloc(std::size_t alignment, std::size_t size) {
  return memalign(alignment, size);
}

int posix_memalign(void** memptr, std::size_t alignment, std::size_t size) {
  void* made = memalign(alignment, size);
  if (made == nullptr) return ENOMEM;
  *memptr = made;
  return 0;
}

void free(void* ptr) {
  if (ptr != nullptr) countFree();
  __libc_free(ptr);
}

}  // extern "C"
// NOLINTEND(bugprone-reserved-identifier)

bool AllocationCount::isSupported() noexcept {
  return true;
}

#else

bool AllocationCount::isSupported() noexcept {
  return false;
}

#endif

AllocationCount::AllocationCount() noexcept : allocatedBefore_(allocated), freedBefore_(freed) {}

std::int64_t AllocationCount::allocations() const noexcept {
  return allocated - allocatedBefore_;
}

std::int64_t AllocationCount::balance() const noexcept {
  return (allocated - allocatedBefore_) - (freed - freedBefore_);
}

std::int64_t AllocationCount::liveInProcess() noexcept {
  return live.load(std::memory_order_relaxed);
}
