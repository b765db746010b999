#include "Runtime/Objects/Weak.h"

#include <memory>

namespace rt::detail {

WeakCell* WeakCell::of(const Object& object) {
  if (object.isBeingDestroyed()) return nullptr;
  void* known = object.cellOrClass_.load(std::memory_order_acquire);
  if (known == nullptr) {
    std::unique_ptr<WeakCell> made(new WeakCell(object));
    if (object.cellOrClass_.compare_exchange_strong(known, made.get(), std::memory_order_acq_rel,
                                                    std::memory_order_acquire)) {
      return made.release();
    }
  }
  auto* const cell = static_cast<WeakCell*>(known);
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
