#pragma once

/// `rt::Weak<T>` is a weak reference: it does not keep the object alive. `lock` returns null once the object
/// is gone.
///
///     rt::Weak<Delegate> delegate_;                                  // a class or a protocol
///     delegate_ = delegate;
///     if (rt::Ref<Delegate> delegate = delegate_.lock()) delegate->didLog("started"_s);
///
/// An object that is being destroyed counts as gone. `lock` returns either null or a reference that keeps the
/// whole object alive.
///
/// Threads: threads may use different `Weak` objects at the same time. One `Weak` object is as thread-safe as
/// a plain pointer.
///
/// The first weak reference to an object allocates. The others do not.
///
/// Not for: using an object that is certainly alive, for which a plain pointer is enough.

#include <atomic>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <utility>

#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

namespace detail {

// The state that all weak references to one object share. It lives until the object and all of these
// references are gone.
class WeakCell {
 public:
  // Returns the cell of `object` with a reference for the caller. Makes the cell if there is none. Null if
  // the object is being destroyed. Throws std::bad_alloc.
  static WeakCell* of(const Object& object);

  void retain() noexcept { count_.fetch_add(1, std::memory_order_relaxed); }
  void release() noexcept;

  // Retains the object and returns true. Returns false if the object is gone.
  bool retainObject() noexcept;

  // Notes that the object is gone. Waits if another thread is in `retainObject`.
  void clear() noexcept;

 private:
  explicit WeakCell(const Object& object) noexcept : object_(&object) {}

  std::atomic<std::uint32_t> count_{2};  // the caller's and the object's
  UnfairLock lock_;
  const Object* object_ RT_GUARDED_BY(lock_);
};

}  // namespace detail

template <class T>
class Weak {
 public:
  /// Makes a weak reference to nothing.
  constexpr Weak() noexcept = default;
  constexpr Weak(std::nullptr_t) noexcept {}

  /// Makes a weak reference to `object`. It refers to nothing if `object` is null or is being destroyed.
  /// Throws std::bad_alloc.
  Weak(T* object) {
    if (object == nullptr) return;
    cell_ = detail::WeakCell::of(*detail::objectOf(object));
    if (cell_ != nullptr) pointer_ = object;
  }
  template <class Other>
    requires std::convertible_to<Other*, T*>
  Weak(const Ref<Other>& ref) : Weak(static_cast<T*>(ref.get())) {}

  Weak(const Weak& other) noexcept : cell_(other.cell_), pointer_(other.pointer_) {
    if (cell_ != nullptr) cell_->retain();
  }
  Weak(Weak&& other) noexcept
      : cell_(std::exchange(other.cell_, nullptr)), pointer_(std::exchange(other.pointer_, nullptr)) {}

  ~Weak() {
    if (cell_ != nullptr) cell_->release();
  }

  Weak& operator=(Weak other) noexcept {
    swap(other);
    return *this;
  }

  void swap(Weak& other) noexcept {
    std::swap(cell_, other.cell_);
    std::swap(pointer_, other.pointer_);
  }

  /// Returns a strong reference to the object, or null if the object is gone.
  [[nodiscard]] Ref<T> lock() const noexcept {
    return cell_ != nullptr && cell_->retainObject() ? Ref<T>::adopt(pointer_) : Ref<T>();
  }

 private:
  detail::WeakCell* cell_ = nullptr;
  T* pointer_ = nullptr;
};

}  // namespace rt
