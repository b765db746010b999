#include "Runtime/Weak.h"

#include <memory>

namespace rt::detail {

WeakCell* WeakCell::of(const Object& object) {
  if (object.isBeingDestroyed()) return nullptr;
  WeakCell* cell = object.weakCell_.load(std::memory_order_acquire);
  if (cell == nullptr) {
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
  const LockGuard guard(lock_);
  return object_ != nullptr && object_->retainUnlessDestroyed();
}

void WeakCell::clear() noexcept {
  const LockGuard guard(lock_);
  object_ = nullptr;
}

}  // namespace rt::detail
