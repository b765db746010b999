#pragma once

/// An object on demand: a service that is handed out before anybody knows whether it is needed.
///
///     rt::Ref<AVOProvider> clock = AVOProvider::providerWithBlock([] { return rt::make<SystemClock>(); });
///     rt::Ref<Clock> now = rt::cast<Clock>(clock->get());          // the block runs now, and at each `get`
///
/// It never changes: any thread may use it whose block bears that.
///
/// Not for: keeping what was made; each `get` calls the block anew.

#include <utility>

#include "Runtime/Base/Visibility.h"
#include "Runtime/Objects/Block.h"
#include "Runtime/Objects/Class.h"
#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"

class RT_VISIBLE AVOProvider final : public rt::Implements<AVOProvider, rt::Object> {
 public:
  using ProviderBlock = rt::Block<rt::Ref<rt::Object>()>;

  /// Same as `initWithBlock`.
  static rt::Ref<AVOProvider> providerWithBlock(ProviderBlock block);

  /// A provider of `object`, which it keeps and which may be null. Throws std::bad_alloc.
  static rt::Ref<AVOProvider> providerWithObject(rt::Ref<rt::Object> object);

  /// A provider of nothing: `get` returns null. Throws std::bad_alloc.
  static rt::Ref<AVOProvider> init();

  /// A provider of what `block` returns. Null is reported, and yields null. Throws what the error callback
  /// throws, and std::bad_alloc.
  static rt::Ref<AVOProvider> initWithBlock(ProviderBlock block);

  /// What the block returns, which may be null. Throws what it throws.
  rt::Ref<rt::Object> get() const;

 private:
  explicit AVOProvider(ProviderBlock block) noexcept : block_(std::move(block)) {}

  const ProviderBlock block_;
};
