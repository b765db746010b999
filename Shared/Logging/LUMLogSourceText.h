#pragma once

/// Turns the texts of call sites, which recur with every message, into strings that are made once.
///
///     rt::String file = LUMLogSourceText(__FILE__);
///
/// A known text costs a look-up and a comparison. Its string is shared, and its references are not counted.
///
/// Memory is bounded whatever callers pass. About `kLUMLogSourceTextCount` texts are remembered at most, and
/// none longer than `kLUMLogSourceTextLength`. The string of any other text is made at each call. The
/// comparison detects a text that has changed, as can happen when one library is loaded where another was
/// unloaded.
///
/// Not for: texts made at run time.

#include <cstddef>

#include "Runtime/Objects/String.h"

inline constexpr std::size_t kLUMLogSourceTextCount = 4096;
inline constexpr std::size_t kLUMLogSourceTextLength = 1024;

/// Returns the string of `text`, which ends with NUL. Null if `text` is null or not UTF-8. Throws
/// std::bad_alloc.
/// Threads: thread-safe and lock-free.
rt::String LUMLogSourceText(const char* text);
