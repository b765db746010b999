#pragma once

/// `rt::Ref<T>` is a strong reference: one pointer, which is null or owns one reference to an object.
///
///     rt::Ref<SystemClock> clock = rt::make<SystemClock>();
///     rt::Ref<Clock> shared = clock;                    // to a protocol, or a superclass
///     rt::Ref<Clock> found = rt::cast<Clock>(object);   // from a pointer: adds a reference
///     if (found) found->now();
///
/// T is a class that derives from `rt::Object`, or a protocol. T may be incomplete until a reference is made
/// or dropped. Copying adds a reference. Moving leaves null behind. Two references are equal if they refer to
/// the same object.
///
/// Threads: threads may use different `Ref` objects at the same time. One `Ref` object is as thread-safe as a
/// plain pointer.
///
/// Not for: cycles of objects that refer to each other (Runtime/Objects/Weak.h); parameters of functions that
/// keep nothing, which are `T&` or `T*`.

#include <concepts>
#include <cstddef>
#include <string_view>  // std::hash
#include <utility>

#include "Runtime/Base/Private/LifetimeBound.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"

namespace rt {

template <class T>
class Ref {
 public:
  using Element = T;

  /// Makes a null reference.
  constexpr Ref() noexcept = default;
  constexpr Ref(std::nullptr_t) noexcept {}

  /// Retains `object`, which may be null.
  Ref(T* object) noexcept : pointer_(object) { retain(); }

  Ref(const Ref& other) noexcept : pointer_(other.pointer_) { retain(); }
  Ref(Ref&& other) noexcept : pointer_(other.detach()) {}

  /// Converts from a reference to a subclass of T, or to a class that conforms to the protocol T.
  template <class Other>
    requires std::convertible_to<Other*, T*>
  Ref(const Ref<Other>& other) noexcept : pointer_(other.get()) {
    retain();
  }
  template <class Other>
    requires std::convertible_to<Other*, T*>
  Ref(Ref<Other>&& other) noexcept : pointer_(other.detach()) {}

  /// Converts a reference to a protocol into a reference to the object behind it.
  template <class Other>
    requires std::same_as<T, Object> && std::derived_from<Other, AnyProtocol> &&
             (!std::derived_from<Other, Object>)
  Ref(const Ref<Other>& other) noexcept : Ref(other ? other->asObject() : nullptr) {}

  ~Ref() { drop(pointer_); }

  Ref& operator=(Ref other) noexcept {
    swap(other);
    return *this;
  }

  /// Returns a reference to `object` without retaining it. The caller hands over a reference that it owns.
  /// `object` may be null.
  static Ref adopt(T* object) noexcept {
    Ref result;
    result.pointer_ = object;
    return result;
  }

  /// Becomes null. Returns the object, or null. The caller now owns its reference.
  [[nodiscard]] T* detach() noexcept { return std::exchange(pointer_, nullptr); }

  void swap(Ref& other) noexcept { std::swap(pointer_, other.pointer_); }

  /// Returns the object, or null. Does not retain it.
  T* get() const noexcept { return pointer_; }
  T* operator->() const noexcept { return pointer_; }
  T& operator*() const noexcept RT_LIFETIME_BOUND { return *pointer_; }
  explicit operator bool() const noexcept { return pointer_ != nullptr; }

  friend bool operator==(const Ref& ref, std::nullptr_t) noexcept { return ref.pointer_ == nullptr; }
  friend bool operator==(const Ref& ref, const T* pointer) noexcept { return ref.pointer_ == pointer; }

 private:
  void retain() const noexcept {
    if (pointer_ != nullptr) detail::objectOf(pointer_)->retain();
  }
  static void drop(T* pointer) noexcept {
    if (pointer != nullptr) detail::objectOf(pointer)->release();
  }

  T* pointer_ = nullptr;
};

/// Returns whether both refer to the same object, or both are null.
template <class T, class Other>
  requires requires(T* first, Other* second) { first == second; }
bool operator==(const Ref<T>& first, const Ref<Other>& second) noexcept {
  return first.get() == second.get();
}

/// Makes a T from `arguments` and returns its first reference. Throws what T's constructor throws, and
/// std::bad_alloc.
template <ClassType T, class... Arguments>
[[nodiscard]] Ref<T> make(Arguments&&... arguments) {
  return Ref<T>::adopt(new T(std::forward<Arguments>(arguments)...));
}

template <class T, class... Arguments>
Ref<T> make(Arguments&&...) {
  static_assert(ClassType<T>, "the class must name itself by rt::Implements");
  return nullptr;
}

/// Returns `ref` as a reference to T. Null if the object is not a T, and for null.
template <class T, class From>
Ref<T> cast(const Ref<From>& ref) noexcept {
  return cast<T>(ref.get());
}

/// Returns a copy of the object (`Object::copy`). Null for a null reference, and if the copy is not a T.
template <class T>
Ref<T> copy(const Ref<T>& ref) {
  if (!ref) return nullptr;
  Ref<Object> copied = detail::objectOf(ref.get())->copy();
  if constexpr (std::same_as<T, Object>) {
    return copied;
  } else {
    return cast<T>(copied);
  }
}

/// Returns whether the objects are equal (`Object::isEqual`), or both references are null.
template <class T, class Other>
bool isEqual(const Ref<T>& first, const Ref<Other>& second) {
  return isEqual(first ? detail::objectOf(first.get()) : nullptr,
                 second ? detail::objectOf(second.get()) : nullptr);
}

}  // namespace rt

/// Hashes the object's address, consistent with `operator==`.
template <class T>
struct std::hash<rt::Ref<T>> {  // NOLINT(cert-dcl58-cpp): a user's specialisation is allowed
  std::size_t operator()(const rt::Ref<T>& ref) const noexcept { return std::hash<T*>()(ref.get()); }
};
