#pragma once

/// Provides an object on demand, for example a service that may never be needed.
///
///     rt::Ref<AVOProvider> clock = AVOProvider::providerWithBlock([] { return rt::make<SystemClock>(); });
///     rt::Ref<Clock> now = rt::cast<Clock>(clock->get());          // the block runs now, and at each `get`
///
/// Threads: immutable. Any thread may use it if the block allows that.
///
/// Not for: caching an object. Each `get` calls the block again.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

class RT_VISIBLE AVOProvider final : public rt::Implements<AVOProvider, rt::Object> {
 public:
  using ProviderBlock = rt::Block<rt::Ref<rt::Object>()>;

  /// Does the same as `initWithBlock`.
  static rt::Ref<AVOProvider> providerWithBlock(ProviderBlock block);

  /// Returns a provider that retains `object` and always returns it. `object` may be null. Throws
  /// std::bad_alloc.
  static rt::Ref<AVOProvider> providerWithObject(rt::Ref<rt::Object> object);

  /// Returns a provider whose `get` returns null. Throws std::bad_alloc.
  static rt::Ref<AVOProvider> init();

  /// Returns a provider that calls `block` at each `get`.
  /// Errors: null is reported and yields null. Throws what the error callback throws, and std::bad_alloc.
  static rt::Ref<AVOProvider> initWithBlock(ProviderBlock block);

  /// Calls the block and returns its result, which may be null. Throws what the block throws.
  rt::Ref<rt::Object> get() const;

 private:
  explicit AVOProvider(ProviderBlock block) noexcept : block_(std::move(block)) {}

  const ProviderBlock block_;
};
