#pragma once

/// The instances of a scope, each made when it is first asked for, once, whichever threads ask.
///
///     rt::Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
///     rt::Ref<rt::Object> clock =
///         scope->instanceForIdentifier(&systemClock, nullptr, [] { return rt::make<SystemClock>(); });
///
/// Any thread may use it. No lock is held while an instance is made, so that a factory may ask the scope for
/// what it needs. Who asks for an instance in the making waits until it is made; a factory must not ask for
/// the one that it makes, nor an error callback for any of them, which ends the program.
///
/// What a factory throws comes out of the request that called it. Its instance stays pending, since nobody
/// can tell whether the factory may be called again: whoever waits for the instance, or asks for it later,
/// gets a report and null. Memory for an instance is there before its factory runs: without it, nothing has
/// begun.
///
/// In the child of a fork, an instance that another thread was making counts as not begun: who asks for it
/// first makes it.
///
/// Not for: hosts. They ask SRLRegistry, which has a scope for each set of tags.

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
  /// Without instances. Throws std::bad_alloc.
  static rt::Ref<SRLMemoizingScope> init();

  /// The instance for `identifier`, an address that is only compared; null where the factory gave none. If
  /// there is none yet, `factoryBlock` is called, or, if another thread calls its own for the same
  /// identifier, that one is waited for. Where there was none, `instanceCreated`, unless it is null, then
  /// points to whether this call has called the factory; else it is left as it is. Where the factory has
  /// thrown before, that is reported, and yields null. Throws what the factory and the error callback throw,
  /// and std::bad_alloc; nothing once the factory has returned.
  ///
  /// The factory is a block or any other callable object, not null, that returns a reference.
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

  /// Has `instance` be the one for `identifier`, which may be null, and returns true; false where there is
  /// none yet. Takes no lock.
  bool findInstance(const void* identifier,
                    rt::Ref<rt::Object>& instance) const RT_NO_THREAD_SAFETY_ANALYSIS {
    const auto* found = std::as_const(ivars_->instances).find(identifier);
    if (found == nullptr) return false;
    instance = found->second;
    return true;
  }

  /// The instances that there are, without nulls, in no particular order. Throws std::bad_alloc.
  rt::Ref<rt::Array> instances() const;

 private:
  friend struct SRLMemoizingScopeTestAccess;

  SRLMemoizingScope() : ivars_(std::make_unique_for_overwrite<SRLMemoizingScopeIvars>()) {}

  // What `instanceForIdentifier` does where it found no instance. It looks once more, under the lock. The
  // factory is no block, which would have to be allocated.
  [[gnu::noinline]] rt::Ref<rt::Object> makeOrAwaitInstance(const void* identifier, bool* instanceCreated,
                                                            rt::FunctionView<rt::Ref<rt::Object>()> factory);

  const std::unique_ptr<SRLMemoizingScopeIvars> ivars_;
};
