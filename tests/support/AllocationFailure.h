#pragma once

#include <cstdint>

// The sanitizers own malloc: with that for addresses, only what C++ allocates, by `new`, can fail.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define SANITIZES_ALLOCATIONS 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define SANITIZES_ALLOCATIONS 1
#endif
#endif

/// Has an allocation fail, on whichever thread, while it is there. Link `allocation-count`.
///
///     const AllocationFailure failure(3);                    // the third from now, and no other
///     EXPECT_THROW(rt::format("%@"_s, list), std::bad_alloc);
///     EXPECT_TRUE(failure.hasHappened());
///
/// One at a time in a process. Where it is not supported, nothing ever fails.
class AllocationFailure {
 public:
  enum class Extent : bool { kOnce, kFromThenOn };

  /// Whether allocations can be made to fail on this system. Not under the thread sanitizer, which owns
  /// `new`.
  static bool isSupported() noexcept;

  /// The `number`-th allocation from now, counted from 1, fails, and those after it if `extent` says so.
  explicit AllocationFailure(std::int64_t number, Extent extent = Extent::kOnce) noexcept;
  AllocationFailure(const AllocationFailure&) = delete;
  AllocationFailure& operator=(const AllocationFailure&) = delete;
  ~AllocationFailure();

  /// Whether it has come to that allocation.
  bool hasHappened() const noexcept;

  /// While it is there, nothing fails that the calling thread allocates, and nothing of it is counted.
  class Pause {
   public:
    Pause() noexcept;
    Pause(const Pause&) = delete;
    Pause& operator=(const Pause&) = delete;
    ~Pause();
  };

  /// For those who allocate: whether to fail.
  static bool happensNow() noexcept;
};
