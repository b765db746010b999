#pragma once

/// The weak reference: it does not keep the object alive, and knows when it is gone.
///
///     rt::Weak<Delegate> delegate_;                                  // a class or a protocol
///     delegate_ = delegate;
///     if (rt::Ref<Delegate> delegate = delegate_.lock()) delegate->didLog("started"_s);
///
/// An object that is being destroyed counts as gone: `lock` gives null, or a reference that keeps the
/// object whole. Different `Weak` objects may be used by different threads at once; one `Weak` object
/// is as safe as a plain pointer.
///
/// The first weak reference to an object allocates; the others do not.
///
/// Not for: a look at an object that is certainly alive, where a plain pointer will do.

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

/// What all weak references to one object share. It outlives the object until they are gone.
class WeakCell {
 public:
  /// The cell of `object`, made if there is none yet, with a reference for the caller; null when the
  /// object is being destroyed already.
  static WeakCell* of(const Object& object);

  void retain() noexcept { count_.fetch_add(1, std::memory_order_relaxed); }
  void release() noexcept;

  /// Adds a reference to the object and returns true, or returns false when it is gone.
  bool retainObject() noexcept;

  /// Says that the object is gone. Waits for a `retainObject` on another thread that is looking at it.
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
  /// Refers to nothing.
  constexpr Weak() noexcept = default;
  constexpr Weak(std::nullptr_t) noexcept {}

  /// Refers to `object`, which may be null; to nothing if the object is being destroyed. Throws
  /// std::bad_alloc.
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

  /// A strong reference to the object, or null when it is gone.
  [[nodiscard]] Ref<T> lock() const noexcept {
    return cell_ != nullptr && cell_->retainObject() ? Ref<T>::adopt(pointer_) : Ref<T>();
  }

 private:
  detail::WeakCell* cell_ = nullptr;
  T* pointer_ = nullptr;
};

}  // namespace rt
