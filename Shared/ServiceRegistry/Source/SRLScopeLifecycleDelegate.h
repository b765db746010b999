#pragma once

/// Who is told of scopes that end, and which instances outlived them.
///
///     class LeakWatch final : public rt::Implements<LeakWatch, rt::Object, SRLScopeLifecycleDelegate> {
///      public:
///       void didRemoveScopesWithTag(const rt::Ref<rt::Object>& tag,
///                                   const std::vector<rt::Weak<rt::Object>>& serviceInstances) override {
///         for (const rt::Weak<rt::Object>& instance : serviceInstances) {
///           if (const rt::Ref<rt::Object> leaked = instance.lock()) report(tag, leaked);
///         }
///       }
///     };
///
/// Not for: keeping instances alive.

#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/Weak.h"

struct RT_VISIBLE SRLScopeLifecycleDelegate : rt::Protocol<SRLScopeLifecycleDelegate> {
  /// The scopes with `tag` have been removed, and have given up the instances that they had:
  /// `serviceInstances`, of which those that are still there are kept by somebody else. Called on the thread
  /// that removed them, without a lock. `serviceInstances` is empty where the delegate was set only after the
  /// removal had begun.
  virtual void didRemoveScopesWithTag(const rt::Ref<rt::Object>& tag,
                                      const std::vector<rt::Weak<rt::Object>>& serviceInstances) = 0;

 protected:
  ~SRLScopeLifecycleDelegate() = default;
};
