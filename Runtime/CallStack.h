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

#include "Runtime/String.h"

namespace rt::CallStack {

/// Fills `addresses` with the return addresses of the calls that led to this one, the innermost first:
/// the first lies in the function that called `capture`, the second in that function's caller. Gives how
/// many there are; what does not fit is left out, so that a result as large as `addresses` may not be
/// the whole stack. A function that was compiled into its caller, or that called as its last act, has no
/// frame of its own.
[[gnu::noinline]] std::size_t capture(std::span<std::uint64_t> addresses) noexcept;

/// A line for each of `addresses`: its number, from 0, the image it is in, the address, and the function
/// with the distance from its start, as in
///
///     0   mount-point                         0x000055d0c0de1234 main + 52
///
/// C++ names are spelt out. "???" stands for an image that is not known; where no symbol is known (that of
/// a function which the image does not export), the image's start and the distance from it stand for it.
/// Throws std::bad_alloc.
std::vector<String> symbols(std::span<const std::uint64_t> addresses);

}  // namespace rt::CallStack
