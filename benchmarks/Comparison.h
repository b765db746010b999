#pragma once

#include <string>

/// Comparisons within one run.
///
/// Benchmark programs here register their cases as "Topic/case/ours" and "Topic/case/PEER", link
/// `benchmark-comparison` (which brings `main`), and get, after Google Benchmark's own lines, one line
/// for each peer: both medians and their ratio. The repetitions of all cases are interleaved at random,
/// so that a busy machine slows both sides alike.
///
///     BENCHMARK(copyRef)->Name("Ref/copy/ours");
///     BENCHMARK(copySharedPointer)->Name("Ref/copy/shared_ptr");
///     const Bound bound{"Ref/copy", "shared_ptr", 1.0};   // at namespace scope
///
/// A ratio over its bound is marked and makes the program exit with status 1.
struct Bound {
  /// At most `ratio` times the median of `caseName`/`peer` may be the one of `caseName`/ours.
  Bound(std::string caseName, std::string peer, double ratio);
};

/// A thread that waits until the program ends. Other parts of a program have threads, too: what does without
/// atomic operations until there is a second one must not do so where it is measured.
///
///     const SecondThread secondThread;   // at namespace scope
struct SecondThread {
  SecondThread();
};
