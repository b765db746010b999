#pragma once

/// The instances of a scope, each made when it is first asked for, once, whichever threads ask.
///
///     rt::Ref<SRLMemoizingScope> scope = SRLMemoizingScope::init();
///     rt::Ref<rt::Object> clock =
///         scope->instanceForIdentifier(&systemClock, nullptr, [] { return rt::make<SystemClock>(); });
///
/// Any thread may use it. No lock is held while an instance is made, so that a factory may ask the scope for
/// what it needs. Who asks for an instance in the making waits until it is made; a factory must not ask for
/// the one that it makes, which ends the program.
///
/// A factory that throws leaves its instance in the making for ever: whoever asks for it later waits for
/// ever, too, or ends the program where the thread is the same. What the factory threw comes out of the
/// request that called it.
///
/// Not for: hosts. They ask SRLRegistry, which has a scope for each set of tags.

#include <memory>

#include "Runtime/Array.h"
#include "Runtime/Block.h"
#include "Runtime/Class.h"
#include "Runtime/Object.h"
#include "Runtime/Ref.h"

struct SRLMemoizingScopeIvars;

class SRLMemoizingScope final : public rt::Implements<SRLMemoizingScope, rt::Object> {
 public:
  /// Without instances. Throws std::bad_alloc.
  static rt::Ref<SRLMemoizingScope> init();

  ~SRLMemoizingScope() override;

  /// The instance for `identifier`, an address that is only compared; null where the factory gave none. If
  /// there is none yet, `factoryBlock` is called, or, if another thread calls its own for the same
  /// identifier, that one is waited for. Where there was none, `instanceCreated`, unless it is null, then
  /// points to whether this call has called the factory; else it is left as it is. Throws what the factory
  /// throws, and std::bad_alloc.
  rt::Ref<rt::Object> instanceForIdentifier(const void* identifier, bool* instanceCreated,
                                            const rt::Block<rt::Ref<rt::Object>()>& factoryBlock);

  /// The instances that there are, without nulls, in no particular order. Throws std::bad_alloc.
  rt::Ref<rt::Array> instances() const;

 private:
  friend struct SRLMemoizingScopeTestAccess;

  SRLMemoizingScope();

  const std::unique_ptr<SRLMemoizingScopeIvars> ivars_;
};
