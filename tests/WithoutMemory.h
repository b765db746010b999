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
/// it is run again with memory, and must get through: no lock is held, and nothing is half made. All that is
/// done in children of the process, for which every first use is the first, and once more in one child, for
/// which no use is: there nothing may leak, however often an allocation fails. A child that hangs is ended.
/// In instrumented builds, where a child takes long to start, one in sixteen of the first runs is tried.
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
