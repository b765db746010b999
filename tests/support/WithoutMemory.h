#pragma once

#include <functional>

/// Runs a program again and again and makes each of its allocations fail in turn. Each fails once alone, and
/// once together with all later ones.
///
///     TEST(WithoutMemory, Formats) {
///       WithoutMemory::tryEachAllocation([] { EXPECT_EQ(rt::format("%d"_s, 7), "7"); });
///     }
///
/// When an allocation fails, the program must either throw std::bad_alloc or do what is documented. It checks
/// the latter with its own expectations. Then it runs again with memory and must succeed: no lock may be
/// held, and no object may be half made.
///
/// Each attempt runs in a new child, in which every use is the first use. A last child repeats all attempts
/// to find leaks. SIGALRM ends a child that hangs. Instrumented builds make only one in sixteen of the first
/// attempts.
///
/// A program must restore what it changes. What it sets up for itself belongs under an
/// `AllocationFailure::Pause`. The number of allocations is printed. If AllocationFailure is not supported,
/// the test is skipped.
///
/// Not for: programs with their own threads that outlive a run.
namespace WithoutMemory {

using Program = std::function<void()>;

/// Says whether it is a leak if the process has more blocks after each run of the program.
enum class Growth : bool { kIsLeak, kIsWanted };

void tryEachAllocation(const Program& program, Growth growth = Growth::kIsLeak);

/// Runs `body` on a new thread and waits for it. Rethrows what `body` throws. The allocations in `body` may
/// fail; starting the thread does not fail.
void onNewThread(const Program& body);

}  // namespace WithoutMemory
