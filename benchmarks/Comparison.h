#pragma once

#include <string>

/// Compares our code with peers in one run.
///
/// A benchmark program registers its cases as "Topic/case/ours" and "Topic/case/PEER". It links
/// `benchmark-comparison`, which defines `main`. After Google Benchmark's own output it prints a line for
/// each peer, with both medians and their ratio. The repetitions of all cases run in random order, so that a
/// busy machine slows both sides alike.
///
///     BENCHMARK(copyRef)->Name("Ref/copy/ours");
///     BENCHMARK(copySharedPointer)->Name("Ref/copy/shared_ptr");
///     const Bound bound{"Ref/copy", "shared_ptr", 1.0};   // at namespace scope
///
/// If a ratio exceeds its bound, its line says so and the program exits with status 1.
struct Bound {
  /// Registers a bound: the median of `caseName`/ours may be at most `ratio` times that of `caseName`/`peer`.
  Bound(std::string caseName, std::string peer, double ratio);
};

/// A thread that waits until the program ends. System libraries avoid atomic operations while a program has
/// only one thread. Real programs have several, so the measurements need a second one.
///
///     const SecondThread secondThread;   // at namespace scope
struct SecondThread {
  SecondThread();
};
