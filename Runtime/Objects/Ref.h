#pragma once

/// The strong reference: one pointer, null or counted.
///
///     rt::Ref<SystemClock> clock = rt::make<SystemClock>();
///     rt::Ref<Clock> shared = clock;                    // by a protocol, or a superclass
///     rt::Ref<Clock> found = rt::cast<Clock>(object);   // from a pointer: adds a reference
///     if (found) found->now();
///
/// T is a class that derives from `rt::Object`, or a protocol; it may be incomplete until a reference
/// is made or dropped. Copying adds a reference, moving leaves null behind. Two references are equal
/// when they refer to the same object. Different `Ref` objects may be used by different threads at
/// once; one `Ref` object is as safe as a plain pointer.
///
/// Not for: cycles (see Runtime/Objects/Weak.h); parameters of functions that keep nothing, which take `T&`
/// or `T*`.

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

  /// Null.
  constexpr Ref() noexcept = default;
  constexpr Ref(std::nullptr_t) noexcept {}

  /// Adds a reference to `object`, which may be null.
  Ref(T* object) noexcept : pointer_(object) { retain(); }

  Ref(const Ref& other) noexcept : pointer_(other.pointer_) { retain(); }
  Ref(Ref&& other) noexcept : pointer_(other.detach()) {}

  /// From a reference to a subclass, or to a class that conforms to the protocol T.
  template <class Other>
    requires std::convertible_to<Other*, T*>
  Ref(const Ref<Other>& other) noexcept : pointer_(other.get()) {
    retain();
  }
  template <class Other>
    requires std::convertible_to<Other*, T*>
  Ref(Ref<Other>&& other) noexcept : pointer_(other.detach()) {}

  /// From a reference to a protocol to one to the object behind it.
  template <std::derived_from<AnyProtocol> Other>
    requires(std::same_as<T, Object> && !std::derived_from<Other, Object>)
  Ref(const Ref<Other>& other) noexcept : Ref(other ? other->asObject() : nullptr) {}

  ~Ref() { drop(pointer_); }

  Ref& operator=(Ref other) noexcept {
    swap(other);
    return *this;
  }

  /// Takes over a reference that `object`, which may be null, has already.
  static Ref adopt(T* object) noexcept {
    Ref result;
    result.pointer_ = object;
    return result;
  }

  /// Becomes null and hands its reference, if any, to the caller.
  [[nodiscard]] T* detach() noexcept { return std::exchange(pointer_, nullptr); }

  void swap(Ref& other) noexcept { std::swap(pointer_, other.pointer_); }

  /// The object, or null; not retained.
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

/// Whether both refer to the same object, or both are null.
template <class T, class Other>
  requires requires(T* first, Other* second) { first == second; }
bool operator==(const Ref<T>& first, const Ref<Other>& second) noexcept {
  return first.get() == second.get();
}

/// A new T, made from `arguments`, and the only reference to it. Throws what T's constructor throws,
/// and std::bad_alloc.
template <ClassType T, class... Arguments>
[[nodiscard]] Ref<T> make(Arguments&&... arguments) {
  return Ref<T>::adopt(new T(std::forward<Arguments>(arguments)...));
}

template <class T, class... Arguments>
Ref<T> make(Arguments&&...) {
  static_assert(ClassType<T>, "the class must name itself by rt::Implements");
  return nullptr;
}

/// `ref` as a T; null where the object is none, and for null.
template <class T, class From>
Ref<T> cast(const Ref<From>& ref) noexcept {
  return cast<T>(ref.get());
}

/// The object as somebody keeps it (`Object::copy`), which is a T too; null for null.
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

/// Whether the objects of two references are equal, or both are null.
template <class T, class Other>
bool isEqual(const Ref<T>& first, const Ref<Other>& second) {
  return isEqual(first ? detail::objectOf(first.get()) : nullptr,
                 second ? detail::objectOf(second.get()) : nullptr);
}

}  // namespace rt

/// Of the object's identity, as `==` compares references.
template <class T>
struct std::hash<rt::Ref<T>> {  // NOLINT(cert-dcl58-cpp): what it is for
  std::size_t operator()(const rt::Ref<T>& ref) const noexcept { return std::hash<T*>()(ref.get()); }
};
