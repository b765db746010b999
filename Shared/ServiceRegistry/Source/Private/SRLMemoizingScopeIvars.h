#pragma once

/// The state of an SRLMemoizingScope.
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

/// An instance that is being made. The thread that makes it holds a lock, for which other threads wait.
class RT_VISIBLE SRLPendingCreation final : public rt::Implements<SRLPendingCreation, rt::Object> {
 public:
  // Not analysed, since one function takes the lock and another one releases it.
  void begin() noexcept RT_NO_THREAD_SAFETY_ANALYSIS { lock_.lock(); }
  void end() noexcept RT_NO_THREAD_SAFETY_ANALYSIS { lock_.unlock(); }

  /// Notes that a thread is going to wait. The caller of this and of `isAwaited` holds the scope's lock.
  void expectWaiter() noexcept { isAwaited_ = true; }
  bool isAwaited() const noexcept { return isAwaited_; }

  /// Returns whether a fork has left the thread that makes the instance behind, in the parent process.
  /// Another thread may then begin.
  bool isAbandoned() const noexcept { return lock_.isAbandoned(); }

  /// Blocks until no thread is making the instance.
  void wait() noexcept { const rt::LockGuard guard(lock_); }

 private:
  rt::LongLock lock_;
  bool isAwaited_ = false;
};

struct SRLMemoizingScopeIvars {
  /// Entries are never removed or replaced, so that looking for an instance needs no lock.
  SRLTable<const void*, rt::Ref<rt::Object>> instances RT_GUARDED_BY(lock);
  std::unordered_map<const void*, rt::Ref<SRLPendingCreation>> pendingCreations RT_GUARDED_BY(lock);
  /// A former entry of `pendingCreations`, for reuse. No thread has waited for it. May be empty.
  std::unordered_map<const void*, rt::Ref<SRLPendingCreation>>::node_type spareCreation RT_GUARDED_BY(lock);
  rt::UnfairLock lock;
};
