#pragma once

/// Makes a provider of a function, for generated code.
///
///     rt::Ref<rt::Object> injectClock() { ... }
///
///     rt::Ref<AVOProvider> clock = SRLProviderFromFunction(&injectClock);
///
/// Not for: hosts. They make a provider of a block (AVOProvider).

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Async/Provider/AVOProvider.h"

/// Returns a provider that calls `function` at each `get`.
/// Errors: null is reported and yields null. Throws what the error callback throws, and std::bad_alloc.
rt::Ref<AVOProvider> SRLProviderFromFunction(rt::Ref<rt::Object> (*function)());
