#pragma once

#include <cstdint>

// The sanitizers own malloc. With the address sanitizer, only allocations by `new` can fail.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define SANITIZES_ALLOCATIONS 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define SANITIZES_ALLOCATIONS 1
#endif
#endif

/// Makes an allocation fail, on any thread, during this object's lifetime. Link `allocation-count`.
///
///     const AllocationFailure failure(3);                    // only the third allocation from now fails
///     EXPECT_THROW(rt::format("%@"_s, list), std::bad_alloc);
///     EXPECT_TRUE(failure.hasHappened());
///
/// A process may have only one such object at a time. If this is not supported, no allocation fails.
class AllocationFailure {
 public:
  enum class Extent : bool { kOnce, kFromThenOn };

  /// Returns whether allocations can be made to fail on this system. False with the thread sanitizer, which
  /// owns `new`.
  static bool isSupported() noexcept;

  /// Makes the `number`-th allocation from now fail, counted from 1. With `kFromThenOn`, all later
  /// allocations fail too.
  explicit AllocationFailure(std::int64_t number, Extent extent = Extent::kOnce) noexcept;
  AllocationFailure(const AllocationFailure&) = delete;
  AllocationFailure& operator=(const AllocationFailure&) = delete;
  ~AllocationFailure();

  /// Returns whether that allocation has been attempted.
  bool hasHappened() const noexcept;

  /// Exempts the calling thread during its lifetime: the thread's allocations neither fail nor count towards
  /// `number`.
  class Pause {
   public:
    Pause() noexcept;
    Pause(const Pause&) = delete;
    Pause& operator=(const Pause&) = delete;
    ~Pause();
  };

  /// Returns whether the current allocation must fail. For allocation functions only.
  static bool happensNow() noexcept;
};
