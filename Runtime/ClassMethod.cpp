#include "Runtime/ClassMethod.h"

#include <algorithm>
#include <utility>

#include "Runtime/UnfairLock.h"

namespace rt {

namespace {

/// In the order in which they were announced. Only ever grows, so that reading takes no lock.
constinit std::atomic<detail::ClassMethodEntry*> first{nullptr};
constinit UnfairLock lock;
constinit std::atomic<detail::ClassMethodEntry*>* end RT_GUARDED_BY(lock) = &first;
constinit std::size_t count RT_GUARDED_BY(lock) = 0;

}  // namespace

void detail::announce(ClassMethodEntry& entry) noexcept {
  const LockGuard guard(lock);
  if (entry.position != 0) return;
  entry.position = ++count;
  end->store(&entry, std::memory_order_release);
  end = &entry.next;
}

std::vector<ClassMethod> classMethods(const ClassInfo& info) {
  std::vector<std::pair<std::size_t, ClassMethod>> found;
  for (const detail::ClassMethodEntry* entry = first.load(std::memory_order_acquire); entry != nullptr;
       entry = entry->next.load(std::memory_order_acquire)) {
    if (entry->owner == &info) found.emplace_back(entry->position, entry->method());
  }
  std::ranges::sort(found, {},
                    [](const auto& each) { return std::pair(each.second.selector(), each.first); });
  std::vector<ClassMethod> methods;
  methods.reserve(found.size());
  for (const auto& [position, method] : found) methods.push_back(method);
  return methods;
}

}  // namespace rt
