// The command's memory: handed out from one piece, front to back, and never taken back. The C library's
// own allocator does as a dozen environment variables say, some of which end the process; a command that
// may run with raised privileges listens to none. mount-point_binary_test asks for it: it compares runs in
// hostile environments, and lists the variables that may be read. The command runs for a millisecond and
// allocates a handful of blocks, the largest of which holds an argument, at most 128 KiB. The C++ library
// reserves 71 KiB for exceptions. The C library and the libraries that the command carries take about 3 KiB
// when they are loaded.
//
// One variable remains: without raised privileges the C library takes LD_LIBRARY_PATH apart before `main`,
// and ends the process where more than about 2,000 different directories in it leave no memory. With raised
// privileges it ignores the variable.
//
// These are all the functions of an allocator that anything in the command refers to. Were there another,
// the linker would take the C library's allocator for it, and complain that it finds these twice.

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <cstring>

namespace {

constexpr std::size_t kAlignment = alignof(std::max_align_t);

// Pages that are not used cost nothing, but the caller's limits on memory count them.
alignas(kAlignment) constinit unsigned char memory[std::size_t{256} << 10] = {};
constinit std::size_t used = 0;

// The size of a block stands before it, for `realloc`.
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

// Memory that was never used is zero.
void* calloc(std::size_t count, std::size_t size) noexcept {
  if (size != 0 && count > sizeof memory / size) {
    errno = ENOMEM;
    return nullptr;
  }
  return allocate(count * size, kAlignment);
}

void* realloc(void* block, std::size_t size) noexcept {
  void* const other = allocate(size, kAlignment);
  if (block != nullptr && other != nullptr) {
    Header header{};
    std::memcpy(&header, static_cast<unsigned char*>(block) - sizeof header, sizeof header);
    std::memcpy(other, block, std::min(header.size, size));
  }
  return other;
}

void* aligned_alloc(std::size_t alignment, std::size_t size) noexcept {
  return allocate(size, std::max(alignment, kAlignment));
}

}  // extern "C"
