#pragma once

/// What an SRLMemoizingScope knows.
///
///     SRLMemoizingScopeIvars ivars;
///     const rt::LockGuard guard(ivars.lock);
///     ivars.instances.insert(identifier, instance);
///
/// Not for: anything but the scope and its tests.

#include <unordered_map>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/Private/LongLock.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/ServiceRegistry/Source/Private/SRLTable.h"

/// The making of an instance: a lock that whoever makes it holds meanwhile, and for which the others wait.
class RT_VISIBLE SRLPendingCreation final : public rt::Implements<SRLPendingCreation, rt::Object> {
 public:
  // A thread takes and lets go the lock in different functions, and only for the time between them.
  void begin() noexcept RT_NO_THREAD_SAFETY_ANALYSIS { lock_.lock(); }
  void end() noexcept RT_NO_THREAD_SAFETY_ANALYSIS { lock_.unlock(); }

  /// Says that a thread is going to wait. Whoever calls this and `isAwaited` holds the scope's lock.
  void expectWaiter() noexcept { isAwaited_ = true; }
  bool isAwaited() const noexcept { return isAwaited_; }

  /// Whether the thread that makes the instance is in another process, which a fork has left it behind in.
  /// Then another may begin.
  bool isAbandoned() const noexcept { return lock_.isAbandoned(); }

  /// Waits until nobody makes the instance any more.
  void wait() noexcept { const rt::LockGuard guard(lock_); }

 private:
  rt::LongLock lock_;
  bool isAwaited_ = false;
};

struct SRLMemoizingScopeIvars {
  /// Nothing is taken out or replaced, so that whoever looks for an instance needs no lock.
  SRLTable<const void*, rt::Ref<rt::Object>> instances RT_GUARDED_BY(lock);
  std::unordered_map<const void*, rt::Ref<SRLPendingCreation>> pendingCreations RT_GUARDED_BY(lock);
  /// An entry that was pending, and that no thread has waited for, to be used again; or none.
  std::unordered_map<const void*, rt::Ref<SRLPendingCreation>>::node_type spareCreation RT_GUARDED_BY(lock);
  rt::UnfairLock lock;
};
