#pragma once

/// Captures the call stack as addresses, and turns addresses into text.
///
///     std::array<std::uint64_t, 64> addresses;
///     const std::size_t count = rt::CallStack::capture(addresses);
///     for (const rt::String& line : rt::CallStack::symbols(std::span(addresses).first(count))) ...
///
/// `capture` takes about a tenth of a microsecond for each frame. It neither allocates nor locks. `symbols`
/// is slow: it reads the symbols of the images that the addresses are in. It is for the few stacks that
/// people read. Both work in statically linked programs and in the child of a fork.
///
/// Threads: thread-safe.
/// Not for: signal handlers; unwinding.

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "Runtime/Objects/String.h"
#include "Runtime/Process/Private/KeepFrame.h"

namespace rt::CallStack {

/// Fills `addresses` with the return addresses of the calls that led here, the innermost first. The first
/// lies in the caller of `capture`, the second in that function's caller. Returns how many addresses it has
/// set.
///
/// Outer frames that do not fit are left out. So if all of `addresses` is set, the stack may be longer. The
/// capture ends at a frame that cannot be unwound. A function that is inlined, or that has made a tail call,
/// has no frame.
[[gnu::noinline]] std::size_t capture(std::span<std::uint64_t> addresses) noexcept;

/// Returns a line for each of `addresses`. It has a number, from 0, the image, the address, and the function
/// with the distance from its start:
///
///     | 0   mount-point                         0x000055d0c0de1234 main + 52
///
/// C++ names are demangled. Functions that an image does not export are looked up in the symbol table of its
/// file. The file must still be the one that was loaded. "???" stands for an unknown image. If the function
/// is unknown, as in a stripped image, the line has the image's start and the distance from it. Throws
/// std::bad_alloc.
std::vector<String> symbols(std::span<const std::uint64_t> addresses);

}  // namespace rt::CallStack
