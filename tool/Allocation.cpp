// The command's allocator. It takes memory from the front of one block and never takes memory back.
//
// A dozen environment variables control the C library's allocator, and some of them end the process. A
// command that may run with raised privileges must not obey any. The command runs for a millisecond and
// allocates a few blocks. The largest holds an argument, of at most 128 KiB. The C++ library reserves 71 KiB
// for exceptions. The C library and the libraries that the command carries allocate about 3 KiB when they are
// loaded.
//
// One variable remains. Without raised privileges the C library splits LD_LIBRARY_PATH before `main`. It ends
// the process if more than about 2,000 different directories in it use up the memory. With raised privileges
// it ignores the variable.
//
// These are all the allocation functions that the command refers to. If it referred to another one, the
// linker would add the C library's allocator and report duplicate definitions.

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace {

constexpr std::size_t kAlignment = alignof(std::max_align_t);

// Unused pages cost nothing, but count against the caller's limits on memory.
alignas(kAlignment) constinit unsigned char memory[std::size_t{256} << 10] = {};
constinit std::size_t used = 0;

// Stands before each block and keeps its size for `realloc`.
struct alignas(kAlignment) Header {
  std::size_t size;
};

void* allocate(std::size_t size, std::size_t alignment) noexcept {
  const auto base = reinterpret_cast<std::uintptr_t>(memory);
  const std::size_t start = ((base + used + sizeof(Header) + alignment - 1) & ~(alignment - 1)) - base;
  if (start > sizeof memory || size > sizeof memory - start) {
    errno = ENOMEM;
    return nullptr;
  }
  used = start + size;
  unsigned char* const block = memory + start;
  const Header header{size};
  std::memcpy(block - sizeof header, &header, sizeof header);
  return block;
}

}  // namespace

extern "C" {

void* malloc(std::size_t size) noexcept {
  return allocate(size, kAlignment);
}

void free(void* /*block*/) noexcept {}

// Memory that was never used is zero, so nothing is cleared.
void* calloc(std::size_t nmemb, std::size_t size) noexcept {
  if (size != 0 && nmemb > sizeof memory / size) {
    errno = ENOMEM;
    return nullptr;
  }
  return allocate(nmemb * size, kAlignment);
}

void* realloc(void* ptr, std::size_t size) noexcept {
  void* const other = allocate(size, kAlignment);
  if (ptr != nullptr && other != nullptr) {
    Header header{};
    std::memcpy(&header, static_cast<unsigned char*>(ptr) - sizeof header, sizeof header);
    std::memcpy(other, ptr, std::min(header.size, size));
  }
  return other;
}

void* aligned_alloc(std::size_t alignment, std::size_t size) noexcept {
  return allocate(size, std::max(alignment, kAlignment));
}

}  // extern "C"
