#pragma once

/// An observer of the scopes that end. It learns which instances outlive their scope.
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
/// Not for: keeping instances alive. The observer gets weak references only.

#include <vector>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Objects/Weak.h"

struct RT_VISIBLE SRLScopeLifecycleDelegate : rt::Protocol<SRLScopeLifecycleDelegate> {
  /// Called after the registry has removed and released the scopes with `tag`. `serviceInstances` refers to
  /// the instances that they held. Something else retains those that still exist. The list is empty if the
  /// delegate was set after the removal began.
  /// Threads: called on the thread that removed the scopes. No lock is held.
  virtual void didRemoveScopesWithTag(const rt::Ref<rt::Object>& tag,
                                      const std::vector<rt::Weak<rt::Object>>& serviceInstances) = 0;

 protected:
  ~SRLScopeLifecycleDelegate() = default;
};
