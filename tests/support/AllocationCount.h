#pragma once

#include <cstdint>

/// Counts what the calling thread allocates, by `new`, `malloc` or any of their relatives, in the whole
/// program with the libraries that it links. Link `allocation-count` and ask from the test:
///
///     if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
///     AllocationCount count;
///     rt::Ref<Point> copy = point;
///     EXPECT_EQ(count.allocations(), 0);
///
/// Each object counts from its own making on. Works under the sanitizers too, through their hooks.
class AllocationCount {
 public:
  AllocationCount() noexcept;

  /// Whether allocations can be counted on this system.
  static bool isSupported() noexcept;

  /// How often the calling thread, which must be the one that made this object, has allocated since.
  /// A reallocation counts as one.
  std::int64_t allocations() const noexcept;

  /// How many of these are left, that is less what the thread has freed since. May be negative.
  std::int64_t balance() const noexcept;

  /// How many blocks the whole process has, since some moment of its start: for comparing with later.
  static std::int64_t liveInProcess() noexcept;

 private:
  std::int64_t allocatedBefore_;
  std::int64_t freedBefore_;
};
