#pragma once

/// A scope, as the dimensions in which services that live in it are told apart: one bit for each. What the
/// bits mean is the matter of whoever generates the bindings.
///
/// Not for: one scope of its kind, which a SRLScopeTagSet is: a tag for each bit.

#include <cstdint>

using SRLScopeType = std::uint32_t;
