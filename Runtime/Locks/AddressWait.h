#pragma once

// Lets a thread sleep until another thread of this process changes a word:
//
//     while (word.load() == 0) rt::detail::waitAtAddress(word, 0);
//
// Unlike `std::atomic::notify_one`, waking does not read the word, which may be gone by then. So a word may
// live in the stack frame of the thread that sleeps at it. For the runtime itself only.

#if defined(__APPLE__)
#include "Runtime/Locks/Darwin/AddressWait.h"
#else
#include "Runtime/Locks/Linux/AddressWait.h"
#endif

namespace rt::detail {

// Tells the processor that the caller reads a word again and again.
inline void spinPause() noexcept {
#if defined(__x86_64__) || defined(__i386__)
  __builtin_ia32_pause();
#elif defined(__aarch64__)
  asm volatile("yield");
#endif
}

}  // namespace rt::detail
