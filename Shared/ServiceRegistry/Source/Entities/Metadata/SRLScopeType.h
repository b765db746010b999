#pragma once

/// The type of a scope: a bit mask with one bit for each dimension of the scope, for example the account or
/// the window. The generator of the bindings decides what each bit means.
///
/// Not for: identifying one scope of a type. An SRLScopeTagSet does, with one tag for each bit.

#include <cstdint>

using SRLScopeType = std::uint32_t;
