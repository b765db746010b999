#include "Runtime/Objects/ClassMethod.h"

#include <algorithm>
#include <compare>

#include "Runtime/Locks/UnfairLock.h"

namespace rt {

namespace {

// The list of methods, in the order in which they were announced. It only grows, so reading it takes no lock.
constinit std::atomic<detail::ClassMethodEntry*> first{nullptr};
constinit UnfairLock lock;
constinit std::atomic<detail::ClassMethodEntry*>* end RT_GUARDED_BY(lock) = &first;

}  // namespace

void detail::announce(ClassMethodEntry& entry) noexcept {
  const LockGuard guard(lock);
  if (entry.isAnnounced) return;
  entry.isAnnounced = true;
  end->store(&entry, std::memory_order_release);
  end = &entry.next;
}

std::vector<ClassMethod> classMethods(const ClassInfo& info) {
  std::vector<ClassMethod> methods;
  for (const detail::ClassMethodEntry* entry = first.load(std::memory_order_acquire); entry != nullptr;
       entry = entry->next.load(std::memory_order_acquire)) {
    if (entry->owner != &info) continue;
    methods.push_back(entry->method());
    methods.back().position_ = methods.size();
  }
  std::ranges::sort(methods, [](const ClassMethod& one, const ClassMethod& other) {
    const std::strong_ordering order = one.selector_ <=> other.selector_;
    return order != 0 ? order < 0 : one.position_ < other.position_;
  });
  return methods;
}

}  // namespace rt
