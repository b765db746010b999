#pragma once

#include <functional>

/// Runs a program over and over, and has each of its allocations fail in turn: once the allocation alone, and
/// once with all that come after it.
///
///     TEST(WithoutMemory, Formats) {
///       WithoutMemory::tryEachAllocation([] { EXPECT_EQ(rt::format("%d"_s, 7), "7"); });
///     }
///
/// The program throws std::bad_alloc, or does what is documented, which it says itself by expectations. Then
/// it is run again with memory, and must get through: no lock is held, and nothing is half made. Each attempt
/// runs in a new child, where every use is the first. A last child repeats all of them, to find leaks. A
/// child that hangs is ended. In instrumented builds one in sixteen of the first attempts is made.
///
/// A program leaves behind what it found. What it sets up for itself alone goes under an
/// `AllocationFailure::Pause`. How many allocations there were is printed.
///
/// Not for: programs with threads of their own that last; where AllocationFailure is not supported, the test
/// is skipped.
namespace WithoutMemory {

using Program = std::function<void()>;

/// What it means that the process has more blocks after each run of the program.
enum class Growth : bool { kIsLeak, kIsWanted };

void tryEachAllocation(const Program& program, Growth growth = Growth::kIsLeak);

/// Runs `body` on a new thread, whose allocations may fail, and throws what it throws.
void onNewThread(const Program& body);

}  // namespace WithoutMemory
