#pragma once

/// `rt::Object` is the base class of all objects. It has a reference count, equality, a hash, a description
/// and a class.
///
///     class Point final : public rt::Implements<Point, rt::Object> {
///      public:
///       Point(int x, int y) : x_(x), y_(y) {}
///       bool isEqual(const rt::Object* other) const override {
///         const Point* point = rt::cast<Point>(other);
///         return point != nullptr && point->x_ == x_ && point->y_ == y_;
///       }
///       std::uint64_t hash() const override { return 41 * std::uint64_t(x_) + std::uint64_t(y_); }
///      private:
///       int x_, y_;
///     };
///
///     rt::Ref<Point> point = rt::make<Point>(3, 4);      // Runtime/Objects/Ref.h
///
/// An object starts with one reference. The thread that releases the last one destroys the object. A
/// destructor may make references to its object, but none may outlive the object. A reference that does ends
/// the program with a line on standard error.
///
/// Threads: counting references is thread-safe. Everything else is as thread-safe as the class says.
///
/// Not for: values, which need neither identity nor a count; objects on the stack to which references outlive
/// the scope.

#include <atomic>
#include <cstdint>
#include <type_traits>

namespace rt {

struct ClassInfo;
struct ProtocolInfo;
class String;
template <class T>
class AtomicRef;
template <class T>
class Ref;

namespace detail {
class WeakCell;
}

class Object {
 public:
  using ClassSelf = Object;

  Object(const Object&) = delete;
  Object& operator=(const Object&) = delete;
  constexpr virtual ~Object() {
    if (!std::is_constant_evaluated() && count_.load(std::memory_order_relaxed) != kDestroying) [[unlikely]]
      checkNotEscaped();
  }

  /// Adds a reference. `Ref` calls this. Call it yourself only to keep a reference in something untyped.
  void retain() const noexcept {
    if (isImmortal()) return;
    count_.fetch_add(1, std::memory_order_relaxed);
  }

  /// Releases a reference. The last release destroys the object on the calling thread.
  void release() const noexcept {
    const std::uint32_t count = count_.load(std::memory_order_acquire);
    if ((count & kImmortal) != 0) return;
    // With one strong and no weak reference, no other thread can add a reference. So a read is enough.
    const bool isOnlyOne = count == 1 && cellOrClass_.load(std::memory_order_relaxed) == nullptr;
    if (isOnlyOne || count_.fetch_sub(1, std::memory_order_acq_rel) == 1) [[unlikely]]
      destroy();
  }

  /// Returns whether `other` is equal to this object. False for null. By default an object equals only
  /// itself. Equal objects must have equal hashes.
  virtual bool isEqual(const Object* other) const;

  /// Returns a hash that is consistent with `isEqual`. By default it is derived from the address.
  virtual std::uint64_t hash() const;

  /// Returns a text for people. By default "<ClassName: 0x...>" with the object's address.
  virtual String description() const;

  /// Returns an object to keep, which has the present value and never changes. A class whose objects change
  /// returns a copy. The default returns the object itself, which suits immutable classes. Never null. Throws
  /// what making the copy throws.
  virtual Ref<Object> copy() const;

  /// Returns the record of the object's class. Only `Implements` overrides this function.
  virtual const ClassInfo& classInfo() const noexcept;

  /// Returns whether the object's class is `other` or derives from it.
  bool isKindOf(const ClassInfo& other) const noexcept;

  /// Returns whether the object's class is `other` itself.
  bool isMemberOf(const ClassInfo& other) const noexcept;

  /// Returns whether the object's class, or one of its superclasses, conforms to `protocol`.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept;

  /// Returns the record of this class.
  static constexpr const ClassInfo& classRecord() noexcept { return kInfo; }

 protected:
  constexpr Object() noexcept = default;

  /// Marks an object as a constant that is never destroyed, such as a string literal. Counting its references
  /// writes nothing. Declare such an object `constexpr`, so that no destructor is registered to run at exit.
  /// For that, g++ wants its class to write out `constexpr ~Self() override {}`.
  struct Immortal {};
  explicit constexpr Object(Immortal) noexcept : count_(kImmortal) {}

 private:
  friend class detail::WeakCell;
  template <class T>
  friend class AtomicRef;

  // The count is below both bits as long as the object lives. kDestroying is set while the object is being
  // destroyed. So references that come and go in a destructor do not destroy the object again. A count that
  // overflows ends in kImmortal. The object then leaks, which is harmless.
  static constexpr std::uint32_t kImmortal = 0x80000000;
  static constexpr std::uint32_t kDestroying = 0x40000000;
  static const ClassInfo kInfo;

  bool isImmortal() const noexcept { return (count_.load(std::memory_order_relaxed) & kImmortal) != 0; }
  bool isBeingDestroyed() const noexcept {
    return (count_.load(std::memory_order_relaxed) & (kImmortal | kDestroying)) == kDestroying;
  }
  bool retainUnlessDestroyed() const noexcept;

  // Each stands for `times` calls of `retain` or `release`. The caller of `releaseTimes` owns one more
  // reference, so that the object lives on.
  void retainTimes(std::uint32_t times) const noexcept {
    if (!isImmortal()) count_.fetch_add(times, std::memory_order_relaxed);
  }
  void releaseTimes(std::uint32_t times) const noexcept {
    if (!isImmortal()) count_.fetch_sub(times, std::memory_order_acq_rel);
  }

  [[gnu::noinline]] void destroy() const noexcept;
  [[gnu::cold]] void checkNotEscaped() const noexcept;

  // Points to the cell of the weak references, or is null if there are none. While the object is being
  // destroyed, it points to the record of the object's class instead. ~Object could not find that record
  // otherwise.
  mutable std::atomic<void*> cellOrClass_{nullptr};
  mutable std::atomic<std::uint32_t> count_{1};
};

/// Returns whether two objects are equal. Either may be null. Two nulls are equal.
inline bool isEqual(const Object* first, const Object* second) {
  return first == second || (first != nullptr && second != nullptr && first->isEqual(second));
}

}  // namespace rt
