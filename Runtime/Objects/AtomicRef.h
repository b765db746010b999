#pragma once

/// `rt::AtomicRef<T>` is a strong reference that threads read without a lock while others replace it.
///
///     rt::AtomicRef<Settings> settings_;
///     const rt::Ref<Settings> now = settings_.load();     // stays valid when another is set
///     settings_.exchange(rt::make<Settings>("dark"_s));
///
/// Threads: reading is one atomic operation. It is repeated if another thread changed the reference
/// meanwhile. A reader never waits for another thread. A thread that replaces the reference waits for others
/// that replace it. A replaced object lives until the last reference that was read is released.
///
/// Reading the pointer first and retaining the object afterwards would be too late. The object might be gone
/// in between. So the object is retained many times in advance. These counts are called the lot, and each
/// reader is lent one of them. One atomic word holds the pointer and the number of counts that have been
/// lent.
///
/// A reader keeps its count. When the object is replaced, the counts that are left in the lot are released. A
/// reader that finds half of the lot lent adds new counts to it.
///
/// In the child of a fork, counts lent to threads that are gone are lost. An object that they were reading is
/// never destroyed there.
///
/// Not for: a reference that one thread uses; several references that must match each other, which belong in
/// one object.

#include <atomic>
#include <cstdint>
#include <type_traits>
#include <utility>

#include "Runtime/Base/ThreadSafety.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

namespace rt {

/// T is a class that derives from `Object`. It cannot be a protocol.
template <class T>
class AtomicRef {
  static_assert(sizeof(void*) == sizeof(std::uint64_t), "a pointer leaves 16 bits of a word");

 public:
  /// Makes a null reference.
  constexpr AtomicRef() noexcept = default;
  AtomicRef(const AtomicRef&) = delete;
  AtomicRef& operator=(const AtomicRef&) = delete;
  ~AtomicRef() { exchange(nullptr); }

  /// Returns a reference to the object, or null.
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

  /// Replaces the reference with `next`, which may be null. Returns the previous reference.
  Ref<T> exchange(Ref<T> next) noexcept {
    const LockGuard guard(lock_);
    replace(next);
    return next;
  }

  /// If the reference is `expected`, replaces it with `next` and returns true. Otherwise changes nothing and
  /// returns false.
  bool compareExchange(const Ref<T>& expected, Ref<T> next) noexcept {
    // `next` takes over the previous reference. It releases that after the lock.
    const LockGuard guard(lock_);
    if (current_ != expected) return false;
    replace(next);
    return true;
  }

 private:
  // The object's address is in the upper bits. The number of lent counts is in the lower bits.
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

  // Called when half of the lot is lent. Other readers use the other half meanwhile.
  [[gnu::cold]] void addToLot(const T& object, std::uint32_t count) const noexcept {
    object.retainTimes(count);
    Word word = word_.load(std::memory_order_relaxed);
    while (objectIn(word) == &object && lentIn(word) >= count) {
      if (word_.compare_exchange_weak(word, word - count, std::memory_order_relaxed)) return;
    }
    object.releaseTimes(count);  // Rare: another reader was faster, or the object was replaced.
  }

  mutable std::atomic<Word> word_ = 0;
  // Writers hold the lock. `current_` is the object in the word, with a reference of its own.
  UnfairLock lock_;
  Ref<T> current_ RT_GUARDED_BY(lock_);
};

}  // namespace rt
