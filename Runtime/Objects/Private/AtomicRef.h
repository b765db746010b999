#pragma once

/// A reference that threads read without a lock while others replace it.
///
///     rt::AtomicRef<Settings> settings_;
///     const rt::Ref<Settings> now = settings_.load();     // lasts, whatever is set meanwhile
///     settings_.exchange(rt::make<Settings>("dark"_s));
///
/// Reading is one atomic operation, and no thread that reads ever waits for another. Who replaces waits for
/// others who do. An object that is replaced goes with the last reference to it that was read.
///
/// To read a pointer and then to count would be too late: the object may be gone in between. So the object is
/// counted beforehand, for many readers, and the word that they read holds beside the pointer how many of
/// these counts it has lent. A reader keeps the one that it was lent. What is left when the object is
/// replaced is given back; before the lot is used up, a reader that sees it near its end adds to it.
///
/// In the child of a fork the counts lent to threads that are gone are lost: an object that they were reading
/// is never destroyed there.
///
/// Not for: references that one thread has; several that must fit each other, which belong in one object.

#include <atomic>
#include <cstdint>
#include <type_traits>
#include <utility>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

/// T is a class of objects, and no protocol.
template <class T>
class AtomicRef {
  static_assert(sizeof(void*) == sizeof(std::uint64_t), "a pointer leaves 16 bits of a word");

 public:
  /// Null.
  constexpr AtomicRef() noexcept = default;
  AtomicRef(const AtomicRef&) = delete;
  AtomicRef& operator=(const AtomicRef&) = delete;
  ~AtomicRef() { exchange(nullptr); }

  /// The object, or null.
  Ref<T> load() const noexcept {
    Word word = word_.load(std::memory_order_relaxed);
    do {
      if (objectIn(word) == nullptr) return nullptr;
    } while (
        !word_.compare_exchange_weak(word, word + 1, std::memory_order_acquire, std::memory_order_relaxed));
    Ref<T> result = Ref<T>::adopt(objectIn(word));
    if (lentIn(word) >= kLot / 2) [[unlikely]]
      addToLot(*result, lentIn(word));
    return result;
  }

  /// Has `next`, which may be null, take the place of what is there, and returns that.
  Ref<T> exchange(Ref<T> next) noexcept {
    const LockGuard guard(lock_);
    replace(next);
    return next;
  }

  /// The same, and true, where `expected` is there; else false, and nothing has changed.
  bool compareExchange(const Ref<T>& expected, Ref<T> next) noexcept {
    // `next` gives up what was there after the lock.
    const LockGuard guard(lock_);
    if (current_ != expected) return false;
    replace(next);
    return true;
  }

 private:
  /// The object's address above, how many counts are lent below.
  using Word = std::uint64_t;
  static constexpr int kLentBits = 16;
  static constexpr std::uint32_t kLot = 1U << kLentBits;

  static T* objectIn(Word word) noexcept { return reinterpret_cast<T*>(word >> kLentBits); }
  static std::uint32_t lentIn(Word word) noexcept { return static_cast<std::uint32_t>(word % kLot); }

  void replace(Ref<T>& next) noexcept RT_REQUIRES(lock_) {
    if (next != nullptr) next->retainTimes(kLot);
    const Word word = word_.exchange(Word{reinterpret_cast<std::uintptr_t>(next.get())} << kLentBits,
                                     std::memory_order_acq_rel);
    current_.swap(next);
    if (next != nullptr) next->releaseTimes(kLot - lentIn(word));
  }

  // Half of the lot is still there for the others meanwhile.
  [[gnu::cold]] void addToLot(const T& object, std::uint32_t count) const noexcept {
    object.retainTimes(count);
    Word word = word_.load(std::memory_order_relaxed);
    while (objectIn(word) == &object && lentIn(word) >= count) {
      if (word_.compare_exchange_weak(word, word - count, std::memory_order_relaxed)) return;
    }
    object.releaseTimes(count);  // Meanwhile another reader has, or it was replaced: seldom seen.
  }

  mutable std::atomic<Word> word_ = 0;
  // The object in the word, with a reference of its own. For those who replace it.
  UnfairLock lock_;
  Ref<T> current_ RT_GUARDED_BY(lock_);
};

}  // namespace rt
