#pragma once

/// The root of all objects: counted references, equality, hash, description and class.
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
/// An object starts with one reference and is destroyed by the thread that gives up the last. A
/// destructor may refer to its object, but no reference may outlive it: that is a bug which ends the
/// program with a line on standard error. Counting is safe from any thread; what a class adds is as
/// safe as it says.
///
/// Not for: values, which need no identity and no count; objects on the stack of which references
/// outlive the scope.

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

  /// Adds a reference. `Ref` does this; call it only where a reference is kept in something untyped.
  void retain() const noexcept {
    if (isImmortal()) return;
    count_.fetch_add(1, std::memory_order_relaxed);
  }

  /// Gives up a reference; the object is destroyed with the last, on the calling thread.
  void release() const noexcept {
    const std::uint32_t count = count_.load(std::memory_order_acquire);
    if ((count & kImmortal) != 0) return;
    // Where this is the only reference and there is no weak one, nobody else can add any.
    const bool isOnlyOne = count == 1 && cellOrClass_.load(std::memory_order_relaxed) == nullptr;
    if (isOnlyOne || count_.fetch_sub(1, std::memory_order_acq_rel) == 1) [[unlikely]]
      destroy();
  }

  /// Whether `other` is an equal object; false for null. By default only the object itself is.
  /// Equal objects have equal hashes.
  virtual bool isEqual(const Object* other) const;

  /// A hash that suits `isEqual`. By default made from the address.
  virtual std::uint64_t hash() const;

  /// The object as text, for people. By default "<ClassName: 0x...>" with the address.
  virtual String description() const;

  /// The object for somebody who keeps it as it is now: a copy of one that may change, by default the object
  /// itself, which suits all that never do. Never null. Throws what making the copy throws.
  virtual Ref<Object> copy() const;

  /// The record of the object's class. Overridden by `Implements`, by nothing else.
  virtual const ClassInfo& classInfo() const noexcept;

  /// Whether the object is of the class `other` or one that derives from it.
  bool isKindOf(const ClassInfo& other) const noexcept;

  /// Whether the object is of the class `other` itself.
  bool isMemberOf(const ClassInfo& other) const noexcept;

  /// Whether the object's class, or one that it derives from, conforms to `protocol`.
  bool conformsTo(const ProtocolInfo& protocol) const noexcept;

  /// The record of this class.
  static constexpr const ClassInfo& classRecord() noexcept { return kInfo; }

 protected:
  constexpr Object() noexcept = default;

  /// Says that the object is a constant that is never destroyed, as a string literal is: counting its
  /// references writes nothing. Such an object is declared `constexpr`, so that nothing is registered to
  /// run for it at exit; g++ wants its class to write out `constexpr ~Self() override {}` for that.
  struct Immortal {};
  explicit constexpr Object(Immortal) noexcept : count_(kImmortal) {}

 private:
  friend class detail::WeakCell;
  template <class T>
  friend class AtomicRef;

  // The count is below both bits as long as the object lives. While the object is being destroyed
  // kDestroying is set, so that references which come and go in a destructor do not destroy it again. A
  // count that runs over ends in kImmortal: the object leaks, which harms nobody.
  static constexpr std::uint32_t kImmortal = 0x80000000;
  static constexpr std::uint32_t kDestroying = 0x40000000;
  static const ClassInfo kInfo;

  bool isImmortal() const noexcept { return (count_.load(std::memory_order_relaxed) & kImmortal) != 0; }
  bool isBeingDestroyed() const noexcept {
    return (count_.load(std::memory_order_relaxed) & (kImmortal | kDestroying)) == kDestroying;
  }
  bool retainUnlessDestroyed() const noexcept;

  // As many calls of `retain`, or of `release` by somebody who has one reference more.
  void retainTimes(std::uint32_t times) const noexcept {
    if (!isImmortal()) count_.fetch_add(times, std::memory_order_relaxed);
  }
  void releaseTimes(std::uint32_t times) const noexcept {
    if (!isImmortal()) count_.fetch_sub(times, std::memory_order_acq_rel);
  }

  [[gnu::noinline]] void destroy() const noexcept;
  [[gnu::cold]] void checkNotEscaped() const noexcept;

  // The cell of the weak references, if there are any; while the object is being destroyed, its class's
  // record instead, which ~Object would not know.
  mutable std::atomic<void*> cellOrClass_{nullptr};
  mutable std::atomic<std::uint32_t> count_{1};
};

/// Whether two objects, either of which may be null, are equal. Two nulls are.
inline bool isEqual(const Object* first, const Object* second) {
  return first == second || (first != nullptr && second != nullptr && first->isEqual(second));
}

}  // namespace rt
