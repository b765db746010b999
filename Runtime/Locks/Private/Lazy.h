#pragma once

/// `rt::Lazy` is a value that is made when it is first asked for. It is made once for the process and never
/// destroyed.
///
///     const rt::Ref<Clock>& Clock::shared() {
///       static constinit rt::Lazy<rt::Ref<Clock>> clock;
///       return clock.get([] { return rt::make<SystemClock>(); });
///     }
///
/// It differs from a static variable of a function in two ways. Nothing runs at exit. In the child of a fork,
/// a value that another thread was making counts as not begun. (A static variable would make the child wait
/// for ever.) Asking for a value that exists takes no lock and allocates nothing.
///
/// Threads: any thread may ask for the value.
///
/// Not for: values that exist from the start of the program; members of objects, since the value is never
/// destroyed.

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
  /// Makes a `Lazy` without a value.
  constexpr Lazy() noexcept = default;
  Lazy(const Lazy&) = delete;
  Lazy& operator=(const Lazy&) = delete;

  /// Returns the value. The first call makes it from the result of `make`. Other threads that ask meanwhile
  /// wait. `make` must not ask for the same value, which ends the program. Throws what `make` throws. The
  /// next call then tries again.
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
  alignas(T) std::byte storage_[sizeof(T)]{};
};

}  // namespace rt
