#include <cstdint>

#include "tests/macos/runner/Images.h"
#include "tests/macos/runner/Shims.h"

namespace {

// Follows the chain of frame pointers, as the system's function does. Programs for macOS keep them, and the
// runner, which calls them, does not.
[[gnu::noinline]] int backtraceOf(const void** addresses, int size) {
  struct Frame {
    const Frame* caller;
    const void* returnAddress;
  };
  int count = 0;
  const auto* frame = static_cast<const Frame*>(__builtin_frame_address(0));
  while (count < size && frame != nullptr && Images::containing(frame->returnAddress) != nullptr) {
    addresses[count++] = frame->returnAddress;
    // The stack grows downwards, so callers are further up.
    if (frame->caller <= frame) break;
    frame = frame->caller;
  }
  return count;
}

}  // namespace

shims::Table shims::execinfo() {
  static const Shim table[] = {
      shim("backtrace", &backtraceOf),
  };
  return table;
}
