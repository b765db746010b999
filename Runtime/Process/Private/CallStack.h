#pragma once

/// Where the program is: the calls that led here, as addresses, and as text.
///
///     std::array<std::uint64_t, 64> addresses;
///     const std::size_t count = rt::CallStack::capture(addresses);
///     for (const rt::String& line : rt::CallStack::symbols(std::span(addresses).first(count))) ...
///
/// Capturing costs about a tenth of a microsecond a frame and neither allocates nor locks; turning
/// addresses into text reads the symbols of the images they are in and is for the few stacks that people
/// look at. Both work on any thread, in a statically linked program, and in the child of a fork.
///
/// Not for: signal handlers; unwinding.

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "Runtime/Objects/String.h"

namespace rt::CallStack {

/// Fills `addresses` with the return addresses of the calls that led to this one, the innermost first:
/// the first lies in the function that called `capture`, the second in that function's caller. Gives how
/// many there are; what does not fit is left out, so that a result as large as `addresses` may not be
/// the whole stack. What cannot be unwound ends it. A function that was compiled into its caller, or that
/// called as its last act, has no frame of its own.
[[gnu::noinline]] std::size_t capture(std::span<std::uint64_t> addresses) noexcept;

/// Called behind the last call of a function, keeps the compiler from making that call the function's last
/// act, so that it has a frame of its own.
[[gnu::always_inline]] inline void keepFrame() noexcept {
  asm volatile("" ::: "memory");  // NOLINT(hicpp-no-assembler): does nothing, which cannot be left out
}

/// A line for each of `addresses`: its number, from 0, the image it is in, the address, and the function
/// with the distance from its start, as in
///
///     | 0   mount-point                         0x000055d0c0de1234 main + 52
///
/// C++ names are spelt out. The names of functions that an image does not export are read from the symbol
/// table in its file, if that is there and still the same. "???" stands for an image that is not known; where
/// no function is known, as in an image that was stripped, the image's start and the distance from it stand
/// for it. Throws std::bad_alloc.
std::vector<String> symbols(std::span<const std::uint64_t> addresses);

}  // namespace rt::CallStack
