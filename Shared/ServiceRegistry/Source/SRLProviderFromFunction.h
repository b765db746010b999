#pragma once

/// A provider for generated code, which has functions.
///
///     rt::Ref<rt::Object> injectClock() { ... }
///
///     rt::Ref<AVOProvider> clock = SRLProviderFromFunction(&injectClock);
///
/// Not for: hosts, who have blocks (AVOProvider).

#include "Runtime/Objects/Object.h"
#include "Runtime/Objects/Ref.h"
#include "Shared/Async/Provider/AVOProvider.h"

/// A provider that calls `function` at each `get`. Null is reported, and yields null. Throws what the error
/// callback throws, and std::bad_alloc.
rt::Ref<AVOProvider> SRLProviderFromFunction(rt::Ref<rt::Object> (*function)());
