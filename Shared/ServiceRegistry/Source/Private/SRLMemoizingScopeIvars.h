#pragma once

/// What an SRLMemoizingScope knows.
///
///     SRLMemoizingScopeIvars ivars;
///     const rt::LockGuard guard(ivars.lock);
///     ivars.instances.emplace(identifier, instance);
///
/// Not for: anything but the scope and its tests.

#include <unordered_map>

#include "Runtime/Class.h"
#include "Runtime/Object.h"
#include "Runtime/Ref.h"
#include "Runtime/UnfairLock.h"
#include "Runtime/Visibility.h"

/// The making of an instance: a lock that whoever makes it holds meanwhile, and for which the others wait.
class RT_VISIBLE SRLPendingCreation final : public rt::Implements<SRLPendingCreation, rt::Object> {
 public:
  // A thread takes and lets go the lock in different functions, and only for the time between them.
  void begin() noexcept RT_NO_THREAD_SAFETY_ANALYSIS { lock_.lock(); }
  void end() noexcept RT_NO_THREAD_SAFETY_ANALYSIS { lock_.unlock(); }

  /// Waits until nobody makes the instance any more.
  void wait() noexcept { const rt::LockGuard guard(lock_); }

 private:
  rt::UnfairLock lock_;
};

struct SRLMemoizingScopeIvars {
  std::unordered_map<const void*, rt::Ref<rt::Object>> instances RT_GUARDED_BY(lock);
  std::unordered_map<const void*, rt::Ref<SRLPendingCreation>> pendingCreations RT_GUARDED_BY(lock);
  rt::UnfairLock lock;
};
