#include "tests/support/AllocationFailure.h"

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <limits>
#include <new>

#include "tests/support/AllocationCount.h"
#include "tests/support/Sanitizers.h"

namespace {

constexpr std::int64_t kNever = std::numeric_limits<std::int64_t>::max();

// The number of allocations before the one that fails. kNever if no allocation is to fail.
constinit std::atomic<std::int64_t> left = kNever;
constinit std::atomic<bool> lasts = false;
constinit thread_local int pauses = 0;

}  // namespace

AllocationFailure::AllocationFailure(std::int64_t number, Extent extent) noexcept {
  lasts.store(extent == Extent::kFromThenOn);
  left.store(number - 1);
}

AllocationFailure::~AllocationFailure() {
  left.store(kNever);
}

// Not static, since it tells about this object.
// NOLINTNEXTLINE(readability-convert-member-functions-to-static)
bool AllocationFailure::hasHappened() const noexcept {
  return left.load() < 0;
}

AllocationFailure::Pause::Pause() noexcept {
  ++pauses;
}

AllocationFailure::Pause::~Pause() {
  --pauses;
}

bool AllocationFailure::happensNow() noexcept {
  if (left.load(std::memory_order_relaxed) == kNever || pauses > 0) return false;
  const std::int64_t before = left.fetch_sub(1);
  if (before > 0 || (before < 0 && !lasts.load())) return false;
  errno = ENOMEM;
  return true;
}

bool AllocationFailure::isSupported() noexcept {
  return AllocationCount::isSupported() && RT_TEST_THREAD_SANITIZER == 0;
}

#if RT_TEST_ADDRESS_SANITIZER

namespace {

void* allocate(std::size_t size, std::size_t alignment) noexcept {
  if (AllocationFailure::happensNow()) return nullptr;
  if (alignment <= __STDCPP_DEFAULT_NEW_ALIGNMENT__) return std::malloc(size);
  return std::aligned_alloc(alignment, (size + alignment - 1) / alignment * alignment);
}

void* allocateOrThrow(std::size_t size, std::size_t alignment) {
  void* block = allocate(size, alignment);
  if (block == nullptr) throw std::bad_alloc();
  return block;
}

}  // namespace

// NOLINTBEGIN(misc-new-delete-overloads): all overloads are here
void* operator new(std::size_t size) {
  return allocateOrThrow(size, 1);
}
void* operator new[](std::size_t size) {
  return allocateOrThrow(size, 1);
}
void* operator new(std::size_t size, std::align_val_t alignment) {
  return allocateOrThrow(size, static_cast<std::size_t>(alignment));
}
void* operator new[](std::size_t size, std::align_val_t alignment) {
  return allocateOrThrow(size, static_cast<std::size_t>(alignment));
}
void* operator new(std::size_t size, const std::nothrow_t& /*tag*/) noexcept {
  return allocate(size, 1);
}
void* operator new[](std::size_t size, const std::nothrow_t& /*tag*/) noexcept {
  return allocate(size, 1);
}
void operator delete(void* block) noexcept {
  std::free(block);
}
void operator delete[](void* block) noexcept {
  std::free(block);
}
void operator delete(void* block, std::size_t /*size*/) noexcept {
  std::free(block);
}
void operator delete[](void* block, std::size_t /*size*/) noexcept {
  std::free(block);
}
void operator delete(void* block, std::align_val_t /*alignment*/) noexcept {
  std::free(block);
}
void operator delete[](void* block, std::align_val_t /*alignment*/) noexcept {
  std::free(block);
}
void operator delete(void* block, std::size_t /*size*/, std::align_val_t /*alignment*/) noexcept {
  std::free(block);
}
void operator delete[](void* block, std::size_t /*size*/, std::align_val_t /*alignment*/) noexcept {
  std::free(block);
}
void operator delete(void* block, const std::nothrow_t& /*tag*/) noexcept {
  std::free(block);
}
void operator delete[](void* block, const std::nothrow_t& /*tag*/) noexcept {
  std::free(block);
}
// NOLINTEND(misc-new-delete-overloads)

#endif
