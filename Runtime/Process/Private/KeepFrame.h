#pragma once

// Keeps a function's frame on the call stack. Public headers need this and nothing else of what captures call
// stacks, which <vector> makes slow to parse.

namespace rt::CallStack {

/// Keeps the frame of a function that would otherwise end in a tail call. Call it after the function's last
/// call.
[[gnu::always_inline]] inline void keepFrame() noexcept {
  asm volatile("" ::: "memory");  // does nothing, and the compiler must keep it
}

}  // namespace rt::CallStack
