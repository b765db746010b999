#include "Runtime/Weak.h"

#include <memory>

namespace rt::detail {

WeakCell* WeakCell::of(const Object& object) {
  WeakCell* cell = object.weakCell_.load(std::memory_order_acquire);
  if (cell == nullptr) {
    if (object.count_.load(std::memory_order_relaxed) == Object::kDestroying) return nullptr;
    std::unique_ptr<WeakCell> made(new WeakCell(object));
    if (object.weakCell_.compare_exchange_strong(cell, made.get(), std::memory_order_acq_rel,
                                                 std::memory_order_acquire)) {
      return made.release();
    }
  }
  cell->retain();
  return cell;
}

void WeakCell::release() noexcept {
  if (count_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
}

bool WeakCell::retainObject() noexcept {
  lock();
  const bool isAlive = object_ != nullptr && object_->retainUnlessDestroyed();
  unlock();
  return isAlive;
}

void WeakCell::clear() noexcept {
  lock();
  object_ = nullptr;
  unlock();
}

void WeakCell::lock() noexcept {
  while (isLocked_.exchange(true, std::memory_order_acquire)) isLocked_.wait(true, std::memory_order_relaxed);
}

void WeakCell::unlock() noexcept {
  isLocked_.store(false, std::memory_order_release);
  isLocked_.notify_one();
}

}  // namespace rt::detail
