#include <sys/mman.h>

#include "tests/macos/runner/Shims.h"

namespace {

void* map(void* address, std::size_t size, int protection, int flags, int file, off_t offset) {
  // MAP_SHARED, MAP_PRIVATE and MAP_FIXED are the same, and so are the kinds of protection.
  constexpr int kCommon = MAP_SHARED | MAP_PRIVATE | MAP_FIXED;
  constexpr int kAnonymous = 0x1000;
  if ((flags & ~(kCommon | kAnonymous)) != 0) {
    refuse("mmap is called with the flags 0x%x", static_cast<unsigned>(flags));
  }
  const int linux = (flags & kCommon) | ((flags & kAnonymous) != 0 ? MAP_ANONYMOUS : 0);
  void* const result = mmap(address, size, protection, linux, file, offset);
  if (result == MAP_FAILED) convertErrno();
  return result;
}

}  // namespace

shims::Table shims::sysMman() {
  static const Shim table[] = {
      shim("mmap", &map),
      shim("mprotect", systemCall<&::mprotect>),
      shim("munmap", systemCall<&::munmap>),
  };
  return table;
}
