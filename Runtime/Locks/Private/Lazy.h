#pragma once

/// A value that is made when it is first asked for, once for the process, and never destroyed.
///
///     const rt::Ref<Clock>& Clock::shared() {
///       static constinit rt::Lazy<rt::Ref<Clock>> clock;
///       return clock.get([] { return rt::make<SystemClock>(); });
///     }
///
/// Differs from a static variable of a function in two ways. Nothing runs at exit. In the child of a fork, a
/// value that another thread was making counts as not begun; a static variable would be waited for for ever.
/// Asking for a value that is there takes no lock and allocates nothing.
///
/// Not for: values that are made with the program; members of objects, which end.

#include <atomic>
#include <cstddef>
#include <memory>
#include <new>
#include <utility>

#include "Runtime/Locks/Private/LongLock.h"
#include "Runtime/Locks/UnfairLock.h"

namespace rt {

template <class T>
class Lazy {
 public:
  /// Not made.
  constexpr Lazy() noexcept = default;
  Lazy(const Lazy&) = delete;
  Lazy& operator=(const Lazy&) = delete;

  /// The value; the first call makes it of what `make` returns. Other threads that ask meanwhile wait; `make`
  /// must not ask itself, which ends the program. Throws what `make` throws, and the next call tries again.
  template <class Make>
  T& get(Make&& make) {
    if (!isMade_.load(std::memory_order_acquire)) [[unlikely]]
      makeOnce(std::forward<Make>(make));
    return *std::launder(reinterpret_cast<T*>(&storage_));
  }

 private:
  template <class Make>
  [[gnu::noinline, gnu::cold]] void makeOnce(Make&& make) {
    const LockGuard guard(lock_);
    if (isMade_.load(std::memory_order_relaxed)) return;
    ::new (static_cast<void*>(&storage_)) T(std::forward<Make>(make)());
    isMade_.store(true, std::memory_order_release);
  }

  LongLock lock_;
  std::atomic<bool> isMade_ = false;
  alignas(T) std::byte storage_[sizeof(T)]{};  // NOLINT(modernize-avoid-c-arrays)
};

}  // namespace rt
