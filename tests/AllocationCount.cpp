#include "AllocationCount.h"

#include <cerrno>
#include <cstddef>
#include <cstdlib>

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define SANITIZED 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define SANITIZED 1
#endif
#endif

namespace {

constinit thread_local std::int64_t allocated = 0;
constinit thread_local std::int64_t freed = 0;

}  // namespace

#ifdef SANITIZED

// The sanitizer owns malloc and calls these at each allocation.
extern "C" int __sanitizer_install_malloc_and_free_hooks(void (*onMalloc)(const volatile void*, std::size_t),
                                                         void (*onFree)(const volatile void*));

namespace {

const bool isInstalled =
    __sanitizer_install_malloc_and_free_hooks([](const volatile void*, std::size_t) { ++allocated; },
                                              [](const volatile void*) { ++freed; }) != 0;

}  // namespace

bool AllocationCount::isSupported() noexcept {
  return isInstalled;
}

#elif defined(__GLIBC__)

// The C library lets a program bring its own malloc, and keeps its own under these names.
// NOLINTBEGIN(bugprone-reserved-identifier,cert-dcl37-c,cert-dcl51-cpp,readability-identifier-naming,readability-inconsistent-declaration-parameter-name)
extern "C" {

void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
void* __libc_memalign(std::size_t alignment, std::size_t size);
void __libc_free(void* block);

void* malloc(std::size_t size) {
  ++allocated;
  return __libc_malloc(size);
}

void* calloc(std::size_t nmemb, std::size_t size) {
  ++allocated;
  return __libc_calloc(nmemb, size);
}

void* realloc(void* ptr, std::size_t size) {
  ++allocated;
  if (ptr != nullptr) ++freed;
  return __libc_realloc(ptr, size);
}

void* memalign(std::size_t alignment, std::size_t size) {
  ++allocated;
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

void free(void* block) {
  if (block != nullptr) ++freed;
  __libc_free(block);
}

}  // extern "C"
// NOLINTEND(bugprone-reserved-identifier,cert-dcl37-c,cert-dcl51-cpp,readability-identifier-naming,readability-inconsistent-declaration-parameter-name)

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
