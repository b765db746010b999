#include "Runtime/Objects/LoadHook.h"

#include <utility>

#include "Runtime/Base/LoadedImages.h"
#include "Runtime/Locks/UnfairLock.h"

namespace rt::detail {

namespace {

constinit UnfairLock lock;
constinit LoadHookEntry* pending RT_GUARDED_BY(lock) = nullptr;
constinit LoadHookEntry** end RT_GUARDED_BY(lock) = &pending;

// Takes the first hook that has not run. Null if there is none.
LoadHookEntry* takePending() noexcept {
  const LockGuard guard(lock);
  LoadHookEntry* entry = pending;
  if (entry != nullptr) {
    pending = entry->next;
    if (pending == nullptr) end = &pending;
  }
  return entry;
}

bool isAnyPending() noexcept {
  const LockGuard guard(lock);
  return pending != nullptr;
}

}  // namespace

void announce(LoadHookEntry& entry) noexcept {
  const LockGuard guard(lock);
  if (entry.isAnnounced) return;
  entry.isAnnounced = true;
  *end = &entry;
  end = &entry.next;
}

void runLoadHooksWhenComplete() noexcept {
  if (!isAnyPending() || !areAllImagesAnnounced()) return;
  while (const LoadHookEntry* entry = takePending()) entry->function();
}

}  // namespace rt::detail
