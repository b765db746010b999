#pragma once

#include <cstdint>

/// Counts the allocations of the calling thread, by `new`, `malloc` or any related function. Counts those of
/// the program and of all libraries that it links. Link `allocation-count` and use it in a test:
///
///     if (!AllocationCount::isSupported()) GTEST_SKIP() << "no way to count allocations here";
///     AllocationCount count;
///     rt::Ref<Point> copy = point;
///     EXPECT_EQ(count.allocations(), 0);
///
/// Each object counts from its construction. Sanitizers are supported, through their hooks.
class AllocationCount {
 public:
  AllocationCount() noexcept;

  /// Returns whether allocations can be counted on this system.
  static bool isSupported() noexcept;

  /// Returns how many allocations the calling thread has made since this object was constructed. A
  /// reallocation counts as one. Precondition: the calling thread constructed this object.
  std::int64_t allocations() const noexcept;

  /// Returns `allocations()` minus the number of blocks that the thread has freed since. May be negative.
  std::int64_t balance() const noexcept;

  /// Returns how many more blocks the whole process has allocated than freed. Only differences between two
  /// calls are meaningful: counting begins at an unspecified moment while the process starts.
  static std::int64_t liveInProcess() noexcept;

 private:
  std::int64_t allocatedBefore_;
  std::int64_t freedBefore_;
};
