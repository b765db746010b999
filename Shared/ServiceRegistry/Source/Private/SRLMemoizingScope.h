#pragma once

/// Holds the instances of a scope. Each is made once, by the first request for it.
///
///     rt::Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
///     rt::Ref<rt::Object> clock =
///         scope->instanceForIdentifier(&systemClock, nullptr, [] { return rt::make<SystemClock>(); });
///
/// Threads: any thread may use it. No lock is held while an instance is made, so a factory may request other
/// instances from the scope. A request for an instance that is being made blocks until it is made. If the
/// factory of that instance or an error callback makes such a request, this ends the program.
///
/// Errors: a request throws what its factory throws. The instance then stays pending, since nothing says
/// whether the factory can be called again. Requests that wait for the instance report this and return null.
/// So do later requests. Memory for the instance is allocated before its factory runs: if there is none,
/// nothing has begun.
///
/// In the child of a fork, an instance that another thread was making counts as not begun. The first request
/// makes it.
///
/// Not for: hosts. They use SRLRegistry, which has a scope for each set of tags.

#include <concepts>
#include <memory>
#include <type_traits>
#include <utility>

#include "Runtime/Base/Private/FunctionView.h"
#include "Runtime/Base/Visibility.h"
#include "Runtime/Locks/UnfairLock.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Runtime/Values/Array.h"
#include "Shared/ServiceRegistry/Source/Private/SRLMemoizingScopeIvars.h"

class RT_VISIBLE SRLMemoizingScope final : public rt::Implements<SRLMemoizingScope, rt::Object> {
 public:
  /// Returns a scope without instances. Throws std::bad_alloc.
  static rt::Ref<SRLMemoizingScope> init();

  /// Returns the instance for `identifier`. If there is none yet, calls `factoryBlock` to make it, or blocks
  /// while another thread makes it. Null if the factory returned null.
  ///
  /// - `identifier` is an address that is only compared.
  /// - `instanceCreated` may be null. If there was no instance yet, `*instanceCreated` becomes whether this
  ///   call called the factory. Otherwise it stays unchanged.
  /// - `factoryBlock` is a block or another callable object that returns a reference. It is not null.
  ///
  /// Errors: if the factory has thrown before, that is reported and yields null. Throws what the factory and
  /// the error callback throw, and std::bad_alloc. Throws nothing once the factory has returned.
  template <class Factory>
    requires std::invocable<const Factory&>
  rt::Ref<rt::Object> instanceForIdentifier(const void* identifier, bool* instanceCreated,
                                            const Factory& factoryBlock) {
    if constexpr (std::is_function_v<Factory>) {
      return instanceForIdentifier(identifier, instanceCreated, &factoryBlock);
    } else {
      rt::Ref<rt::Object> instance;
      if (findInstance(identifier, instance)) [[likely]]
        return instance;
      return makeOrAwaitInstance(identifier, instanceCreated, factoryBlock);
    }
  }

  /// Sets `instance` to the instance for `identifier`, which may be null, and returns true. Returns false if
  /// there is none yet. Takes no lock.
  bool findInstance(const void* identifier,
                    rt::Ref<rt::Object>& instance) const RT_NO_THREAD_SAFETY_ANALYSIS {
    const auto* found = std::as_const(ivars_->instances).find(identifier);
    if (found == nullptr) return false;
    instance = found->second;
    return true;
  }

  /// Returns the instances that exist, without nulls, in no particular order. Throws std::bad_alloc.
  rt::Ref<rt::Array> instances() const;

 private:
  friend struct SRLMemoizingScopeTestAccess;

  SRLMemoizingScope() : ivars_(std::make_unique_for_overwrite<SRLMemoizingScopeIvars>()) {}

  // The slow path of `instanceForIdentifier`. Looks for the instance once more, under the lock. The factory
  // is not a block, which would allocate even for an existing instance.
  [[gnu::noinline]] rt::Ref<rt::Object> makeOrAwaitInstance(const void* identifier, bool* instanceCreated,
                                                            rt::FunctionView<rt::Ref<rt::Object>()> factory);

  const std::unique_ptr<SRLMemoizingScopeIvars> ivars_;
};
